"""clang-tidy over the project's own sources, remembering which were clean.

A source is checked again when it, a header of the project or the configuration has changed. The
compile commands come from build/tidy, a release tree that is never built and has no precompiled
headers: clang cannot read another compiler's.
"""

import concurrent.futures
import hashlib
import json
import os
import pathlib
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
TREE = ROOT / "build/tidy"
STAMPS = TREE / "clean"
FOLDERS = ("src", "simulator", "server", "tools")


def headers_digest():
    digest = hashlib.sha256((ROOT / ".clang-tidy").read_bytes())
    for folder in (*FOLDERS, "include", "platform"):
        for header in sorted((ROOT / folder).rglob("*.h")):
            digest.update(str(header).encode() + header.read_bytes())
    return digest.hexdigest()


def check(source, common):
    digest = hashlib.sha256(common.encode() + source.read_bytes()).hexdigest()
    stamp = STAMPS / (str(source.relative_to(ROOT)).replace("/", "_") + ".clean")
    if stamp.exists() and stamp.read_text() == digest:
        return source, 0, ""
    result = subprocess.run(["clang-tidy-14", "-p", str(TREE), "--quiet", str(source)],
                            capture_output=True, text=True, check=False)
    if result.returncode == 0:
        stamp.write_text(digest)
    return source, result.returncode, result.stdout


def main():
    commands = json.loads((TREE / "compile_commands.json").read_text())
    sources = sorted({pathlib.Path(entry["file"]).resolve() for entry in commands})
    sources = [source for source in sources if source.is_relative_to(ROOT)
               and source.relative_to(ROOT).parts[0] in FOLDERS]
    STAMPS.mkdir(parents=True, exist_ok=True)
    common = headers_digest()
    failed = 0
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count() or 2) as pool:
        for source, code, output in pool.map(lambda s: check(s, common), sources):
            if code != 0:
                failed += 1
                print(f"{source.relative_to(ROOT)}:\n{output}")
    print(f"{len(sources)} sources, {failed} with findings")
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
