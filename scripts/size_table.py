#!/usr/bin/env python3
"""Prints what the library for Windows CE is made of: bytes by section and by subsystem.

usage: size_table.py [<folder of the build>]    (default: build/ce)

The subsystem of a function or variable is the folder of the source that it was compiled from; what
the compiler wrote into another function counts there. "constants" are texts, and tables that have
no name.
"""

import collections
import pathlib
import re
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
COLUMNS = (".text", ".rdata", ".data", ".bss")


def output(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def sections(image):
    """(name, address, size) of what is loaded, but for the import slots."""
    found = re.findall(r"^(\.\w+)\s+(\d+)\s+(\d+)$", output("arm-none-eabi-size", "-A", str(image)), re.M)
    return [(name, int(address), int(size)) for name, size, address in found if name in COLUMNS]


def subsystem(path):
    """`src/http/url.cpp` belongs to http."""
    found = re.search(r"/src/(\w+)/|/include/(orvenix)/|/platform/ce/(runtime)/", path)
    return next(filter(None, found.groups())) if found else None


def owner_by_name(symbol):
    """Tables have no line in the debugging information: their namespace tells where they are from."""
    found = re.match(r"_ZL?N?K?(?:12_GLOBAL__N_1)?(\d+)(.*)", symbol)
    namespace = found[2][:int(found[1])] if found else ""
    if (ROOT / "src" / namespace).is_dir() and namespace:
        return namespace
    return "compiler" if symbol.startswith("__") else None


def symbols(image):
    """(address, size, subsystem or None), each byte once where symbols overlap."""
    found = {}
    text = output("arm-none-eabi-nm", "-S", "-l", "--defined-only", str(image))
    imported = set(re.findall(r" __imp_(\w+)", text))
    for line in text.splitlines():
        match = re.match(r"(\w{8}) (\w{8}) \w (\S+)(?:\t(.*))?$", line)
        if match and int(match[2], 16):
            address, size = int(match[1], 16), int(match[2], 16)
            owner = "veneers" if match[3] in imported else (
                subsystem(match[4] or "") or owner_by_name(match[3]))
            found[address] = (size, owner or found.get(address, (0, None))[1])
    end = 0
    for address, (size, owner) in sorted(found.items()):
        begin = max(address, end)
        end = max(end, address + size)
        yield begin, end - begin, owner


def table(image):
    bytes_of = collections.defaultdict(collections.Counter)
    parts = sections(image)
    for address, size, owner in symbols(image):
        for name, start, length in parts:
            if start <= address < start + length:
                bytes_of[owner or "other"][name] += size
    for name, _, length in parts:
        bytes_of["constants"][name] = length - sum(row[name] for row in bytes_of.values())
    return bytes_of


def main():
    build = pathlib.Path(sys.argv[1]) if len(sys.argv) > 1 else ROOT / "build/ce"
    image, library = build / "orvenix.elf", build / "orvenix.dll"
    if not image.exists():
        sys.exit(f"{image}: there is no such file; build it first (cmake --build --preset ce)")
    rows = table(image)
    print(f"{'orvenix.dll':<18}" + "".join(f"{name:>9}" for name in COLUMNS) + f"{'all':>9}")
    for owner, row in sorted(rows.items(), key=lambda item: -sum(item[1].values())):
        print(f"  {owner:<16}" + "".join(f"{row[name]:>9}" for name in COLUMNS) + f"{sum(row.values()):>9}")
    whole = [sum(row[name] for row in rows.values()) for name in COLUMNS]
    print(f"  {'together':<16}" + "".join(f"{size:>9}" for size in whole) + f"{sum(whole):>9}")
    if library.exists():
        print(f"  the file has {library.stat().st_size} bytes (limit 163840, target 112640)")


if __name__ == "__main__":
    main()
