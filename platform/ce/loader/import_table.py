"""Writes the table of the functions that the loader gives to a DLL as C++ source.

usage: import_table.py <imports.txt> <plain_names.h> <device_calls.cpp> <out.cpp>

The functions are the simulator's. It has sockets and streams under names of their own: what the
header defines anew, as `ce_NAME`. A `misaligned_NAME` of the loader's own is for DLLs that are
entered with a misaligned stack.
"""

import pathlib
import re
import sys

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent))
import import_veneers  # noqa: E402  the list has one reader

SOURCE = """// Made by import_table.py of what platform/ce/imports.txt lists.
#include "loader/import_table.h"

extern "C" {{
{declarations}
}}

namespace loader {{

// There before any code runs: a DLL may be loaded by what runs before main.
constexpr HostFunction kHostFunctions[] = {{
{rows}
}};
constexpr std::size_t kHostFunctionCount = {count};

}}  // namespace loader
"""


def main():
    if len(sys.argv) != 5:
        sys.exit(__doc__.split("\n\n")[1])
    imports, header, calls, out = map(pathlib.Path, sys.argv[1:])
    renamed = set(re.findall(r"^#define (\w+) ce_\1$", header.read_text(), re.M))
    own = set(re.findall(r"\bmisaligned_(\w+)\(", calls.read_text()))
    rows = []
    symbols = set()
    for library, name in import_veneers.imports(imports.read_text()):
        symbol = f"ce_{name}" if name in renamed else name
        misaligned = f"misaligned_{name}" if name in own else symbol
        symbols |= {symbol, misaligned}
        rows.append(f'    {{"{library}", "{name}", &{symbol}, &{misaligned}}},')
    declarations = "\n".join(f"void {symbol}();" for symbol in sorted(symbols))
    out.write_text(SOURCE.format(declarations=declarations, rows="\n".join(rows), count=len(rows)))


if __name__ == "__main__":
    main()
