"""The product's HTTP client beside curl: fetch, write and check the same files from one server."""

import contextlib
import json
import os
import pathlib
import random
import resource
import shutil
import signal
import socket
import statistics
import subprocess
import tempfile
import time

BIN = pathlib.Path(__file__).resolve().parent.parent / "build/release/bin"
SERVER = "127.0.0.2"
BIG, SMALL, SMALL_SIZE = 256 << 20, 1000, 20 << 10
ROUNDS = 5


def pinned(command, last):
    """The server has a processor of its own: left alone, the system now and then lets it share the
    client's, and either client's wall time then holds the server's work as well."""
    cores = sorted(os.sched_getaffinity(0))
    return ["taskset", "-c", str(cores[-1] if last else cores[0]), *command]


def measured(command, **options):
    """Wall and processor seconds of a command, and what it printed."""
    command = pinned(command, last=False)
    before = resource.getrusage(resource.RUSAGE_CHILDREN)
    start = time.monotonic()
    result = subprocess.run(command, check=True, stdout=subprocess.PIPE, text=True, **options)
    wall = time.monotonic() - start
    after = resource.getrusage(resource.RUSAGE_CHILDREN)
    cpu = (after.ru_utime - before.ru_utime) + (after.ru_stime - before.ru_stime)
    return {"wall": wall, "cpu": cpu}, result.stdout


class Server:
    def __init__(self, folder):
        with socket.socket() as probe:
            probe.bind((SERVER, 0))
            self.port = probe.getsockname()[1]
        serve = [BIN / "orvenix", "serve", folder, "--json", "--address", SERVER, "--port",
                 str(self.port), "--pause", "0"]
        self.process = subprocess.Popen(pinned(serve, last=True), stdout=subprocess.PIPE, text=True)
        self.process.stdout.readline()
        # Its events would fill the pipe.
        self.drain = subprocess.Popen(["cat"], stdin=self.process.stdout, stdout=subprocess.DEVNULL)

    def stop(self):
        self.process.send_signal(signal.SIGINT)
        self.process.wait(30)
        self.drain.wait(30)


@contextlib.contextmanager
def fresh(work, name):
    """A new folder for each run."""
    with tempfile.TemporaryDirectory(prefix=name, dir=work) as folder:
        yield pathlib.Path(folder)


def memory_folder():
    """Where files cost no disk: on one, making a file takes the longer the more were deleted lately."""
    folder = pathlib.Path("/dev/shm")
    return folder if folder.is_dir() and shutil.disk_usage(folder).free > 5 * BIG else None


def product(work, port, source, count, *skip):
    with fresh(work, "device") as device:
        figures, text = measured([BIN / "bench_fetch", device, f"http://{SERVER}:{port}", source,
                                  str(count), *skip])
    own = json.loads(text)
    figures["wall"] = own["wall_s"] - (0 if skip else own["pauses_s"])
    figures["pauses"] = own["pauses_s"]
    figures["peak_kib"] = own["peak_kib"]
    return figures


def curl(work, port, source, count):
    with fresh(work, "curl") as folder:
        names = [source.replace("%d", str(i)) for i in range(1, count + 1)]
        # The server's paths have no leading slash.
        config = "next\n".join(f'url = "http://{SERVER}:{port}/"\nrequest-target = "{name}"\n'
                               f'output = "{folder / name}"\nsilent\nfail\n' for name in names)
        fetch, _ = measured(["curl", "-K", "-"], input=config)
        check, _ = measured([BIN / "bench_zlib_crc", *[folder / name for name in names]])
    return {key: fetch[key] + check[key] for key in fetch}


def compare(work, port, source, count):
    ours, theirs = [], []
    for _ in range(ROUNDS):
        ours.append(product(work, port, source, count, "skip"))
        theirs.append(curl(work, port, source, count))
    middle = lambda rows, key: statistics.median(row[key] for row in rows)
    return ({key: middle(ours, key) for key in ours[0]}, {key: middle(theirs, key) for key in theirs[0]})


def row(what, ours, theirs, unit):
    print(f"  {what:42} {ours:9.3f} {theirs:9.3f} {unit:4}{theirs / ours:7.2f}", flush=True)


def fetch_rows(work):
    site = work / "site"
    site.mkdir()
    (site / "big.bin").write_bytes(random.Random(1).randbytes(1 << 20) * (BIG >> 20))
    (site / "little.bin").write_bytes(random.Random(2).randbytes(1 << 20))
    for i in range(1, SMALL + 1):
        (site / f"s{i}.bin").write_bytes(random.Random(i).randbytes(SMALL_SIZE))
    server = Server(site)
    try:
        ours, theirs = compare(work, server.port, "big.bin", 1)
        row("256 MiB, wall", ours["wall"], theirs["wall"], "s")
        row("256 MiB, processor", ours["cpu"], theirs["cpu"], "s")
        big_peak = ours["peak_kib"]
        ours, theirs = compare(work, server.port, "s%d.bin", SMALL)
        row("1,000 files of 20 KiB, wall", ours["wall"], theirs["wall"], "s")
        row("1,000 files of 20 KiB, processor", ours["cpu"], theirs["cpu"], "s")
        paused = product(work, server.port, "s%d.bin", SMALL)
        print(f"    (the product's fixed pauses come to {paused['pauses']:.1f} s beside that; with an idle\n"
              f"     processor in each of them, it takes {paused['cpu']:.3f} s of it)")
        little_peak = product(work, server.port, "little.bin", 1)["peak_kib"]
        print(f"  peak memory: {big_peak / 1024:.1f} MiB for 256 MiB, {little_peak / 1024:.1f} MiB for 1 MiB")
    finally:
        server.stop()


def fetch():
    """Fetching and checking files, beside curl with a CRC-32 by zlib after it."""
    print("fetch, write, CRC-32                           orvenix      curl          ratio")
    with tempfile.TemporaryDirectory(prefix="orvenix-bench-", dir=memory_folder()) as work:
        fetch_rows(pathlib.Path(work))
