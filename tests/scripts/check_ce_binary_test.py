"""Shows of each rule of scripts/check_ce_binary.py that it catches what it is there for."""

import pathlib
import shutil
import subprocess
import sys
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parent.parent.parent
sys.path.insert(0, str(ROOT / "scripts"))
sys.dont_write_bytecode = True

import check_ce_binary as lint  # noqa: E402


def disassembly(*code, function="Alpha"):
    lines = "".join(f"10001{at * 4:03x}:\t{one}\n" for at, one in enumerate(code))
    return f"\norvenix.elf:     file format elf32-littlearm\n\n10001000 <{function}>:\n{lines}"


def complaints(*code, reviewed=()):
    found = lint.check_code(disassembly(*code), set(reviewed), lambda address: f"src/{address}.cpp")
    return [line.rsplit(": ", 1)[1] for line in found]


class CodeTest(unittest.TestCase):
    def test_takes_what_the_compiler_makes_for_version_4t(self):
        self.assertEqual(complaints(
            "push\t{r4, lr}", "sub\tsp, sp, #8", "ldr\tr0, [pc, #12]\t@ 10001020 <Alpha+0x20>",
            "cmp\tr0, #3", "ldrls\tpc, [pc, r0, lsl #2]", ".word\t0x0badf00d", "mov\tlr, pc", "bx\tr3",
            "movne\tlr, pc", "bxne\tr3", "ldrsbcs\tr1, [r2, #1]", "umull\tr0, r1, r2, r3", "stmib\tsp, {r0, r1}",
            "addseq\tr0, r0, #1", "nop\t\t\t@ (mov r0, r0)",
            "bic\tr1, r1, #3", "mov\tr0, sp", "pop\t{r4, lr}", "bxeq\tlr", "bx\tlr"), [])

    def test_refuses_instructions_of_later_processors(self):
        for code in ("ldrd\tr0, [sp]", "strd\tr4, [sp, #8]", "strdne\tr4, [r0]", "clz\tr0, r1", "blx\tr3",
                     "pld\t[r0]", "bkpt\t0x0000", "movw\tr0, #1", "rev\tr0, r0", "ldrex\tr0, [r1]",
                     "smulbb\tr0, r1, r2", "vldr\td0, [r0]", "svc\t0x00000000", "mcr\t15, 0, r0, cr7, cr10, {5}",
                     "\t@ <UNDEFINED> instruction: 0xe7ffffff"):
            self.assertEqual(len(complaints(code)), 1, code)

    def test_refuses_returns_and_jumps_without_bx(self):
        for code in ("pop\t{r4, pc}", "ldm\tsp!, {r4, pc}", "ldmfd\tsp!, {pc}", "ldr\tpc, [r3]",
                     "ldr\tpc, [sp], #4", "ldrne\tpc, [pc, #4]", "mov\tpc, lr", "movs\tpc, lr", "moveq\tpc, r3",
                     "add\tpc, pc, r3, lsl #2", "sub\tpc, lr, #4"):
            self.assertEqual(len(complaints(code)), 1, code)

    def test_refuses_a_call_that_is_no_bx(self):
        self.assertEqual(complaints("mov\tlr, pc", "nop"),
                         ["does not call by BX, though the link register has been set"])
        self.assertEqual(len(complaints("mov\tlr, pc", "ldr\tpc, [r3]")), 1)
        self.assertEqual(len(complaints("movne\tlr, pc", "bx\tr3")), 1)

    def test_refuses_to_round_to_eight_but_where_it_has_been_seen(self):
        for code in ("bic\tr3, r3, #7", "bicne\tr3, r3, #7", "bics\tr9, r9, #7", "bic\tr2, r3, #7", "bic\tsp, sp, #7",
                     "bic\tr2, r3, #15"):
            self.assertIn("rounds to a multiple of 8, in src/10001000.cpp", complaints(code))
        self.assertEqual(complaints("bic\tr3, r3, #7", reviewed=["src/10001000.cpp"]), [])
        self.assertEqual(len(complaints("nop", "bic\tr3, r3, #7", reviewed=["src/10001000.cpp"])), 1)

    def test_knows_code_without_a_source_by_its_function(self):
        code = disassembly("bic\tr3, r3, #7", function="Alpha.constprop.0")
        self.assertEqual(lint.check_code(code, {"Alpha"}, lambda address: None), [])
        self.assertEqual(len(lint.check_code(code, {"Beta"}, lambda address: None)), 1)

    def test_finds_the_source_of_an_instruction(self):
        if not shutil.which("arm-none-eabi-g++"):
            self.skipTest("gcc-arm-none-eabi is not installed")
        with tempfile.TemporaryDirectory() as folder:
            pathlib.Path(folder, "src").mkdir()
            source = pathlib.Path(folder, "src/a.cpp")
            source.write_text("extern \"C\" unsigned Round(unsigned n) { return n & ~7u; }\n")
            subprocess.run(["arm-none-eabi-g++", "-O2", "-g", "-marm", "-c", source, "-o", f"{folder}/a.o"], check=True)
            self.assertEqual(lint.source_in(f"{folder}/a.o")("0"), "src/a.cpp")

    def test_refuses_to_take_the_stack_pointer_for_round(self):
        for code in ("orr\tr0, sp, #4", "and\tr0, sp, #7", "tst\tsp, #7", "eor\tr0, sp, #4", "bic\tsp, sp, #15"):
            self.assertEqual(len(complaints(code)), 1, code)

    def test_refuses_to_look_at_the_bits_of_a_copy_of_the_stack_pointer(self):
        for code in (("mov\tr3, sp", "orr\tr3, r3, #4"), ("add\tr2, sp, #8", "tst\tr2, #7"),
                     ("mov\tr3, sp", "nop", "and\tr0, r3, #7")):
            self.assertEqual(complaints(*code), ["takes the bits of an address on the stack"], code)
        for code in (("mov\tr3, sp", "ldr\tr3, [r3]", "orr\tr3, r3, #4"), ("mov\tr0, sp", "bl\t10002000 <F>", "tst\tr0, #1"),
                     ("mov\tr3, sp", "add\tr3, r3, #4", "bx\tlr")):
            self.assertEqual(complaints(*code), [], code)

    def test_finds_all_of_it_in_what_the_assembler_makes(self):
        if not shutil.which("arm-none-eabi-as"):
            self.skipTest("binutils-arm-none-eabi is not installed")
        code = {"ldrd r0, r1, [sp]": "instructions of version", "clz r0, r1": "instructions of version",
                "blx r3": "instructions of version", "pld [r0]": "instructions of version",
                "pop {r4, pc}": "returns", "ldr pc, [r3]": "jumps", "mov pc, lr": "jumps",
                "bic r3, r3, #7": "rounds", "orr r0, sp, #4": "stack pointer"}
        with tempfile.TemporaryDirectory() as folder:
            source = pathlib.Path(folder, "bad.s")
            source.write_text(".syntax unified\n.arch armv5te\n.arm\nBad:\n" + "".join(f"  {one}\n" for one in code)
                              + "  bx lr\n  .word 0xf5d0f000\n")
            subprocess.run(["arm-none-eabi-as", "-o", f"{folder}/bad.o", source], check=True)
            text = subprocess.run(["arm-none-eabi-objdump", "-d", "--no-show-raw-insn", f"{folder}/bad.o"],
                                  check=True, capture_output=True, text=True).stdout
        found = lint.check_code(text, set(), lambda address: None)
        self.assertEqual(len(found), len(code), found)
        for complaint, expected in zip(found, code.values()):
            self.assertIn(expected, complaint)


