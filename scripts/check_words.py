"""Looks for leftovers in the tracked files: machine paths, platform conditions in src/, to-do marks."""

import re
import subprocess
import sys

RULES = [
    (re.compile(r"(^|[\s\"'=(])/(work|root|farm)/"), "a path of one machine", None),
    (re.compile(r"deb\.debian\.org|registry\.npmjs"), "a host of a package registry", None),
    (re.compile(r"^\s*#\s*(if|ifdef|ifndef|elif)\b.*(_WIN32|__linux__|UNDER_CE|__arm__|__x86_64__)"),
     "a platform condition", re.compile(r"^src/")),
    (re.compile(r"\b(TODO|FIXME|XXX)\b"), "a leftover mark", re.compile(r"^(src|simulator|server|tools)/")),
    (re.compile(r"\b(strcpy|strcat|sprintf|atoi|atol|strtol)\s*\("), "an unbounded or clamping call",
     re.compile(r"^src/")),
    (re.compile(r"(?<![%\w])[uL]\"|\bstd::(string|vector|thread|mutex|function)\b"),
     "what the device's library does not have", re.compile(r"^src/")),
    (re.compile(r"\bsubstr\s*\("), "a call that may throw; base::Part does not", re.compile(r"^src/")),
]


def main():
    files = subprocess.run(["git", "ls-files", "--cached", "--others", "--exclude-standard"],
                           capture_output=True, text=True, check=True).stdout.splitlines()
    complaints = []
    for name in files:
        if name == "scripts/check_words.py":
            continue
        try:
            lines = open(name, encoding="utf-8").read().splitlines()
        except (UnicodeDecodeError, FileNotFoundError, IsADirectoryError):
            continue
        for number, line in enumerate(lines, 1):
            for pattern, what, where in RULES:
                code = line.split("//")[0] if where and name.startswith("src/") else line
                if (where is None or where.match(name)) and pattern.search(code):
                    complaints.append(f"{name}:{number}: {what}: {line.strip()}")
    print("\n".join(complaints) if complaints else f"{len(files)} files, nothing found")
    return 1 if complaints else 0


if __name__ == "__main__":
    sys.exit(main())
