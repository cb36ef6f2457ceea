"""Writes thunks for the exports of the device's library as assembler source.

usage: export_thunks.py <exports.txt> <out.s>

A program that calls the library by its public headers is linked with the thunks in place of the
library. Each jumps to the address in its slot; `loader_exports` lists names and slots, so that the
slots can be filled once the DLL is loaded.
"""

import pathlib
import sys

THUNK = """
  .section .text.{name}, "ax", %progbits
  .global {name}{alias}
  .type {name}, %function
{name}:
  ldr ip, 1f
  ldr ip, [ip]
  bx ip
1:
  .word slot_{number}
  .section .rodata.thunks, "a", %progbits
name_{number}:
  .asciz "{name}"
  .data
slot_{number}:
  .word 0
"""

# The device's wide characters are the compiler's wchar_t, this machine's char16_t.
DEVICES_WIDE = "PKw"
WIDE = "PKDs"


def main():
    if len(sys.argv) != 3:
        sys.exit(__doc__.split("\n\n")[1])
    names = [line.strip() for line in pathlib.Path(sys.argv[1]).read_text().splitlines()]
    names = [name for name in names if name and not name.startswith("#")]
    code = ["  .syntax unified\n  .arch armv5te\n"]
    for number, name in enumerate(names):
        other = name.replace(DEVICES_WIDE, WIDE)
        alias = f"\n  .global {other}\n  .set {other}, {name}" if other != name else ""
        code.append(THUNK.format(name=name, number=number, alias=alias))
    code.append("\n  .section .rodata.exports, \"a\", %progbits\n  .balign 4\n"
                "  .global loader_exports\nloader_exports:\n")
    code += [f"  .word name_{number}, slot_{number}\n" for number in range(len(names))]
    code.append("  .word 0, 0\n  .section .note.GNU-stack, \"\", %progbits\n")
    pathlib.Path(sys.argv[2]).write_text("".join(code))


if __name__ == "__main__":
    main()