def words(*values):
    return b"".join(value.to_bytes(4, "little") for value in values)


class SameCodeTest(unittest.TestCase):
    MOVED = {0x10006000: 0x10007050, 0x10006004: 0x10007054}

    def complaints(self, linked, converted):
        return lint.check_same_code(words(*linked), words(*converted), self.MOVED)

    def test_takes_words_that_now_address_an_import_table(self):
        self.assertEqual(self.complaints([1, 0x10006004, 3], [1, 0x10007054, 3]), [])

    def test_refuses_every_other_difference(self):
        self.assertEqual(self.complaints([1, 2], [1, 3]),
                         ["its code has 00000003 at 0x4, where the linker had 00000002"])
        self.assertEqual(len(self.complaints([1, 0x10006004], [1, 0x10007060])), 1)
        self.assertEqual(len(self.complaints([1, 0x10006008], [1, 0x10007054])), 1)
        self.assertEqual(len(self.complaints([1, 0x10006004], [1, 0x10006004])), 1)
        self.assertEqual(self.complaints([1, 2], [1]), ["its code has another length than the linker's"])

    def test_refuses_the_entry_of_another_function(self):
        self.assertEqual(len(self.complaints([0x10006000], [0x10007054])), 1)

    def test_finds_the_entries_in_the_order_of_their_functions(self):
        table = "ImportAddressTableRVA: 0x50"
        said = f"Import {{\n  Name: A.dll\n  {table}\n  Symbol: One (0)\n  Symbol: Two (0)\n}}\n"
        self.assertEqual(lint.entries(said, 0x1000), {"One": 0x1050, "Two": 0x1054})


