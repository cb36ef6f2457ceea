"""Installs the library of a build tree and uses it as an integrator does: the examples, in C and in
C++, are built against the installed files alone, by CMake and by pkg-config, and upgrade a device.

The bundle comes from another installed tree's program `orvenix`, which serves it, too.

usage: check_install.py BUILD_TREE BUILD_TREE_WITH_TOOLS
"""

import concurrent.futures
import json
import os
import pathlib
import shutil
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
WORK = ROOT / "build/integrator"
SERVER = "127.0.0.3"
TEXT = "What an integrator sends.\n" * 100
LIMIT = 120  # seconds for any one command


def call(*command, **more):
    print("$", " ".join(map(str, command)), flush=True)
    result = subprocess.run(list(map(str, command)), check=False, timeout=LIMIT, **more)
    if result.returncode != 0:
        sys.exit(f"check_install: {command[0]} exits with {result.returncode}")


def install(tree, name, *components):
    prefix, moved = WORK / "first", WORK / name
    for component in components:
        call("cmake", "--install", tree, "--component", component, "--prefix", prefix)
    # Installed files must not lean on the folders that they come from, nor on where they are.
    prefix.rename(moved)
    for file in moved.rglob("*.cmake"):
        if str(ROOT / "src") in file.read_text() or str(ROOT / "simulator") in file.read_text():
            sys.exit(f"check_install: {file.name} names a folder of the sources")
    return moved


def build_examples(prefix):
    """Both ways; returns the folders with the programs."""
    with_cmake = WORK / "cmake"
    call("cmake", "-S", ROOT / "examples", "-B", with_cmake, "-G", "Ninja",
         f"-DCMAKE_PREFIX_PATH={prefix}", "-DCMAKE_C_FLAGS=-Wall -Wextra -Wpedantic -Werror",
         "-DCMAKE_CXX_FLAGS=-Wall -Wextra -Wpedantic -Werror")
    call("cmake", "--build", with_cmake)
    with_make = WORK / "make"
    with_make.mkdir()
    call("make", "-C", ROOT / "examples", f"OUT={with_make}",
         env=dict(os.environ, PKG_CONFIG_PATH=str(prefix / "lib/pkgconfig")))
    return with_cmake, with_make


def make_bundle(program):
    files = WORK / "files"
    files.mkdir()
    (files / "notes.txt").write_text(TEXT)
    bundle = WORK / "bundle"
    call(program, "bundle", "make", files, bundle, "--address", SERVER)
    return bundle, json.loads((bundle / "bundle.json").read_text())


class Server:
    def __init__(self, program, bundle):
        self.process = subprocess.Popen(
            [str(program), "serve", str(bundle), "--json", "--port", "0"],
            stdout=subprocess.PIPE, stdin=subprocess.DEVNULL, text=True)
        self.port = None

    def __enter__(self):
        for line in self.process.stdout:
            event = json.loads(line)
            if "port" in event:
                self.port = event["port"]
                return self
        sys.exit("check_install: the server does not start")

    def __exit__(self, *_):
        self.process.terminate()
        self.process.communicate(timeout=LIMIT)


def upgrade(program, port, manifest):
    """Runs an example on a device of its own, which must then have the file."""
    listed, file = manifest["list"], manifest["files"][0]
    arguments = {"host": (listed["source"], listed["crc32"]),
                 "client": (file["source"], file["destination"], file["crc32"])}[program.name]
    device = program.parent / f"{program.name}-device"
    call(program, device, SERVER, port, *arguments, stdin=subprocess.DEVNULL)
    on_device = device / "storage" / file["destination"].replace("\\", "/").lstrip("/")
    if not on_device.exists() or on_device.read_text() != TEXT:
        sys.exit(f"check_install: after {program.name} the device has not got {file['destination']}")


def link_for_windows(tree):
    """The host in C against what is installed for desktop Windows."""
    prefix = install(tree, "windows", "library")
    call("x86_64-w64-mingw32-gcc", "-std=c90", "-Wall", "-Wextra", "-Werror", f"-I{prefix}/include",
         ROOT / "examples/host_in_c/host.c", ROOT / "examples/host_in_c/windows.c",
         f"-L{prefix}/lib", "-lorvenix", "-o", prefix / "bin/host.exe")


def look_at_device(tree):
    """What an integrator of the device finds."""
    prefix = install(tree, "device", "library")
    for file in ("bin/orvenix.dll", "lib/orvenix.lib", "include/orvenix/configlet.h"):
        if not (prefix / file).is_file():
            sys.exit(f"check_install: {tree} installs no {file}")


def main():
    if len(sys.argv) != 3:
        sys.exit(__doc__.strip())
    tree, tree_with_tools = pathlib.Path(sys.argv[1]).resolve(), pathlib.Path(sys.argv[2]).resolve()
    shutil.rmtree(WORK, ignore_errors=True)
    WORK.mkdir(parents=True)
    folders = build_examples(install(tree, "library", "library"))
    program = install(tree_with_tools, "tools", "library", "tools") / "bin/orvenix"
    bundle, manifest = make_bundle(program)
    with Server(program, bundle) as server:
        programs = [folder / name for folder in folders for name in ("host", "client")]
        with concurrent.futures.ThreadPoolExecutor(len(programs)) as pool:  # they mostly wait
            list(pool.map(lambda program: upgrade(program, server.port, manifest), programs))
    for tree, library, check in ((ROOT / "build/windows", "bin/orvenix.dll", link_for_windows),
                                 (ROOT / "build/ce", "orvenix.dll", look_at_device)):
        if (tree / library).exists():
            check(tree)
        else:
            print(f"not looked at: {tree} is not built")
    print("the installed library serves integrators in C and in C++")


if __name__ == "__main__":
    main()
