"""Writes the table of tests/conformance/differences.h into docs/platform.md.

usage: collect_differences.py [--check]   with --check it only says whether the document is up to date
"""

import pathlib
import re
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
SOURCE = ROOT / "tests/conformance/differences.h"
DOCUMENT = ROOT / "docs/platform.md"
TITLE = "| Call | The device | Desktop Windows, as Wine has it |\n|---|---|---|\n"
TABLE = re.compile(re.escape(TITLE) + r"(?:\|.*\n)*")
TEXT = r'((?:\s*"(?:[^"\\]|\\.)*")+)'
ROW = re.compile(r"\{Difference::k\w+,\s*" + ",".join([TEXT] * 3) + r"\}")


def plain(literals):
    """The text of adjacent literals."""
    parts = re.findall(r'"((?:[^"\\]|\\.)*)"', literals)
    return "".join(parts).replace('\\"', '"').replace("\\\\", "\\").replace("|", "\\|")


def main():
    rows = ROW.findall(SOURCE.read_text())
    if not rows:
        sys.exit(f"{SOURCE}: no rows found")
    table = TITLE + "".join("| " + " | ".join(map(plain, row)) + " |\n" for row in rows)
    old = DOCUMENT.read_text()
    if len(TABLE.findall(old)) != 1:
        sys.exit(f"{DOCUMENT}: needs one table that begins with: {TITLE.splitlines()[0]}")
    new = TABLE.sub(lambda _: table, old)
    if "--check" not in sys.argv[1:]:
        DOCUMENT.write_text(new)
        return 0
    print(f"{len(rows)} differences, " + ("all as documented" if new == old else
          "but docs/platform.md says otherwise: run scripts/collect_differences.py"))
    return 0 if new == old else 1


if __name__ == "__main__":
    sys.exit(main())
