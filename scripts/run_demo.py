"""Upgrades a simulated device by HTTP from a real server and proves the outcome.

Everything it makes lies in out/demo: files, bundle, device, screen pictures, and in evidence/ what
the verdict was drawn from. Exit code 0 only if every line of the verdict holds.
"""

import argparse
import hashlib
import json
import os
import pathlib
import random
import shutil
import signal
import socket
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = ROOT / "build/release"
PROGRAM = BUILD / "bin/orvenix"
OUT = ROOT / "out/demo"
EVIDENCE = OUT / "evidence"
NAME, SERVER, DESTINATION = "demo", "127.0.0.2", "\\Application"
RIGHT, CORRUPT = "library/libcesim.so", "docs/architecture.md"
RUN_LIMIT_S = 300


def build():
    """Builds the tools; what the build says is shown only when it fails."""
    jobs = str(os.cpu_count() or 2)
    for command in (["cmake", "--preset", "release"],
                    ["cmake", "--build", "--preset", "release", "-j", jobs, "--target", "orvenix",
                     "orvenix_program"]):
        result = subprocess.run(command, cwd=ROOT, capture_output=True, text=True, check=False)
        if result.returncode != 0:
            sys.exit(f"demo: {' '.join(command)} failed:\n{result.stdout[-4000:]}{result.stderr[-4000:]}")


def make_files(folder):
    """Real files, text and binary: the build's own libraries, documents, and a large image."""
    copies = {
        "library/libcesim.so": BUILD / "lib/libcesim.so",
        "library/liborvenix.so": BUILD / "lib/liborvenix.so",
        "docs/architecture.md": ROOT / "docs/architecture.md",
        "docs/layers.svg": ROOT / "docs/pictures/layers.svg",
        "docs/read me first.txt": ROOT / "README.md",
        "licence.txt": ROOT / "LICENSE",
    }
    for name, source in copies.items():
        target = folder / name
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copyfile(source, target)
    (folder / "image").mkdir()
    (folder / "image/disk.bin").write_bytes(random.Random(2006).randbytes(36 * 1024 * 1024))
    (folder / "image/maps.bin").write_bytes(random.Random(1405).randbytes(6 * 1024 * 1024))
    (folder / "settings").mkdir()
    (folder / "settings/scanner.ini").write_text("[scanner]\nbeep=1\n")  # fits one segment
    (folder / "settings/network.ini.rename").write_text("[network]\nssid=warehouse\n")
    (folder / "settings/empty.ini").write_bytes(b"")


def on_device(device, name):
    """Where a file of the bundle ends on the device."""
    installed = name[:-len(".rename")] if name.endswith(".rename") else name
    return device / "storage" / DESTINATION.lstrip("\\") / installed