class SymbolsTest(unittest.TestCase):
    def test_refuses_what_ends_the_host_s_process(self):
        for name in ("_Znwj", "_Znaj", "abort", "__aeabi_atexit"):
            self.assertEqual(len(lint.check_symbols(f"10001000 T {name}\n10002000 T _ZdlPv\n")), 1, name)
        self.assertEqual(lint.check_symbols("10001000 T abort_transfer\n"), [])


class DeclarationsTest(unittest.TestCase):
    def complaints(self, api, narrow=True):
        return lint.check_declarations(api, {"htons"}, narrow)

    def test_takes_words(self):
        self.assertEqual(self.complaints("BOOL Beep(DWORD length, const WCHAR* name,\n          void* more);\n"
                                         "std::uint16_t ce_htons(std::uint16_t value);\nvoid Nothing();\n"), [])

    def test_refuses_results_that_nobody_extends_or_that_take_more_than_a_register(self):
        for api in ("SHORT GetKeyState(int key);", "std::uint16_t ce_swap(int a);", "LONGLONG Ticks(void);",
                    "double Half(int of);", "struct POINT {\n};\nPOINT Where(int of);"):
            self.assertEqual(len(self.complaints(api + "\n")), 1, api)

    def test_refuses_arguments_of_more_than_a_word_and_where_others_call_of_less(self):
        self.assertEqual(len(self.complaints("BOOL Wait(ULONGLONG until, int more);\n")), 1)
        self.assertEqual(self.complaints("BOOL Set(BYTE value);\n"), [])
        self.assertEqual(len(self.complaints("ORVENIX_EXPORT uint32_t Set(uint8_t value) ICFG_NOEXCEPT;\n", False)), 1)


HEADER = """  Machine: IMAGE_FILE_MACHINE_ARM (0x1C0)
  TimeDateStamp: 1970-01-01 00:00:00 (0x0)
  OptionalHeaderSize: 224
  Characteristics [ (0x210E)
  ImageBase: 0x10000000
  SectionAlignment: 4096
  FileAlignment: 512
  MajorSubsystemVersion: 5
  MinorSubsystemVersion: 0
  Subsystem: IMAGE_SUBSYSTEM_WINDOWS_CE_GUI (0x9)
"""

IMPORTS = """Import {
  Name: COREDLL.dll
  ImportLookupTableRVA: 0x703C
  Symbol: Sleep (0)
  Symbol: GetTickCount (0)
}
Import {
  Name: WS2.dll
  Symbol: send (0)
}
"""
LISTED = {"COREDLL.dll": {"Sleep", "GetTickCount"}, "WS2.dll": {"send"}}

EXPORTS = """Export {
  Ordinal: 1
  Name: Alpha
  RVA: 0x1008
}
Export {
  Ordinal: 2
  Name: beta
  RVA: 0x1010
}
"""

