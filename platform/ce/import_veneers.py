"""Writes the import veneers and slots of the device's library as assembler source.

usage: import_veneers.py <imports.txt> <out.s>

A call to a function of another library reaches a few instructions, the veneer, which jump to the
address in the function's import slot. Each veneer and each slot is a section of its own, so that the
linker keeps only those of functions that something calls.
"""

import pathlib
import re
import sys

# Their results have 16 bits. The device's documents leave open who clears the upper half of the
# register; the compiler trusts the called function to have done it.
SHORT_RESULTS = {"RegisterClassW", "htons", "ntohs"}

JUMP = """  ldr ip, 1f
  ldr ip, [ip]
  bx ip
"""

CALL_AND_CLEAR_UPPER_HALF = """  push {r4, lr}
  ldr ip, 1f
  ldr ip, [ip]
  mov lr, pc
  bx ip
  mov r0, r0, lsl #16
  mov r0, r0, lsr #16
  pop {r4, lr}
  bx lr
"""

# Declarations of sockets and streams carry the prefix `ce_`, which is no part of the device's name.
VENEER = """
  .section ".text.import.{name}", "ax", %progbits
  .arm
  .balign 4
  .global {name}, ce_{name}
  .type {name}, %function
  .type ce_{name}, %function
{name}:
ce_{name}:
{code}1:
  .word __imp_{name}
  .size {name}, . - {name}
  .size ce_{name}, . - ce_{name}

  .section ".idata${library}${name}", "aw", %progbits
  .balign 4
  .global __imp_{name}
  .type __imp_{name}, %object
  .size __imp_{name}, 4
__imp_{name}:
  .word 0
"""


def imports(text):
    """The functions by library: pairs in the order of the list."""
    library = None
    for number, line in enumerate(text.splitlines(), 1):
        line = line.strip()
        if not line or line.startswith("#"):
            continue
        if line.startswith("["):
            library = line.strip("[]")
        elif library is None or not re.fullmatch(r"\w+", line):
            sys.exit(f"imports.txt:{number}: neither a library nor one of its functions: {line}")
        else:
            yield library, line


def main():
    if len(sys.argv) != 3:
        sys.exit(__doc__.split("\n\n")[1])
    listed = list(imports(pathlib.Path(sys.argv[1]).read_text()))
    if len(set(listed)) != len(listed):
        sys.exit("imports.txt: a function stands there twice")
    code = [VENEER.format(library=library, name=name,
                          code=CALL_AND_CLEAR_UPPER_HALF if name in SHORT_RESULTS else JUMP)
            for library, name in listed]
    pathlib.Path(sys.argv[2]).write_text("  .syntax unified\n  .cpu arm7tdmi\n" + "".join(code))


if __name__ == "__main__":
    main()
