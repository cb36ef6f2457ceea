"""Upgrades simulated devices by multicast and HTTP from a real server and proves the outcome.

The devices do not hear a part of what the server sends, one file is announced that is not for them,
some go by HTTP only, and one is damaged on each device once it has been received: validation must
find it. Everything the demo makes lies in out/demo: files, bundle, devices, screen pictures, and in
evidence/ what the verdict was drawn from. Exit code 0 only if every line of the verdict holds.

A scenario goes another way and proves that it ends as it must: result, messages, and what was
touched before. Its files lie in out/demo-SCENARIO. With the target ce the device's own binary does all
of that under qemu (demo_ce.py); files in out/demo-ce and out/demo-SCENARIO-ce.
"""

import argparse
import dataclasses
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
import threading
import time
import xml.etree.ElementTree as ElementTree

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = ROOT / "build/release"
PROGRAM = BUILD / "bin/orvenix"
NAME, SERVER, DESTINATION = "demo", "127.0.0.2", "\\Application"
RIGHT, CORRUPT = "library/libcesim.so", "docs/architecture.md"  # on the device before; HTTP only
FOREIGN, FOREIGN_MASKS = "other/scanner.bin", "MV41*"  # announced, and not for these devices
SPOILT = "image/maps.bin"  # damaged on the device after it has come
EMPTY = "settings/empty.ini"  # no list can say its checksum: fetched by HTTP in every run
WHY = {RIGHT: "already right", CORRUPT: "damaged", SPOILT: "damaged", EMPTY: "missing"}
GROUP, DEVICE_TEXT = "239.1.1.1", "TQ52"
RUN_LIMIT_S = 600
FIRMWARE = "firmware"  # a scenario of its own: demo_firmware.py

BEGIN_TEXT, END_TEXT = "Demo upgrade", "Demo upgrade done"
STOPPED = "scanner.exe"  # runs on the device, and the job stops it
OLD = "Old"  # a folder that the job cleans, but for one file
DELETED, SAVED = ("notes.txt", "cache/data.bin"), "keep/licence.key"
TEST_KEY, TEST_MESSAGE = r"SOFTWARE\Demo", "This device is not prepared for the demo"
STARTED, COMPLETE, FAILED = 205181, 205182, 205180  # device events


@dataclasses.dataclass(frozen=True)
class Scenario:
    """What is different, and how it must end."""
    name: str = ""
    settings: tuple = ()  # of the device's profile
    prepared: int = 3  # the registry's value; the test asks for 3 or more
    required_space: str = ""  # in the job, instead of what the bundle needs
    exit_code: int = 0
    result: int = 0  # of the end of the group "Upgrade"
    outcome: str = "complete"  # in the words of `orvenix explain`
    statuses: tuple = ((4, BEGIN_TEXT), (1, END_TEXT))
    events: tuple = ((STARTED, ""), (COMPLETE, ""))
    cleaned: bool = True  # processes stopped, old files deleted
    multicast: bool = True

    @property
    def folder(self):
        return ROOT / "out" / ("demo" if not self.name else f"demo-{self.name}")


SCENARIOS = {scenario.name: scenario for scenario in (
    Scenario(),
    Scenario("http", multicast=False),
    Scenario("nopower", settings=("power.ac_line=0", "power.battery_flag=4"), exit_code=13,
             result=0xC4111003, outcome="refused", statuses=(),
             events=((FAILED, "Power requirement not met"),), cleaned=False),
    Scenario("nospace", required_space="2000000000", exit_code=12, result=0xC4111002,
             outcome="refused", statuses=(), events=((FAILED, "No space available"),)),
    Scenario("failedtest", prepared=2, exit_code=14, result=0xC4111005, outcome="refused",
             statuses=((1, "Upgrade Failed: " + TEST_MESSAGE),),
             events=((FAILED, TEST_MESSAGE),), cleaned=False),
)}


def build():
    """Builds the tools."""
    build_with("release", "orvenix", "orvenix_program")


def build_with(preset, *targets):
    """What the build says is shown only when it fails."""
    jobs = str(os.cpu_count() or 2)
    for command in (["cmake", "--preset", preset],
                    ["cmake", "--build", "--preset", preset, "-j", jobs,
                     *(["--target", *targets] if targets else [])]):
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
    (folder / "other").mkdir()
    (folder / FOREIGN).write_bytes(random.Random(41).randbytes(300 * 1024))
    (folder / "settings").mkdir()
    (folder / "settings/scanner.ini").write_text("[scanner]\nbeep=1\n")  # fits one segment
    (folder / "settings/network.ini.rename").write_text("[network]\nssid=warehouse\n")
    (folder / EMPTY).write_bytes(b"")


