"""The multicast sender and its clients beside two others, in network namespaces of their own.

Every host is a namespace; the switch between them is the kernel's bridge. A line with a rate and a
delay is a program in user space (bench_wire): it stands between the server and the bridge, where
everything passes once, however many receivers there are. Where each receiver loses frames of its
own, it is the switch itself. Each receiver's file is compared with what was sent: what a tool says
of itself is printed, but not believed.
"""

import contextlib
import hashlib
import json
import os
import pathlib
import random
import resource
import shutil
import signal
import subprocess
import sys
import tempfile
import time

BIN = pathlib.Path(__file__).resolve().parent.parent / "build/release/bin"
SERVER = "10.77.0.1"
LIMIT = 120  # seconds for one transfer
# Every block wakes every receiver: where nothing is lost, large ones cost each machine less. A
# device's receive buffer of 32 KiB holds one of these.
WIRED_BLOCK = 30000


def address(receiver):
    return f"10.77.0.{10 + receiver}"


def run(*command):
    subprocess.run(command, check=True, stdout=subprocess.DEVNULL)


class Hosts:
    """A server and some receivers on one network, until the context ends."""

    def __init__(self, receivers, link=None):
        self.receivers = range(receivers)
        self.link = link  # (Mbit/s, microseconds, percent, seed), or none for the kernel's bridge
        self.names = ["s", *[str(i) for i in self.receivers]]
        self.tag = f"orvb{os.getpid()}-"
        self.wire = None

    def __enter__(self):
        try:
            self.make()
        except BaseException:
            self.__exit__()
            raise
        return self

    def make(self):
        run("ip", "netns", "add", self.tag + "w")
        ports = []
        for index, name in enumerate(self.names):
            space, port = self.tag + name, f"p{index}"
            run("ip", "netns", "add", space)
            run("ip", "-n", self.tag + "w", "link", "add", port, "type", "veth", "peer", "name",
                "e", "netns", space)
            own = SERVER if index == 0 else address(index - 1)
            for command in (f"link set lo up", f"addr add {own}/24 brd + dev e", "link set e up",
                            "route add 224.0.0.0/4 dev e"):
                run("ip", "-n", space, *command.split())
            run("ip", "-n", self.tag + "w", "link", "set", port, "up")
            ports.append(port)
        loses = self.link and self.link[2] > 0
        if not loses:
            self.bridge(ports[1:] if self.link else ports)
        if self.link:
            self.wire = subprocess.Popen(
                self.inside("w", BIN / "bench_wire", *map(str, self.link),
                            *(ports if loses else self.line(ports[0]))),
                stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
            self.wire.stdout.readline()
        time.sleep(0.3)

    def bridge(self, ports):
        run("ip", "-n", self.tag + "w", "link", "add", "sw", "type", "bridge", "mcast_snooping", "0")
        # Firewalls that hear of bridged frames cost more than the bridge.
        for table in ("ip", "ip6", "arp"):
            filters = f"/proc/sys/net/bridge/bridge-nf-call-{table}tables"
            run(*self.inside("w", "sh", "-c", f"test ! -e {filters} || echo 0 > {filters}"))
        run("ip", "-n", self.tag + "w", "link", "set", "sw", "up")
        for port in ports:
            run("ip", "-n", self.tag + "w", "link", "set", port, "master", "sw")

    def line(self, port):
        """The ends of the line between a host's port and the bridge."""
        run("ip", "-n", self.tag + "w", "link", "add", "near", "type", "veth", "peer", "name", "far")
        run("ip", "-n", self.tag + "w", "link", "set", "near", "up")
        run("ip", "-n", self.tag + "w", "link", "set", "far", "up", "master", "sw")
        return port, "near"

    def __exit__(self, *_):
        if self.wire:
            self.wire.stdin.close()
            self.wire.wait(10)
        for name in [*self.names, "w"]:
            subprocess.run(["ip", "netns", "del", self.tag + name], stderr=subprocess.DEVNULL,
                           check=False)

    def inside(self, name, *command):
        return ["ip", "netns", "exec", self.tag + name, *command]


SAMPLER = """
import sys, time
with open('/sys/class/net/e/statistics/tx_bytes') as counter:
    last = None
    while True:
        counter.seek(0)
        now = counter.read().strip()
        if now != last:
            print(time.monotonic(), now, flush=True)
            last = now
        time.sleep(0.004)
"""
EDGE = 64 << 10  # bytes at the beginning and the end that greetings and farewells may take


class Meter:
    """When how much has left the server, as its interface counts."""

    def __init__(self, hosts):
        self.samples = tempfile.TemporaryFile("w+")  # a pipe would be full before long
        self.process = subprocess.Popen(hosts.inside("s", sys.executable, "-c", SAMPLER),
                                        stdout=self.samples)
        time.sleep(0.3)

    def stop(self):
        self.process.terminate()
        self.process.wait()
        self.samples.seek(0)
        rows = [line.split() for line in self.samples.read().splitlines()]
        self.samples.close()
        samples = [(float(when), int(sent)) for when, sent in (row for row in rows if len(row) == 2)]
        first, last = samples[0][1], samples[-1][1]
        if last - first < 2 * EDGE:
            return last - first, float("inf")
        begin = next(when for when, sent in samples if sent > first + EDGE)
        end = next(when for when, sent in samples if sent > last - EDGE)
        return last - first, max(end - begin, 1e-3)


def cpu_of(process):
    """Waits, and says what processor time the process took."""
    _, status, usage = os.wait4(process.pid, 0)
    process.returncode = os.waitstatus_to_exitcode(status)
    return usage.ru_utime + usage.ru_stime


class Orvenix:
    name = "orvenix"

    def __init__(self, block=1400, window=0, rate=0):
        self.block, self.window, self.rate = block, window, rate

    def receiver(self, hosts, index, folder):
        return hosts.inside(str(index), BIN / "bench_multicast_client", folder, address(index),
                            "-A=239.1.1.1 -P=7000")

    def sender(self, hosts, file):
        return hosts.inside("s", BIN / "bench_multicast_server", file, "\\file.bin", SERVER,
                            str(len(hosts.receivers)), str(self.block), str(self.rate),
                            str(self.window))

    @staticmethod
    def received(folder):
        return folder / "storage" / "file.bin"

    @staticmethod
    def proven(text, _receivers):
        return json.loads(text)["proven"] if text.startswith("{") else 0


class Udpcast:
    name = "udpcast"

    def __init__(self, rate=0):
        self.rate = rate

    def receiver(self, hosts, index, folder):
        return hosts.inside(str(index), "udp-receiver", "--file", folder / "file.bin",
                            "--interface", "e", "--nokbd", "--no-progress")

    def sender(self, hosts, file):
        limit = ["--max-bitrate", f"{self.rate}m"] if self.rate else []
        return hosts.inside("s", "udp-sender", "--file", file, "--interface", "e", "--nokbd",
                            "--no-progress", "--min-receivers", str(len(hosts.receivers)),
                            "--full-duplex", *limit)

    @staticmethod
    def received(folder):
        return folder / "file.bin"

    @staticmethod
    def proven(_text, _receivers):
        return None


class Uftp:
    name = "uftp"

    def __init__(self, rate=0):
        self.rate = rate

    def receiver(self, hosts, index, folder):
        return hosts.inside(str(index), "uftpd", "-d", "-I", "e", "-D", folder, "-T",
                            folder / "part", "-x", "0")

    def sender(self, hosts, file):
        everyone = ",".join(address(i) for i in hosts.receivers)
        return hosts.inside("s", "uftp", "-I", "e", "-R",
                            str(self.rate * 1000) if self.rate else "-1", "-H", everyone, file)

    @staticmethod
    def received(folder):
        return folder / "file.bin"

    @staticmethod
    def proven(_text, _receivers):
        return None


def transfer(tool, hosts, file, digest, work):
    """One file to all receivers. The seconds are those in which its bytes left the server; wall time
    is the sender's from its start to its end, with its waits for receivers."""
    folders = [work / f"{tool.name}-{i}" for i in hosts.receivers]
    for folder in folders:
        (folder / "part").mkdir(parents=True)
    clients = [subprocess.Popen(tool.receiver(hosts, i, folder), stdout=subprocess.DEVNULL,
                                stderr=subprocess.DEVNULL, stdin=subprocess.DEVNULL)
               for i, folder in enumerate(folders)]
    time.sleep(1)
    meter = Meter(hosts)
    start = time.monotonic()
    server = subprocess.Popen(tool.sender(hosts, file), stdout=subprocess.PIPE,
                              stderr=subprocess.STDOUT, stdin=subprocess.DEVNULL, text=True)
    with expiry(server):
        text = server.stdout.read()
        server_cpu = cpu_of(server)
    wall = time.monotonic() - start
    wire, seconds = meter.stop()
    good = sum(matches(tool.received(folder), digest) for folder in folders)
    client_cpu = [stop(client) for client in clients]
    for folder in folders:
        shutil.rmtree(folder)
    return {"wall": wall, "seconds": seconds, "wire": wire, "good": good, "server_cpu": server_cpu,
            "client_cpu": max(client_cpu), "proven": tool.proven(text, len(folders)),
            "said": text}


@contextlib.contextmanager
def expiry(process):
    guard = subprocess.Popen([sys.executable, "-c",
                              f"import os, time\ntime.sleep({LIMIT})\nos.kill({process.pid}, 9)"])
    try:
        yield
    finally:
        guard.kill()
        guard.wait()


def stop(client):
    """A client has done its work when the sender has ended; only the time of that counts."""
    with contextlib.suppress(ProcessLookupError):
        os.kill(client.pid, signal.SIGTERM)  # Popen's own way would forget one that has ended
    return cpu_of(client)


def matches(path, digest):
    if not path.is_file():
        return False
    with open(path, "rb") as file:
        return hashlib.file_digest(file, "sha256").hexdigest() == digest


def memory_folder():
    folder = pathlib.Path("/dev/shm")
    return folder if folder.is_dir() and shutil.disk_usage(folder).free > 4 << 30 else None


def row(tool, figures, size, receivers):
    proven = "" if figures["proven"] is None else f", {figures['proven']} proven"
    print(f"    {tool.name:<9}{size / figures['seconds'] / 1e6:>8.1f} MB/s{figures['wall']:>7.2f} s wall"
          f"{figures['wire'] / size:>8.3f} wire{figures['server_cpu']:>8.2f} s server"
          f"{figures['client_cpu']:>8.2f} s client   {figures['good']} of {receivers} right{proven}",
          flush=True)


def compare(title, tools, receivers, size, work, link=None):
    file = work / "file.bin"
    content = random.Random(7).randbytes(1 << 20) * (size >> 20)
    file.write_bytes(content)
    digest = hashlib.sha256(content).hexdigest()
    print(f"  {title}", flush=True)
    results = {}
    for tool in tools:
        with Hosts(receivers, link) as hosts:
            results[tool.name] = transfer(tool, hosts, file, digest, work)
        row(tool, results[tool.name], size, receivers)
    peers = [r["seconds"] for name, r in results.items()
             if name != "orvenix" and r["good"] == receivers]
    if peers:
        print(f"    {min(peers) / results['orvenix']['seconds']:.2f} times the better peer", flush=True)
    return results


def ideal(loss, receivers):
    """Times a block must be sent on average until all have it."""
    share = loss / 100
    return sum(1 - (1 - share**k) ** receivers for k in range(60))


def line_speed(block, megabits):
    """Bytes of a file that a line of Ethernet carries in a second, with preambles and gaps."""
    datagram = block + 6 + 8
    frames = -(-datagram // 1480)
    return megabits * 1e6 / 8 * block / (datagram + frames * (20 + 14 + 24))


def missing():
    if os.geteuid() != 0:
        return "network namespaces need root"
    for program, package in (("uftp", "uftp"), ("udp-sender", "udpcast"), ("ip", "iproute2")):
        if not shutil.which(program):
            return f"{program} is not installed (apt-get install {package})"
    return None


@contextlib.contextmanager
def measured(title):
    """A folder to work in, or none where nothing can be measured."""
    print(f"\nmulticast: {title}")
    reason = missing()
    if reason:
        print(f"  not measured: {reason}")
        yield None
        return
    with tempfile.TemporaryDirectory(prefix="orvenix-multicast", dir=memory_folder()) as folder:
        yield pathlib.Path(folder)


def multicast_bridge():
    """As fast as it goes."""
    with measured(f"64 MiB, kernel bridge, blocks of {WIRED_BLOCK} bytes (targets: 1.15 times the better "
                  "peer at 1 receiver, 1.25 at 4, 1.8 at 16; 1.04 bytes on the wire a byte)") as work:
        for receivers in (1, 4, 16, 32) if work else ():
            compare(f"{receivers} receivers", [Orvenix(block=WIRED_BLOCK), Udpcast(), Uftp()],
                    receivers, 64 << 20, work)


def multicast_blocks():
    """The same with smaller blocks."""
    with measured("64 MiB, kernel bridge, blocks of 8192 bytes") as work:
        for receivers in (4, 16) if work else ():
            compare(f"{receivers} receivers", [Orvenix(block=8192), Udpcast(), Uftp()], receivers,
                    64 << 20, work)


def multicast_line():
    """Over a line with a rate and a delay."""
    with measured(f"64 MiB, 100 Mbit/s, 1 ms round trip, blocks of {WIRED_BLOCK} bytes (target: within "
                  "2 % of the line)") as work:
        for receivers in (1, 4, 16, 32) if work else ():
            results = compare(f"{receivers} receivers",
                              [Orvenix(block=WIRED_BLOCK, rate=100), Udpcast(95), Uftp(95)],
                              receivers, 64 << 20, work, (100, 500, 0, 1))
            speed = (64 << 20) / results["orvenix"]["seconds"]
            share = speed / line_speed(WIRED_BLOCK, 100)
            print(f"    {100 * share:.1f} % of what the line carries", flush=True)


def multicast_loss():
    """Over lines that lose frames."""
    with measured("10 MiB to 8 receivers, 10 Mbit/s, 1 ms round trip") as work:
        for loss in (0, 1, 5, 10) if work else ():
            best = ideal(loss, 8) * (1400 + 52) / 1400
            results = compare(f"{loss} % loss (ideal {best:.3f} on the wire, with headers)",
                              [Orvenix(rate=10), Udpcast(9), Uftp(9)], 8, 10 << 20, work,
                              (10, 500, loss, 1))
            print(f"    {results['orvenix']['wire'] / (10 << 20) / best:.3f} times the ideal", flush=True)


PARTS = (multicast_line, multicast_bridge, multicast_blocks, multicast_loss)

if __name__ == "__main__":
    for part in PARTS:
        part()