RELOCATIONS = """BaseReloc [
  Entry {
    Type: HIGHLOW
    Address: 0x1020
  }
  Entry {
    Type: ABSOLUTE
    Address: 0x1000
  }
]
"""
READELF = """
Relocation section '.rel.text' at offset 0x6004 contains 2 entries:
10001020  00000102 R_ARM_ABS32            10002000   names
10001000  0000011c R_ARM_CALL             10001008   Alpha

Relocation section '.rel.debug_info' at offset 0x60fc contains 1 entry:
00000006  00001102 R_ARM_ABS32            00000000   .debug_abbrev
"""


class HeaderTest(unittest.TestCase):
    def test_refuses_every_other_value(self):
        self.assertEqual(lint.check_header(HEADER), [])
        for line in HEADER.splitlines():
            self.assertEqual(len(lint.check_header(HEADER.replace(line + "\n", ""))), 1, line)
        self.assertEqual(lint.check_header(HEADER.replace("WINDOWS_CE_GUI (0x9)", "WINDOWS_GUI (0x2)")),
                         ["the header's Subsystem is IMAGE_SUBSYSTEM_WINDOWS_GUI (0x2)"])

    def test_refuses_imports_but_the_listed_ones(self):
        self.assertEqual(lint.check_imports(IMPORTS, LISTED), [])
        self.assertEqual(lint.check_imports(IMPORTS, {**LISTED, "WS2.dll": {"recv"}}),
                         ["imports send of WS2.dll, which imports.txt does not list",
                          "does not import recv of WS2.dll, which imports.txt lists"])
        self.assertEqual(len(lint.check_imports(IMPORTS, {**LISTED, "WS2.dll": {"send"}, "AYGSHELL.dll": {"X"}})), 1)
        self.assertEqual(lint.check_imports(IMPORTS.replace("send (0)", "send (3)"), LISTED),
                         ["imports send of WS2.dll with hint 3"])
        self.assertTrue(lint.check_imports(IMPORTS.replace("send (0)", " (7)"), LISTED))

    def test_refuses_imports_with_wide_arguments_even_when_listed(self):
        for name in ("__rt_sdiv64by64", "_abs64", "sin", "pow", "atof", "_atoi64", "__addd", "__dtoi64", "difftime"):
            found = lint.check_imports(IMPORTS.replace("send", name), {**LISTED, "WS2.dll": {name}})
            self.assertEqual(found, [f"imports {name}, which takes or gives more than 32 bits"])

    def test_reads_the_list_of_imports_by_library(self):
        text = "# all\n\n[COREDLL.dll]\nSleep\nGetTickCount\n[WS2.dll]\nsend\n"
        self.assertEqual(lint.listed_imports(text), LISTED)

    def test_refuses_exports_but_the_listed_ones(self):
        self.assertEqual(lint.check_exports(EXPORTS, {"Alpha", "beta"}), [])
        self.assertEqual(lint.check_exports(EXPORTS, {"Alpha"}),
                         ["exports beta, which exports.txt does not list"])
        self.assertEqual(lint.check_exports(EXPORTS, {"Alpha", "beta", "Gamma"}),
                         ["does not export Gamma, which exports.txt lists"])
        turned = EXPORTS.replace("Alpha", "@").replace("beta", "Alpha").replace("@", "beta")
        self.assertEqual(lint.check_exports(turned, {"Alpha", "beta"}),
                         ["the exports are not sorted, or one is there twice"])

    def test_refuses_an_import_library_of_other_functions(self):
        library = "File: a.dll\nType: code\nName type: name\nSymbol: __imp_Alpha\nSymbol: Alpha\n"
        self.assertEqual(lint.check_import_library(library, {"Alpha"}), [])
        self.assertEqual(lint.check_import_library(library, {"Alpha", "beta"}),
                         ["orvenix.lib and exports.txt differ in beta"])
        self.assertEqual(lint.check_import_library(library, set()),
                         ["orvenix.lib and exports.txt differ in Alpha"])
        self.assertTrue(lint.check_import_library(library.replace("Type: code", "Type: data"), {"Alpha"}))

    def test_refuses_relocations_but_those_that_the_linker_listed(self):
        self.assertEqual(lint.check_relocations(RELOCATIONS, READELF), [])
        self.assertEqual(lint.check_relocations(RELOCATIONS, READELF.replace("R_ARM_CALL ", "R_ARM_ABS32")),
                         ["has 1 relocations, where the linker listed 2"])
        self.assertEqual(len(lint.check_relocations(RELOCATIONS.replace("HIGHLOW", "THUMB_MOV32"), READELF)), 2)