def on_device(device, name):
    """Where a file of the bundle ends on the device."""
    installed = name[:-len(".rename")] if name.endswith(".rename") else name
    return device / "storage" / DESTINATION.lstrip("\\") / installed


def prepare(device, scenario):
    """What is on the device before: a program that runs, old files, and a value in the registry."""
    profile = device / "device.profile"
    text = profile.read_text()
    if "[processes]\n" not in text:
        sys.exit("demo: the device's profile has no [processes]")
    profile.write_text(text.replace("[processes]\n", f"[processes]\nprocess = {STOPPED}\n"))
    for name in (*DELETED, SAVED):
        file = device / "storage" / OLD / name
        file.parent.mkdir(parents=True, exist_ok=True)
        file.write_text(f"{name} of an earlier release\n")
    (device / "registry.reg").write_text(
        "Windows Registry Editor Version 5.00\n\n"
        f"[HKEY_LOCAL_MACHINE\\{TEST_KEY}]\n\"Prepared\"=dword:{scenario.prepared:08x}\n")


def extend(job_file, scenario):
    """Adds to the bundle's job what a bundle alone does not say."""
    def group(parent, name, **fields):
        made = ElementTree.SubElement(parent, "Group", Name=name)
        for field, value in fields.items():
            ElementTree.SubElement(made, "Field", Name=field).text = value
        return made

    document = ElementTree.parse(job_file)
    upgrade = document.find(".//Group[@Name='Upgrade']")
    group(group(upgrade, "Tests"), "Registry", Root="HKEY_LOCAL_MACHINE", Key=TEST_KEY,
          ValueName="Prepared", Type="REG_DWORD", Operator="GTE", Value="3", ErrorMsg=TEST_MESSAGE)
    group(upgrade, "StopProcess", Process=STOPPED)
    cleanup = group(upgrade, "DiskCleanup")
    group(cleanup, "File", Name=f"\\{OLD}", Action="Delete")
    group(cleanup, "File", Name="\\" + f"{OLD}/{SAVED}".replace("/", "\\"), Action="Save")
    if scenario.required_space:
        upgrade.find(".//Field[@Name='RequiredSpace']").text = scenario.required_space
    document.write(job_file, encoding="utf-8", xml_declaration=True)


