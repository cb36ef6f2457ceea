"""What import_veneers.py makes of a list of imports, and which lists it refuses."""

import pathlib
import subprocess
import sys
import tempfile
import unittest

SCRIPT = pathlib.Path(__file__).resolve().parents[2] / "platform/ce/import_veneers.py"


def run(text):
    """(what is written, what is said)"""
    with tempfile.TemporaryDirectory() as folder:
        imports, out = pathlib.Path(folder, "imports.txt"), pathlib.Path(folder, "out.s")
        imports.write_text(text)
        done = subprocess.run([sys.executable, SCRIPT, imports, out], capture_output=True, text=True,
                              check=False)
        return out.read_text() if out.exists() else "", done.stderr


class Veneers(unittest.TestCase):
    def test_jumps_through_a_slot_in_a_section_of_its_library(self):
        code, said = run("# comment\n[COREDLL.dll]\nSleep\n\n[WS2.dll]\nsend\n")
        self.assertEqual(said, "")
        self.assertIn('.section ".idata$COREDLL.dll$Sleep", "aw"', code)
        self.assertIn('.section ".idata$WS2.dll$send", "aw"', code)
        self.assertIn("send:\nce_send:\n  ldr ip, 1f\n  ldr ip, [ip]\n  bx ip\n1:\n  .word __imp_send", code)

    def test_clears_the_upper_half_of_a_result_of_16_bits(self):
        code, _ = run("[WS2.dll]\nhtons\nhtonl\n")
        short, long = code.split('"ax"')[1:]
        self.assertIn("mov r0, r0, lsl #16\n  mov r0, r0, lsr #16", short)
        self.assertNotIn("lsl #16", long)

    def test_refuses_what_is_neither_a_library_nor_a_function(self):
        self.assertIn("imports.txt:1: neither", run("Sleep\n")[1])
        self.assertIn("imports.txt:2: neither", run("[COREDLL.dll]\nSleep now\n")[1])

    def test_refuses_a_function_that_stands_there_twice(self):
        self.assertIn("twice", run("[COREDLL.dll]\nSleep\nSleep\n")[1])


if __name__ == "__main__":
    unittest.main()
