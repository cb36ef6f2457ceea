"""Holds what a built library exports against src/exports/exports.txt.

usage: check_exports.py <liborvenix.so or orvenix.dll>
"""

import pathlib
import re
import shutil
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
LIST = ROOT / "src/exports/exports.txt"


def output(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def of_shared_object(path):
    lines = output("nm", "-D", "--defined-only", str(path)).splitlines()
    return [line.split()[-1].split("@")[0] for line in lines]


def of_dll(path):
    tool = shutil.which("x86_64-w64-mingw32-objdump") or "objdump"
    text = output(tool, "-p", str(path))
    table = text[text.index("[Ordinal/Name Pointer] Table"):]
    return re.findall(r"^\s*\[\s*\d+\]\s+(?:\+base\[\s*\d+\]\s+(?:[0-9a-f]+\s+)?)?(\S+)$", table, re.M)


def plain(symbols):
    """Names without arguments, results and qualifiers: `UpgradeConfig::GetModel`."""
    demangled = output("c++filt", *symbols).splitlines() if symbols else []
    return {name.split("(")[0] for name in demangled}


def main():
    if len(sys.argv) != 2:
        sys.exit(__doc__.strip())
    path = pathlib.Path(sys.argv[1])
    if not path.exists():
        sys.exit(f"{path}: there is no such library; build it first")
    symbols = of_dll(path) if path.suffix == ".dll" else of_shared_object(path)
    expected = {line for line in LIST.read_text().splitlines() if line and not line.startswith("#")}
    found = plain(symbols)
    decorated = [name for name in expected if "::" not in name and name in found and name not in symbols]
    complaints = [f"{path}: exports {name}, which {LIST.relative_to(ROOT)} does not list"
                  for name in sorted(found - expected)]
    complaints += [f"{path}: does not export {name}" for name in sorted(expected - found)]
    complaints += [f"{path}: exports {name} under a decorated name" for name in sorted(decorated)]
    print("\n".join(complaints) if complaints else f"{path}: {len(found)} names, all as listed")
    return 1 if complaints else 0


if __name__ == "__main__":
    sys.exit(main())
