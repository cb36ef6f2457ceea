"""Instructions that the device's processor takes for what the library does most.

The library's sources are compiled by the device's compiler with the very flags of the library's
build, into a program that stands on no system; qemu carries it out instruction by instruction and
writes each down. The difference between doing a thing three times and once is what it takes once,
exactly, on any machine. A core of the device takes about one instruction a cycle while it waits for
no memory.
"""

import json
import pathlib
import shlex
import shutil
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
BASELINE = ROOT / "bench" / "arm_baseline.json"
SOURCES = ["src/base/crc32.cpp", "src/mcftp/cipher/blowfish.cpp", "src/mcftp/cipher/fixed_key.cpp",
           "src/mcftp/cipher/frame_cipher.cpp", "src/mcftp/cipher/pi.cpp", "src/mcftp/wire/frames.cpp",
           "src/mcftp/rules/block_bitmap.cpp", "platform/ce/runtime/memory.cpp"]
# (row, part of the program, bytes): what is divided by what.
ROWS = [("CRC-32 of 4096 bytes", "crc", 4096),
        ("enciphering 1400 bytes", "encipher", 1400),
        ("deciphering 1400 bytes", "decipher", 1400),
        ("reading an XML document", "xml", None),
        ("a received frame of 1400 bytes in the clear", "clear", 1400),
        ("a received frame of 1400 bytes, enciphered", "enciphered", 1400)]


def run(command, **options):
    done = subprocess.run([str(part) for part in command], capture_output=True, text=True, check=False, **options)
    if done.returncode != 0:
        sys.exit(f"{done.stdout[-2000:]}{done.stderr[-2000:]}\narm: {command[0]} failed")


def compile_commands():
    """How the build of the library compiles each of its sources, as words."""
    run(["cmake", "--preset", "ce"], cwd=ROOT)
    entries = json.loads((ROOT / "build/ce/compile_commands.json").read_text())
    return {pathlib.Path(entry["file"]).relative_to(ROOT).as_posix(): shlex.split(entry["command"])
            for entry in entries if pathlib.Path(entry["file"]).is_relative_to(ROOT)}


def compile_to(words, source, target):
    """The same command for one source, with an object of its own that holds code."""
    start = next(i for i, word in enumerate(words) if word.endswith("arm-none-eabi-g++"))
    kept = [word for i, word in enumerate(words[start:], start)
            if word not in ("-o", "-c") and words[i - 1] not in ("-o", "-c")]
    run(kept + ["-fno-lto", "-o", target, "-c", ROOT / source])


def build(folder):
    commands = compile_commands()
    objects = []
    for source in SOURCES + sorted(name for name in commands if name.startswith("src/xml/")):
        objects.append(folder / (source.replace("/", "_") + ".o"))
        compile_to(commands[source], source, objects[-1])
    objects.append(folder / "instructions.o")
    compile_to(commands["src/xml/parser.cpp"], "bench/arm/instructions.cpp", objects[-1])
    program = folder / "instructions"
    run(["arm-none-eabi-g++", "-marm", "-march=armv4t", "-mfloat-abi=soft", "-nostdlib", "-static", "-Wl,--gc-sections",
         "-Wl,-Ttext-segment=0x10000", "-o", program, *objects, "-lgcc"])
    return program


def executed(program, part, times):
    """Instructions of the program, its start included."""
    log = program.with_suffix(".log")
    run(["qemu-arm", "-singlestep", "-d", "exec,nochain", "-D", log, program, part, str(times)])
    with open(log, "rb") as lines:
        return sum(1 for line in lines if line.startswith(b"Trace "))


def once(program, part):
    three, one = executed(program, part, 3), executed(program, part, 1)
    return (three - one) // 2


def document_size(program_source):
    """Bytes of the document in the program."""
    text = program_source.read_text()
    start = text.index('R"(') + 3
    return len(text[start:text.index(')"', start)].encode())


def count():
    with tempfile.TemporaryDirectory() as folder:
        program = build(pathlib.Path(folder))
        copy = once(program, "copy")
        found = {}
        for row, part, size in ROWS:
            size = size or document_size(ROOT / "bench/arm/instructions.cpp")
            # Each frame is a fresh copy, which is no part of taking it.
            instructions = once(program, part) - (copy if part in ("clear", "enciphered") else 0)
            found[row] = {"instructions": instructions, "bytes": size}
        return found


def arm():
    """Instructions by part, beside those that were recorded."""
    for tool, package in (("arm-none-eabi-g++", "gcc-arm-none-eabi"), ("qemu-arm", "qemu-user")):
        if shutil.which(tool) is None:
            print(f"\ninstructions on ARM: skipped, {package} is not installed")
            return
    recorded = json.loads(BASELINE.read_text()) if BASELINE.exists() else {}
    print("\nOn ARM, version 4T                           instructions   a byte   recorded")
    for row, found in count().items():
        before = recorded.get(row, {}).get("instructions")
        change = f"{found['instructions'] / before - 1:+.1%}" if before else "never"
        print(f"  {row:<45}{found['instructions']:>10}{found['instructions'] / found['bytes']:>9.2f}{change:>11}")


if __name__ == "__main__":
    if sys.argv[1:] == ["--record"]:
        BASELINE.write_text(json.dumps(count(), indent=2) + "\n")
    elif sys.argv[1:] == ["--json"]:
        print(json.dumps(count(), indent=2))
    else:
        arm()
