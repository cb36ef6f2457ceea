"""Holds every include of the project against scripts/layers.txt.

Beyond src/: the simulator includes nothing of src/; the server may use the pure components only;
tools may use the server, the simulator, src/base and the public headers; tests may use everything.
"""

import pathlib
import re
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
INCLUDE = re.compile(r'^\s*#\s*include\s+([<"])([^>"]+)[>"]')
# The only standard headers that the product may use: the device's library links no more run time.
STANDARD = {"atomic", "array", "cstdarg", "cstddef", "cstdint", "cstring", "limits", "new", "optional",
            "string_view", "type_traits", "utility"}
PLATFORM = {"coredll.h"}
# The one source of the tools that runs the product itself, on simulated devices.
RUNS_PRODUCT = {"tools/fleet/device_program.cpp"}


def read_layers():
    components, allowed, pure = [], {}, set()
    for number, line in enumerate((ROOT / "scripts/layers.txt").read_text().splitlines(), 1):
        words = line.split("#")[0].split()
        if not words:
            continue
        name, system, *others = words
        if system not in ("pure", "yes"):
            sys.exit(f"scripts/layers.txt:{number}: the second word is 'pure' or 'yes', not '{system}'")
        others = list(components) if others == ["*"] else others
        for other in others:
            if other not in components:
                sys.exit(f"scripts/layers.txt:{number}: {other} does not stand above {name}")
        components.append(name)
        allowed[name] = set(others) | {name, "base"}
        if system == "pure":
            pure.add(name)
    return components, allowed, pure


def component_of(path, components):
    """The longest component that a path below src/ lies in, or None."""
    parts = path.split("/")[:-1]
    for length in range(len(parts), 0, -1):
        if "/".join(parts[:length]) in components:
            return "/".join(parts[:length])
    return None


def includes(folder):
    for file in sorted((ROOT / folder).rglob("*")):
        if file.suffix in (".h", ".cpp"):
            for number, line in enumerate(file.read_text(errors="replace").splitlines(), 1):
                match = INCLUDE.match(line)
                if match:
                    yield file.relative_to(ROOT), number, match.group(1) == "<", match.group(2)


def check_product(complain, components, allowed, pure):
    for file, number, angled, name in includes("src"):
        inside = str(file.relative_to("src"))
        component = component_of(inside, components)
        if component is None:
            complain(file, number, "lies in no component of scripts/layers.txt; add it there")
        elif (ROOT / "src" / name).exists():
            target = component_of(name, components)
            if target not in allowed[component]:
                complain(file, number, f"{component} may not include {target} ({name})")
        elif name.startswith("orvenix/"):
            if component in pure:
                complain(file, number, f"{component} is pure and may not include {name}")
        elif name in PLATFORM:
            if component in pure:
                complain(file, number, f"{component} is pure and may not include <{name}>")
        elif name not in STANDARD:
            complain(file, number, f"{name} is neither of the product nor of what the device links")
        if angled and (ROOT / "src" / name).exists():
            complain(file, number, f"{name} is the product's own: include it with quotes")


def check_others(complain, components, pure):
    def of_product(name):
        return component_of(name, components) if (ROOT / "src" / name).exists() else None

    for file, number, _, name in includes("simulator"):
        if of_product(name) or name.startswith("orvenix/"):
            complain(file, number, f"the simulator includes nothing of the product ({name})")
    for file, number, _, name in includes("server"):
        target = of_product(name)
        if target and target not in pure:
            complain(file, number, f"the server may use pure components only, not {target} ({name})")
    for file, number, _, name in includes("tools"):
        target = of_product(name)
        if target and target not in pure and str(file) not in RUNS_PRODUCT:
            complain(file, number, f"tools may not use {target} ({name})")


def main():
    components, allowed, pure = read_layers()
    complaints = []
    def complain(file, number, text):
        complaints.append(f"{file}:{number}: {text}")

    check_product(complain, set(components), allowed, pure)
    check_others(complain, set(components), pure)
    for name in components:
        if not (ROOT / "src" / name).is_dir():
            complaints.append(f"scripts/layers.txt: there is no folder src/{name}")
    print("\n".join(complaints) if complaints else f"{len(components)} components, all includes allowed")
    return 1 if complaints else 0


if __name__ == "__main__":
    sys.exit(main())