def damage(file):
    """Changes one byte where it stands."""
    with file.open("r+b") as content:
        content.seek(file.stat().st_size // 2)
        byte = content.read(1)[0]
        content.seek(-1, os.SEEK_CUR)
        content.write(bytes([byte ^ 0x55]))


def spoil(files, device):
    """One file is already right; one is there, but damaged."""
    for name in (RIGHT, CORRUPT):
        target = on_device(device, name)
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copyfile(files / name, target)
    damage(on_device(device, CORRUPT))


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

    def __init__(self, bundle, port, evidence, more):
        self.evidence = evidence
        self.process = subprocess.Popen(
            [str(PROGRAM), "serve", str(bundle), "--json", "--address", SERVER, "--port", str(port),
             "--report", str(evidence / "server-report.json"), *more],
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, text=True)
        self.lines = []
        first = self.process.stdout.readline()  # its first line says that it listens
        if not first:
            sys.exit("demo: the server did not start")
        self.lines.append(first)
        self.reader = threading.Thread(target=self.read)
        self.reader.start()

    def read(self):
        self.lines.extend(self.process.stdout)

    def multicast_events(self):
        """What it has said so far of the files that go to the group."""
        events = (json.loads(line) for line in list(self.lines))
        return [event for event in events
                if event["event"] == "multicast" and event.get("what") not in (None, "ready")]

    def await_line(self, text):
        """Waits until the server has said this."""
        limit = time.monotonic() + 30
        while not any(text in line for line in self.lines):
            if time.monotonic() > limit or self.process.poll() is not None:
                sys.exit(f"demo: the server never said {text}")
            time.sleep(0.02)

    def stop(self):
        """Ends the server and keeps its live events."""
        self.process.send_signal(signal.SIGINT)
        self.process.wait(timeout=30)
        self.reader.join()
        (self.evidence / "server-events.jsonl").write_text("".join(self.lines))


class Device:
    """One simulated device, its run, and what is known of it afterwards."""

    draws = True  # its screen, and the block map of what it receives

    def __init__(self, out, number):
        self.number = number
        suffix = "" if number == 0 else f"-{number + 1}"
        self.folder, self.evidence = out / f"device{suffix}", out / f"evidence{suffix}"
        self.screen = out / f"screen{suffix}"
        self.address = f"127.0.0.{1 if number == 0 else number + 2}"  # the server has 127.0.0.2
        self.events_file = self.evidence / "run-events.jsonl"
        self.process = self.server = None
        self.seen = 0  # bytes of the events file
        self.has_received = self.spoilt = False

    def make(self, scenario, options):
        settings = [*scenario.settings, f"network.address={self.address}",
                    f"device.name=handheld{self.number + 1}",
                    f"identity.serial=MR7{self.number:05}"]
        if scenario.multicast:
            settings += [f"network.datagram_loss_percent={options.loss}",
                         f"network.datagram_loss_seed={options.seed + self.number}"]
        must("orvenix device new", "device", "new", self.folder,
             *(word for setting in settings for word in ("--set", setting)))
        self.evidence.mkdir(exist_ok=True)

    def start(self, job):
        """The first device is watched, the others write into their evidence."""
        shown = None if self.number == 0 else (self.evidence / "run.txt").open("w")
        self.process = subprocess.Popen(
            [str(PROGRAM), "run", str(job), "--device", str(self.folder), "--screens",
             str(self.screen), "--timeout", str(RUN_LIMIT_S), "--events", str(self.events_file)],
            stdin=subprocess.DEVNULL, stdout=shown, stderr=shown)

    def watch(self):
        """Shows what happens, if the run does not do that itself."""

    def exit_code(self, scenario):
        """Which one the run must have, and of what."""
        return scenario.exit_code, "orvenix run"

    def finish(self):
        """To be called when the process has ended."""

    def arrived(self):
        """The files of the bundle that are on it."""
        folder = self.folder / "storage" / DESTINATION.lstrip("\\")
        return {path: sha256(path) for path in folder.rglob("*") if path.is_file()}

    def new_events(self):
        """What the run has written since the last call."""
        if not self.events_file.is_file():
            return []
        with self.events_file.open() as events:
            events.seek(self.seen)
            text = events.read()
        whole = text[:text.rfind("\n") + 1]
        self.seen += len(whole.encode())
        return [json.loads(line) for line in whole.splitlines()]

    def spoil_when_received(self):
        """Damages one file once the device has closed it: when it has asked for the next one."""
        wanted = DESTINATION + "\\" + SPOILT.replace("/", "\\")
        for event in self.new_events():
            if event["event"] != "multicast" or self.spoilt:
                continue
            received = event["step"] == "received" and event["file"] == wanted
            self.has_received = self.has_received or received
            if self.has_received and event["step"] == "requested" and event["file"] != wanted:
                damage(on_device(self.folder, SPOILT))
                self.spoilt = True


def free_udp_port():
    with socket.socket(type=socket.SOCK_DGRAM) as probe:
        probe.bind((SERVER, 0))
        return probe.getsockname()[1]


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


def row(what, good, evidence):
    return {"what": what, "good": bool(good), "evidence": evidence}


def judge_files(files, device, events, scenario, report, log):
    """Every file of the bundle: whether it is right, why HTTP fetched it, and that it did."""
    fetched = {fetch["path"].removeprefix(NAME + "/") for entry in report.get("devices", [])
               if entry["address"] == device.address
               for fetch in entry["files"] if fetch["completed"] > 0}
    received = {event["file"] for event in events
                if event["event"] == "multicast" and event["step"] == "received"}
    rows, sums = [], []
    for file in sorted(path for path in files.rglob("*") if path.is_file()):
        name = file.relative_to(files).as_posix()
        expected, found = sha256(file), sha256(on_device(device.folder, name))
        why, transferred = reason_of(name, log), name in fetched
        came = DESTINATION + "\\" + name.replace("/", "\\") in received
        if name == FOREIGN:
            good, what = found is None and not came and not transferred, "for others, not taken"
        else:
            wanted = "already right" if scenario.multicast else "missing"
            if scenario.multicast or name != SPOILT:
                wanted = WHY.get(name, wanted)
            good = expected == found and why == wanted and transferred == (wanted != "already right")
            good = good and came == (scenario.multicast and name not in (RIGHT, CORRUPT, EMPTY))
            ways = [way for way, took in (("multicast", came), ("HTTP", transferred)) if took]
            what = f"{why}, {' then '.join(ways) or 'not fetched'}"
        same = {expected: "equal", None: "not there"}.get(found, "DIFFERENT")
        rows.append(row(name, good, f"{file.stat().st_size:,} bytes, {what}, {same}"))
        sums.append(f"{expected}  {found}  {name}")
    (device.evidence / "sha256.txt").write_text("bundle  device  name\n" + "\n".join(sums) + "\n")
    return rows


def judge_multicast(devices, report, options):
    """What went to the group, what was lost, and that every device has proved its files."""
    files = report.get("multicast", {}).get("files", [])
    sent = sum(file["frames"] for file in files)
    repairs = sum(file["repair_frames"] for file in files)
    wire, size = (sum(file[key] for file in files if file["devices"])
                  for key in ("wire_bytes", "size"))
    joined, proven = (sum(file[key] for file in files) for key in ("joined", "proven"))
    lost = sum(event.get("datagrams_lost", 0) for device in devices
               for event in read_events(device.events_file) if event["event"] == "ended")
    wanted = len(devices) * (len(files) - 1)
    foreign = [file for file in files if file["path"].endswith(FOREIGN.replace("/", "\\"))]
    return [row("multicast", joined == proven == wanted,
                f"{len(files)} files announced, {proven} of {wanted} transfers proven"),
            row("frames", sent > 0 and (options.loss == 0 or (lost > 0 and repairs > 0)),
                f"{sent:,} sent, {lost:,} lost on the way, {repairs:,} repaired, "
                f"{wire / max(size, 1):.3f} bytes on the wire a byte"),
            row("announced for others", len(foreign) == 1 and not foreign[0]["devices"],
                f"{FOREIGN} for {FOREIGN_MASKS}, asked for by nobody")]


def judge_reception(device, events):
    """The block map and the roles that the run has shown, and the damage that validation found."""
    maps = [event["map"] for event in events if event["event"] == "blocks"]
    roles = {event["role"] for event in events if event["event"] in ("blocks", "multicast")
             and event.get("role")}
    log_file = device.folder / "storage/mcast.log"
    started = log_file.is_file() and "State machine thread created" in log_file.read_text()
    if log_file.is_file():
        shutil.copyfile(log_file, device.evidence / "mcast.log")
    shown = [row("block map", len(maps) > 0, f"{len(maps)} times drawn, {', '.join(sorted(roles))}")]
    return [*(shown if device.draws else []),
            row("spoilt", device.spoilt, f"{SPOILT} damaged after it had come"),
            row("client log", started, "mcast.log")]


def judge_refusal(before, device, report):
    """The device was not touched: no request came, and no file of the bundle arrived."""
    requests = sum(len(entry["files"]) for entry in report.get("devices", []))
    after = device.arrived()
    return [row("nothing asked for", requests == 0, f"{requests} requests, server-report.json"),
            row("nothing brought", before == after,
                f"{len(after)} files as before in {DESTINATION}")]


def judge_preparation(device, events, log, scenario):
    """Registry test, stopped program, deleted and saved files, each as the scenario has it."""
    processes = [event["names"] for event in events if event["event"] == "processes"]
    ran = [STOPPED in names for names in processes]
    old = {name: (device.folder / "storage" / OLD / name) for name in (*DELETED, SAVED)}
    gone = [name for name in DELETED if not old[name].exists()]
    kept = sha256(old[SAVED]) == hashlib.sha256(f"{SAVED} of an earlier release\n".encode()).hexdigest()
    tested = "PerformTests - 1" in log
    failed = any(line.endswith("PerformTests - failed test") for line in log)
    wants_tests = scenario.name != "nopower"
    return [row("registry test", tested == wants_tests and failed == (scenario.name == "failedtest"),
                ("failed" if failed else "passed") if tested else "not reached"),
            row("stop list", ran == [True, not scenario.cleaned],
                f"{STOPPED} {'was stopped' if ran[-1:] == [False] else 'still runs'}"),
            row("delete list", len(gone) == (len(DELETED) if scenario.cleaned else 0),
                f"{len(gone)} of {len(DELETED)} files deleted"),
            row("save list", kept, f"{SAVED} {'is kept' if kept else 'IS LOST'}")]


def judge_messages(device, events, scenario):
    """Statuses as the host got them, and events as they lie in the device's message queue."""
    statuses = [(event["state"], event["reason"]) for event in events
                if event["event"] == "document" and event["kind"] == "status"]
    queued = []
    for file in sorted((device.folder / "messages").glob("*.xml")):
        shutil.copyfile(file, device.evidence / file.name)
        fields = {field.get("Name"): field.text or "" for field in ElementTree.parse(file).iter("Field")}
        queued.append((int(fields.get("msgNum", 0)), fields.get("optArgArrayElement", "")))
    def shown(messages):
        return "; ".join(f"{number} {text}".strip() for number, text in messages) or "none"
    return [row("status", statuses == list(scenario.statuses), shown(statuses)),
            row("device events", queued == list(scenario.events), shown(queued))]


def judge_end(device, events, log, log_file, scenario):
    """Exit code, the configlet's result, and what the log tells by itself."""
    results = [event["result"] for event in events if event["event"] == "call"
               and event["function"] == "IcfgEndGroup" and event["name"] == "Upgrade"]
    explained = orvenix("explain", log_file, "--json", capture_output=True, text=True)
    story = json.loads(explained.stdout) if explained.returncode == 0 else {}
    (device.evidence / "explained.json").write_text(json.dumps(story, indent=2) + "\n")
    result = f"0x{results[-1]:08X}" if results else "none"
    told = story.get("outcome") == scenario.outcome and story.get("result", 0) == scenario.result
    code = device.process.returncode
    expected, program = device.exit_code(scenario)
    return [row("exit code", code == expected, f"`{program}` exit code {code}"),
            row("result", results == [scenario.result], result),
            row("log explained", told, f"{story.get('outcome')}: {story.get('text')}"),
            row("transfer log", scenario.result != 0 or
                any("UpgradeThread - Exiting" in line for line in log), f"{len(log)} lines, FileXfer.log")]


def judge_upgrade(device, report):
    done = [entry["report"] for entry in report.get("devices", [])
            if entry["address"] == device.address and entry.get("report")]
    pictures = sorted(device.screen.glob("*.png"))
    window = [row("progress window", len(pictures) >= 2,
                  f"{len(pictures)} pictures in {device.screen.name}/")]
    return [row("completion report", len(done) == 1 and done[0]["error"] == "",
                f"{done[0]['bundle_rx']:,} bytes by HTTP" if done else "none received"),
            *(window if device.draws else [])]


def judge_device(device, files, before, scenario, report):
    """All that one device has to show."""
    events = read_events(device.events_file)
    log_file = device.folder / "storage/FileXfer.log"
    log = log_file.read_text(errors="replace").splitlines() if log_file.is_file() else []
    if log:
        shutil.copyfile(log_file, device.evidence / "FileXfer.log")
    rows = judge_end(device, events, log, log_file, scenario)
    rows += judge_preparation(device, events, log, scenario)
    rows += judge_messages(device, events, scenario)
    if scenario.result == 0:
        rows += judge_reception(device, events) if scenario.multicast else []
        rows += judge_files(files, device, events, scenario, report, log)
        rows += judge_upgrade(device, report)
    else:
        rows += judge_refusal(before, device, report)
    if device.number > 0:
        for entry in rows:
            entry["what"] = f"{device.number + 1}: {entry['what']}"
    return rows


def read_events(file):
    return [json.loads(line) for line in file.read_text().splitlines()] if file.is_file() else []


def show(rows, out):
    good = all(entry["good"] for entry in rows)
    (out / "verdict.json").write_text(json.dumps({"good": good, "rows": rows}, indent=2) + "\n")
    print("\nverdict")
    for entry in rows:
        print(f"  {'ok ' if entry['good'] else 'BAD'}  {entry['what']:32} {entry['evidence']}")
    print(f"{'all of it holds' if good else 'NOT ALL OF IT HOLDS'}; see {out.relative_to(ROOT)}")
    return 0 if good else 1


def run_devices(devices, job, scenario):
    """Runs all of them at once, and damages the file on each as soon as it may be."""
    deadline = time.monotonic() + RUN_LIMIT_S + 60  # they end by themselves before, if they can
    try:
        for device in devices:
            device.start(job)
        while any(device.process.poll() is None for device in devices) and time.monotonic() < deadline:
            for device in devices:
                device.watch()
                if scenario.multicast and not device.spoilt:
                    device.spoil_when_received()
            time.sleep(0.05)
    finally:
        for device in devices:
            if device.process is not None and device.process.poll() is None:
                device.process.kill()
                device.process.wait()
    for device in devices:
        device.watch()


def read_options():
    parser = argparse.ArgumentParser(prog="./demo", description=__doc__.splitlines()[0])
    parser.add_argument("--scenario", choices=sorted(filter(None, (*SCENARIOS, FIRMWARE))), default="",
                        help="a job that the device must refuse; http: one without multicast; "
                             "firmware: images, loaders, a package, two passes")
    parser.add_argument("--target", choices=["linux", "ce"], default="linux",
                        help="ce: the device's own binary under qemu-arm, without a screen")
    parser.add_argument("--loss", type=float, default=2.0, metavar="P",
                        help="percent of the server's datagrams that a device does not hear (2)")
    parser.add_argument("--seed", type=int, default=1, metavar="N",
                        help="which datagrams these are (1); device k has the seed N + k - 1")
    parser.add_argument("--devices", type=int, default=1, metavar="N",
                        help="devices that are upgraded at once (1)")
    parser.add_argument("--encrypt", action="store_true", help="encipher what goes to the group")
    options = parser.parse_args()
    if not 0 <= options.loss <= 100 or not 1 <= options.devices <= 200 or options.seed < 0:
        parser.error("--loss goes from 0 to 100, --devices from 1 to 200, --seed from 0")
    if options.target == "ce" and (options.scenario == FIRMWARE or options.devices > 1):
        parser.error(f"--target ce has one device, and not the scenario {FIRMWARE}")
    return options


def make_bundle(files, bundle, port, scenario, options):
    multicast = ["--multicast", f"{GROUP}:{free_udp_port()}", "--device-text", DEVICE_TEXT]
    for name in (RIGHT, CORRUPT):
        multicast += ["--http-only", name]
    multicast += ["--encrypt"] if options.encrypt else []
    must("orvenix bundle make", "bundle", "make", files, bundle, "--address", SERVER, "--port", port,
         "--dest", DESTINATION, "--name", NAME, "--begin-text", BEGIN_TEXT, "--end-text", END_TEXT,
         "--masks-for", f"{FOREIGN}={FOREIGN_MASKS}", *(multicast if scenario.multicast else []))
    extend(bundle / "job.xml", scenario)
    must("orvenix job lint", "job", "lint", bundle)


def fresh(out):
    shutil.rmtree(out, ignore_errors=True)
    return out


def main():
    options = read_options()
    print("building ...", flush=True)
    kind, folder = Device, ""
    if options.target == "ce":
        import demo_ce
        demo_ce.build()
        kind, folder = demo_ce.Device, "-ce"
    else:
        build()
    if options.scenario == FIRMWARE:
        import demo_firmware
        return demo_firmware.main(fresh(ROOT / "out" / f"demo-{FIRMWARE}"))
    scenario = SCENARIOS[options.scenario]
    out = fresh(scenario.folder.with_name(scenario.folder.name + folder))
    files, bundle, evidence = out / "files", out / "bundle", out / "evidence"
    evidence.mkdir(parents=True)
    make_files(files)
    port = free_port()
    count = options.devices if scenario.result == 0 else 1
    if not kind.draws:
        print("the device's own binary runs under qemu; nothing draws its screen or its block map")
    print(f"making a bundle and {'a device' if count == 1 else f'{count} devices'} ...", flush=True)
    make_bundle(files, bundle, port, scenario, options)
    devices = [kind(out, number) for number in range(count)]
    for device in devices:
        device.make(scenario, options)
        prepare(device.folder, scenario)
        spoil(files, device.folder)
    before = devices[0].arrived()

    # A file that nobody wants is given up after the wait.
    multicast = ["--expect", str(count), "--wait", "8"] if scenario.multicast else []
    server = Server(bundle, port, evidence, multicast)
    try:
        for device in devices:
            device.server = server
        run_devices(devices, bundle / "job.xml", scenario)
    finally:
        server.stop()
    for device in devices:
        device.finish()
    report_file = evidence / "server-report.json"
    report = json.loads(report_file.read_text()) if report_file.is_file() else {}
    rows = []
    for device in devices:
        rows += judge_device(device, files, before, scenario, report)
    if scenario.result == 0 and scenario.multicast:
        rows += judge_multicast(devices, report, options)
    return show(rows, out)


if __name__ == "__main__":
    sys.exit(main())
