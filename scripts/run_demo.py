"""Upgrades a simulated device by HTTP from a real server and proves the outcome.

Everything it makes lies in out/demo: files, bundle, device, screen pictures, and in evidence/ what
the verdict was drawn from. Exit code 0 only if every line of the verdict holds.

A scenario prepares the device or the job so that the device refuses it, and proves that it ends as
it must: result, messages, and what was touched before. Its files lie in out/demo-SCENARIO.
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
import xml.etree.ElementTree as ElementTree

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = ROOT / "build/release"
PROGRAM = BUILD / "bin/orvenix"
NAME, SERVER, DESTINATION = "demo", "127.0.0.2", "\\Application"
RIGHT, CORRUPT = "library/libcesim.so", "docs/architecture.md"
RUN_LIMIT_S = 300

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

    @property
    def folder(self):
        return ROOT / "out" / ("demo" if not self.name else f"demo-{self.name}")


SCENARIOS = {scenario.name: scenario for scenario in (
    Scenario(),
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

    def __init__(self, bundle, port, evidence):
        self.evidence = evidence
        self.process = subprocess.Popen(
            [str(PROGRAM), "serve", str(bundle), "--json", "--address", SERVER, "--port", str(port),
             "--report", str(evidence / "server-report.json")],
            stdout=subprocess.PIPE, text=True)
        if not self.process.stdout.readline():  # its first line says that it listens
            sys.exit("demo: the server did not start")

    def stop(self):
        """Ends the server and gives its live events back."""
        self.process.send_signal(signal.SIGINT)
        events = self.process.communicate(timeout=30)[0].splitlines()
        (self.evidence / "server-events.jsonl").write_text("\n".join(events) + "\n")
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


def row(what, good, evidence):
    return {"what": what, "good": bool(good), "evidence": evidence}


def judge_files(files, device, report, log, evidence):
    """Every file of the bundle: whether it is right, why it was fetched, and that it was."""
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
        rows.append(row(name, expected == found and why == wanted and transferred == (name != RIGHT),
                        f"{file.stat().st_size:,} bytes, {why}, "
                        f"{'fetched' if transferred else 'not fetched'}, "
                        f"{'equal' if expected == found else 'DIFFERENT'}"))
        sums.append(f"{expected}  {found}  {name}")
    (evidence / "sha256.txt").write_text("bundle  device  name\n" + "\n".join(sums) + "\n")
    return rows


def judge_refusal(before, device, report):
    """The device was not touched: no request came, and no file of the bundle arrived."""
    requests = sum(len(entry["files"]) for entry in report.get("devices", []))
    arrived = device / "storage" / DESTINATION.lstrip("\\")
    after = {path: sha256(path) for path in arrived.rglob("*") if path.is_file()}
    return [row("nothing asked for", requests == 0, f"{requests} requests, server-report.json"),
            row("nothing brought", before == after,
                f"{len(after)} files as before in {DESTINATION}")]


def judge_preparation(device, events, log, scenario):
    """Registry test, stopped program, deleted and saved files, each as the scenario has it."""
    processes = [event["names"] for event in events if event["event"] == "processes"]
    ran = [STOPPED in names for names in processes]
    old = {name: (device / "storage" / OLD / name) for name in (*DELETED, SAVED)}
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


def judge_messages(device, events, scenario, evidence):
    """Statuses as the host got them, and events as they lie in the device's message queue."""
    statuses = [(event["state"], event["reason"]) for event in events
                if event["event"] == "document" and event["kind"] == "status"]
    queued = []
    for file in sorted((device / "messages").glob("*.xml")):
        shutil.copyfile(file, evidence / file.name)
        fields = {field.get("Name"): field.text or "" for field in ElementTree.parse(file).iter("Field")}
        queued.append((int(fields.get("msgNum", 0)), fields.get("optArgArrayElement", "")))
    def shown(messages):
        return "; ".join(f"{number} {text}".strip() for number, text in messages) or "none"
    return [row("status", statuses == list(scenario.statuses), shown(statuses)),
            row("device events", queued == list(scenario.events), shown(queued))]


