"""Holds what a built library needs against platform/surface.txt.

usage: check_surface.py <liborvenix.so>

Every function of the platform that the library calls stands in that file and has a conformance test
that names it; a line that nobody calls is removed. The compiler's own run time, mem* and str* are
free. Nothing in the library runs before its first call: it has no dynamic initialisers.
"""

import pathlib
import re
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
SURFACE = ROOT / "platform/surface.txt"
TESTS = ROOT / "tests/conformance"
RUN_TIME = re.compile(
    r"^(mem\w+|str\w+|__stack_chk_\w+|__cxa_finalize|__cxa_pure_virtual|__gmon_start__|_ITM_\w+"
    r"|__(asan|ubsan|tsan|sanitizer)_\w+)$")


def needed(path):
    """The undefined symbols, with the names that the device gives its sockets and streams."""
    lines = subprocess.run(["nm", "-D", "--undefined-only", str(path)], check=True,
                           capture_output=True, text=True).stdout.splitlines()
    names = {line.split()[-1].split("@")[0] for line in lines}
    return {name.removeprefix("ce_") for name in names if not RUN_TIME.match(name)}


def initialisers(path):
    """The sources with objects that are set up by code when the library is loaded."""
    names = subprocess.run(["nm", str(path)], check=True, capture_output=True, text=True).stdout
    return re.findall(r"\b_GLOBAL__sub_I_(\S+)", names)


def main():
    if len(sys.argv) != 2:
        sys.exit(__doc__.split("\n\n")[1])
    path = pathlib.Path(sys.argv[1])
    if not path.exists():
        sys.exit(f"{path}: there is no such library; build it first")
    listed = {line.strip() for line in SURFACE.read_text().splitlines()
              if line.strip() and not line.startswith("#")}
    used = needed(path)
    tested = set(re.findall(r"\w+", " ".join(file.read_text() for file in TESTS.glob("*.cpp"))))
    complaints = [f"{path}: needs {name}, which platform/surface.txt does not list"
                  for name in sorted(used - listed)]
    complaints += [f"{path}: {name} sets something up at load time; make it constant"
                   for name in initialisers(path)]
    complaints += [f"platform/surface.txt: {name} is not called any more; remove it"
                   for name in sorted(listed - used)]
    complaints += [f"tests/conformance: no test names {name}; add one"
                   for name in sorted(listed - tested)]
    print("\n".join(complaints) if complaints
          else f"{path}: needs {len(used)} functions of the platform, all listed and tested")
    return 1 if complaints else 0


if __name__ == "__main__":
    sys.exit(main())
