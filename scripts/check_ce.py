"""Holds the library for Windows CE against its lists and its limits.

usage: check_ce.py <folder of the build>

It imports what platform/ce/imports.txt lists and nothing else, and that is what the library calls by
platform/surface.txt; it exports what src/exports/exports.txt lists, as platform/ce/exports.txt spells
it; and it is not larger than it may be.
"""

import pathlib
import re
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
CE = ROOT / "platform/ce"
MOST_BYTES = 160 * 1024

# The device has these in its headers only, over the functions on the right.
IN_HEADERS = {"SetEvent": "EventModify", "stdout": "_getstdfilex"}
# Called only where addresses have more than 32 bits.
NOT_ON_THE_DEVICE = {"VirtualAlloc"}


def lines(path):
    return {line.strip() for line in path.read_text().splitlines()
            if line.strip() and not line.startswith(("#", "["))}


def output(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def compare(who, found, where, expected):
    return ([f"{name}: {who}, but {where} does not name it" for name in sorted(found - expected)] +
            [f"{name}: {where} names it, but not {who}" for name in sorted(expected - found)])


def exported(symbols):
    """The plain names behind symbols: `UpgradeConfig::GetModel`."""
    return {name.split("(")[0] for name in output("c++filt", *symbols).splitlines()}


def main():
    if len(sys.argv) != 2:
        sys.exit(__doc__.split("\n\n")[1])
    build = pathlib.Path(sys.argv[1])
    library, image = build / "orvenix.dll", build / "orvenix.elf"
    for file in (library, image):
        if not file.exists():
            sys.exit(f"{file}: there is no such file; build it first")
    slots = set(re.findall(r" __imp_(\w+)$", output("arm-none-eabi-nm", str(image)), re.M))
    listed = lines(CE / "imports.txt")
    surface = lines(ROOT / "platform/surface.txt") - NOT_ON_THE_DEVICE
    called = {IN_HEADERS.get(name, name) for name in surface}
    complaints = compare("imported by the library", slots, "platform/ce/imports.txt", listed)
    complaints += compare("in platform/ce/imports.txt", listed, "platform/surface.txt", called)
    complaints += compare("in platform/ce/exports.txt", exported(lines(CE / "exports.txt")),
                          "src/exports/exports.txt", lines(ROOT / "src/exports/exports.txt"))
    size = library.stat().st_size
    if size > MOST_BYTES:
        complaints.append(f"{library}: {size} bytes, more than {MOST_BYTES}")
    print("\n".join(complaints) if complaints
          else f"{library}: {size} bytes, {len(slots)} functions of the device, all as listed")
    return 1 if complaints else 0


if __name__ == "__main__":
    sys.exit(main())