FORMATTED = "[[gnu::format(printf, 1, 2)]] void Log(const char* format, ...) noexcept;\n"


class VariadicTest(unittest.TestCase):
    def test_takes_formats_of_words(self):
        self.assertEqual(lint.check_formats({"log.h": FORMATTED, "a.cpp": '''
            Log("%d %-8.3s %*.*s %08lX %c %u%%f\\n", 1, "a"); quote = '"'; (Store(to), ...);
            template <typename... T> void F(T... all) { (Store(all), ...); }
            void Log(const char* format, ...) noexcept { va_start(arguments, format); }'''}), [])

    def test_refuses_formats_of_more(self):
        for conversion in ("%lld", "%5.1f", "%g", "%llX", "%jd", "%zu", "%I64d", "%La"):
            found = lint.check_formats({"a.cpp": f'Log("wide: {conversion}\\n", wide);'})
            self.assertEqual(len(found), 1, conversion)
        self.assertEqual(len(lint.check_formats({"a.cpp": 'Log("split %l"\n    "lu");'})), 1)
        self.assertEqual(len(lint.check_formats({"a.cpp": 'Log("split %" "llu", wide);'})), 1)
        self.assertEqual(len(lint.check_formats({"a.cpp": 'Log("%" PRIu64, wide);'})), 1)

    def test_refuses_variadic_functions_whose_formats_nobody_reads(self):
        found = lint.check_formats({"log.h": FORMATTED + "\nvoid Tell(const char* format, ...);\n"})
        self.assertEqual(found, ["log.h:3: Tell is variadic, and its format is compared with nothing"])
        self.assertEqual(len(lint.check_formats({"a.h": "int Sum(...);"})), 1)

    def test_refuses_to_compile_without_comparing_formats(self):
        entry = {"file": "/home/src/a.cpp", "command": "g++ -Werror -Wformat=2 -c a.cpp"}
        self.assertEqual(lint.check_flags([entry]), [])
        self.assertEqual(len(lint.check_flags([{**entry, "command": "g++ -Werror -Wformat -c a.cpp"}])), 1)

    def test_knows_the_device_s_variadic_functions(self):
        api = "void NKDbgPrintfW(const WCHAR* format, ...);\nBOOL Sleep(DWORD time);\nint wsprintfW(WCHAR* out,\n const WCHAR* f, ...);"
        self.assertEqual(lint.device_variadic(api), {"NKDbgPrintfW", "wsprintfW"})

    def test_compiles_wide_calls_with_a_look_at_the_types(self):
        compiler = shutil.which("arm-none-eabi-g++")
        if not compiler:
            self.skipTest("gcc-arm-none-eabi is not installed")
        with tempfile.TemporaryDirectory() as folder:
            pathlib.Path(folder, "coredll.h").write_text(
                '#pragma once\nextern "C" void NKDbgPrintfW(const char16_t* format, ...);\n')
            source = pathlib.Path(folder, "a.cpp")
            command = f"/usr/bin/cmake -E env X=1 {compiler} -std=c++17 -I{folder} -o a.o -c {source}"
            for argument, good in (("1U", True), ('u"text"', True), ("source", True), ("1LL", False), ("2.0F", False)):
                source.write_text("#include <coredll.h>\nvoid F(const char16_t (&source)[3]) "
                                  f'{{ NKDbgPrintfW(u"%s", {argument}); (void)source; }}\n')
                self.assertEqual(lint.check_wide_calls(command, source) == [], good, argument)


if __name__ == "__main__":
    unittest.main()
