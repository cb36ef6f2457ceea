"""Installs the library of a build tree and uses it as an integrator does: the examples, in C and in
C++, are built against the installed files alone, by CMake and by pkg-config, and upgrade a device.

usage: check_install.py BUILD_TREE ORVENIX_PROGRAM
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
PREFIX = WORK / "installed"
SERVER = "127.0.0.3"
TEXT = "What an integrator sends.\n" * 100
LIMIT = 120  # seconds for any one command


def call(*command, **more):
    print("$", " ".join(map(str, command)), flush=True)
    result = subprocess.run(list(map(str, command)), check=False, timeout=LIMIT, **more)
    if result.returncode != 0:
        sys.exit(f"check_install: {command[0]} exits with {result.returncode}")


def install(tree):
    call("cmake", "--install", tree, "--component", "library", "--prefix", PREFIX)
    # Installed files must not lean on the folders that they come from: as if those were elsewhere.
    moved = WORK / "moved"
    PREFIX.rename(moved)
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


def main():
    if len(sys.argv) != 3:
        sys.exit(__doc__.strip())
    tree, program = pathlib.Path(sys.argv[1]).resolve(), pathlib.Path(sys.argv[2]).resolve()
    shutil.rmtree(WORK, ignore_errors=True)
    WORK.mkdir(parents=True)
    folders = build_examples(install(tree))
    bundle, manifest = make_bundle(program)
    with Server(program, bundle) as server:
        programs = [folder / name for folder in folders for name in ("host", "client")]
        with concurrent.futures.ThreadPoolExecutor(len(programs)) as pool:  # they mostly wait
            list(pool.map(lambda program: upgrade(program, server.port, manifest), programs))
    print("the installed library serves integrators in C and in C++")


if __name__ == "__main__":
    main()