def spoil(files, device):
    """One file is already right; one is there, but damaged."""
    for name in (RIGHT, CORRUPT):
        target = on_device(device, name)
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copyfile(files / name, target)
    content = bytearray(on_device(device, CORRUPT).read_bytes())
    content[len(content) // 2] ^= 0x55
    on_device(device, CORRUPT).write_bytes(content)


def sha256(file):
    return hashlib.sha256(file.read_bytes()).hexdigest() if file.is_file() else None


def orvenix(*arguments, **options):
    return subprocess.run([str(PROGRAM), *map(str, arguments)], check=False, **options)


def must(what, *arguments):
    """Runs a verb whose output matters only when it fails."""
    result = orvenix(*arguments, capture_output=True, text=True)
    if result.returncode != 0:
        sys.exit(f"demo: {what} failed with exit code {result.returncode}:\n{result.stderr}")


class Server:
    """`orvenix serve` as a process of its own."""

    def __init__(self, bundle, port):
        self.process = subprocess.Popen(
            [str(PROGRAM), "serve", str(bundle), "--json", "--address", SERVER, "--port", str(port),
             "--report", str(EVIDENCE / "server-report.json")],
            stdout=subprocess.PIPE, text=True)
        if not self.process.stdout.readline():  # its first line says that it listens
            sys.exit("demo: the server did not start")

    def stop(self):
        """Ends the server and gives its live events back."""
        self.process.send_signal(signal.SIGINT)
        events = self.process.communicate(timeout=30)[0].splitlines()
        (EVIDENCE / "server-events.jsonl").write_text("\n".join(events) + "\n")
        return [json.loads(line) for line in events if line]


def free_port():
    """The bundle names its port before the server opens it."""
    with socket.socket() as probe:
        probe.bind((SERVER, 0))
        return probe.getsockname()[1]


def reason_of(name, log):
    """Why the device fetched a file, in the words of its own log."""
    path = (DESTINATION + "\\" + name.replace("/", "\\"))
    for line in log:
        if line.endswith(f"crc error, no file, {path}"):
            return "missing"
        if f"crc mismatch, {path}," in line:
            return "damaged"
    return "already right"


def judge(files, device, run_code, report, pictures):
    """Every statement of the verdict with whether it holds and the evidence for it."""
    log_file = device / "storage/FileXfer.log"
    log = log_file.read_text(errors="replace").splitlines() if log_file.is_file() else []
    if log:
        shutil.copyfile(log_file, EVIDENCE / "FileXfer.log")
    fetched = {fetch["path"].removeprefix(NAME + "/") for entry in report.get("devices", [])
               for fetch in entry["files"] if fetch["completed"] > 0}
    rows, sums = [], []
    for file in sorted(path for path in files.rglob("*") if path.is_file()):
        name = file.relative_to(files).as_posix()
        expected, found = sha256(file), sha256(on_device(device, name))
        why = reason_of(name, log)
        wanted = "already right" if name == RIGHT else (
            "damaged" if name == CORRUPT else "missing")
        transferred = name in fetched
        good = expected == found and why == wanted and transferred == (name != RIGHT)
        rows.append({"what": name, "good": good,
                     "evidence": f"{file.stat().st_size:,} bytes, {why}, "
                                 f"{'fetched' if transferred else 'not fetched'}, "
                                 f"{'equal' if expected == found else 'DIFFERENT'}"})
        sums.append(f"{expected}  {found}  {name}")
    (EVIDENCE / "sha256.txt").write_text("bundle  device  name\n" + "\n".join(sums) + "\n")
    done = [entry["report"] for entry in report.get("devices", []) if entry.get("report")]
    rows.append({"what": "job ended well", "good": run_code == 0,
                 "evidence": f"`orvenix run` exit code {run_code}"})
    rows.append({"what": "transfer log", "good": any("UpgradeThread - Exiting" in line for line in log),
                 "evidence": f"{len(log)} lines, evidence/FileXfer.log"})
    rows.append({"what": "completion report", "good": len(done) == 1 and done[0]["error"] == "",
                 "evidence": f"{done[0]['bundle_rx']:,} bytes by HTTP" if done else "none received"})
    rows.append({"what": "progress window", "good": len(pictures) >= 2,
                 "evidence": f"{len(pictures)} pictures in screen/"})
    return rows


def main():
    parser = argparse.ArgumentParser(prog="./demo", description=__doc__.splitlines()[0])
    parser.parse_args()
    print("building ...", flush=True)
    build()
    shutil.rmtree(OUT, ignore_errors=True)
    files, bundle, device = OUT / "files", OUT / "bundle", OUT / "device"
    EVIDENCE.mkdir(parents=True)
    make_files(files)
    port = free_port()
    print("making a bundle and a device ...", flush=True)
    must("orvenix bundle make", "bundle", "make", files, bundle, "--address", SERVER, "--port", port,
         "--dest", DESTINATION, "--name", NAME)
    must("orvenix device new", "device", "new", device)
    spoil(files, device)

    server = Server(bundle, port)
    try:
        run = orvenix("run", bundle / "job.xml", "--device", device, "--screens", OUT / "screen",
                      "--timeout", RUN_LIMIT_S)
    finally:
        server.stop()
    report_file = EVIDENCE / "server-report.json"
    report = json.loads(report_file.read_text()) if report_file.is_file() else {}
    rows = judge(files, device, run.returncode, report, sorted((OUT / "screen").glob("*.png")))
    good = all(row["good"] for row in rows)
    (OUT / "verdict.json").write_text(json.dumps({"good": good, "rows": rows}, indent=2) + "\n")
    print("\nverdict")
    for row in rows:
        print(f"  {'ok ' if row['good'] else 'BAD'}  {row['what']:32} {row['evidence']}")
    print(f"{'all of it holds' if good else 'NOT ALL OF IT HOLDS'}; see out/demo")
    return 0 if good else 1


if __name__ == "__main__":
    sys.exit(main())