def judge_end(run_code, events, log, log_file, scenario, evidence):
    """Exit code, the configlet's result, and what the log tells by itself."""
    results = [event["result"] for event in events if event["event"] == "call"
               and event["function"] == "IcfgEndGroup" and event["name"] == "Upgrade"]
    explained = orvenix("explain", log_file, "--json", capture_output=True, text=True)
    story = json.loads(explained.stdout) if explained.returncode == 0 else {}
    (evidence / "explained.json").write_text(json.dumps(story, indent=2) + "\n")
    result = f"0x{results[-1]:08X}" if results else "none"
    told = story.get("outcome") == scenario.outcome and story.get("result", 0) == scenario.result
    return [row("exit code", run_code == scenario.exit_code, f"`orvenix run` exit code {run_code}"),
            row("result", results == [scenario.result], result),
            row("log explained", told, f"{story.get('outcome')}: {story.get('text')}"),
            row("transfer log", scenario.result != 0 or
                any("UpgradeThread - Exiting" in line for line in log), f"{len(log)} lines, FileXfer.log")]


def judge_upgrade(report, pictures):
    done = [entry["report"] for entry in report.get("devices", []) if entry.get("report")]
    return [row("completion report", len(done) == 1 and done[0]["error"] == "",
                f"{done[0]['bundle_rx']:,} bytes by HTTP" if done else "none received"),
            row("progress window", len(pictures) >= 2, f"{len(pictures)} pictures in screen/")]


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


def main():
    parser = argparse.ArgumentParser(prog="./demo", description=__doc__.splitlines()[0])
    parser.add_argument("--scenario", choices=sorted(filter(None, SCENARIOS)), default="",
                        help="a job that the device must refuse")
    scenario = SCENARIOS[parser.parse_args().scenario]
    print("building ...", flush=True)
    build()
    out = scenario.folder
    shutil.rmtree(out, ignore_errors=True)
    files, bundle, device, evidence = out / "files", out / "bundle", out / "device", out / "evidence"
    evidence.mkdir(parents=True)
    make_files(files)
    port = free_port()
    print("making a bundle and a device ...", flush=True)
    must("orvenix bundle make", "bundle", "make", files, bundle, "--address", SERVER, "--port", port,
         "--dest", DESTINATION, "--name", NAME, "--begin-text", BEGIN_TEXT, "--end-text", END_TEXT)
    extend(bundle / "job.xml", scenario)
    must("orvenix job lint", "job", "lint", bundle)
    must("orvenix device new", "device", "new", device,
         *(word for setting in scenario.settings for word in ("--set", setting)))
    prepare(device, scenario)
    spoil(files, device)
    before = {path: sha256(path) for path in (device / "storage" / DESTINATION.lstrip("\\")).rglob("*")
              if path.is_file()}

    server = Server(bundle, port, evidence)
    try:
        run = orvenix("run", bundle / "job.xml", "--device", device, "--screens", out / "screen",
                      "--timeout", RUN_LIMIT_S, "--events", evidence / "run-events.jsonl")
    finally:
        server.stop()
    report_file = evidence / "server-report.json"
    report = json.loads(report_file.read_text()) if report_file.is_file() else {}
    events = read_events(evidence / "run-events.jsonl")
    log_file = device / "storage/FileXfer.log"
    log = log_file.read_text(errors="replace").splitlines() if log_file.is_file() else []
    if log:
        shutil.copyfile(log_file, evidence / "FileXfer.log")
    rows = judge_end(run.returncode, events, log, log_file, scenario, evidence)
    rows += judge_preparation(device, events, log, scenario)
    rows += judge_messages(device, events, scenario, evidence)
    if scenario.result == 0:
        rows += judge_files(files, device, report, log, evidence)
        rows += judge_upgrade(report, sorted((out / "screen").glob("*.png")))
    else:
        rows += judge_refusal(before, device, report)
    return show(rows, out)


if __name__ == "__main__":
    sys.exit(main())
