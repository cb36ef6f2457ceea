"""Collects the comments marked KEPT ODDITY into docs/oddities.md.

`--check` only tells whether the page is up to date.
"""

import pathlib
import re
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
PAGE = ROOT / "docs/oddities.md"
HEAD = """# Kept oddities

For: whoever reads the code, finds something that looks like a mistake and wants to repair it.

Each of these is kept on purpose: hosts, servers and scripts in the field rely on it. The page is
collected from the sources by `scripts/collect_oddities.py`; edit the comments, not the page.
"""


def comments(file):
    """The KEPT ODDITY comments of a file, each as one line of text."""
    found, current = [], None
    for line in file.read_text(encoding="utf-8").splitlines():
        text = re.match(r"^.*?//+\s?(.*)$", line)
        only_comment = re.match(r"^\s*//", line)
        if text and "KEPT ODDITY" in text.group(1):
            current = [text.group(1).split("KEPT ODDITY", 1)[1].lstrip(": ")]
            found.append(current)
        elif current is not None and only_comment and text.group(1).strip():
            current.append(text.group(1))
        else:
            current = None
    return [" ".join(part.strip() for part in parts) for parts in found]


def page():
    out = [HEAD]
    for file in sorted((ROOT / "src").rglob("*")):
        if file.suffix in (".h", ".cpp"):
            lines = comments(file)
            if lines:
                out.append(f"\n## {file.relative_to(ROOT)}\n")
                out.extend(f"- {line[0].upper()}{line[1:]}" for line in lines)
    return "\n".join(out) + "\n"


def main():
    text = page()
    if "--check" in sys.argv:
        if PAGE.exists() and PAGE.read_text(encoding="utf-8") == text:
            return 0
        print("docs/oddities.md is out of date; run scripts/collect_oddities.py")
        return 1
    PAGE.write_text(text, encoding="utf-8")
    return 0


if __name__ == "__main__":
    sys.exit(main())
