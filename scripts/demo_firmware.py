"""The scenario "firmware" of ./demo: new firmware on two roads, each proved from what is left behind.

The first device gets its operating-system image by multicast into its flash store, damaged on the
way, and HTTP repairs it; of three loader images two are deleted, the image is flashed, and a package
is installed. The second device has no management host: a program loads a configuration file of two
passes, and the flash restarts the device between them.
"""

import json
import pathlib
import random
import shutil
import subprocess

import run_demo as demo

IMAGE, RADIO = "os.nb0", "radio.nb0"
LOADERS = {generation: f"TQ52.IPL.{generation}.nb0" for generation in ("G3", "G4", "H3")}
CHIP, GENERATION = 13, "G4"  # of both devices
CABINET, PROVIDER, APPLICATION = "scan.cab", "Tarnwell", "Scan"
INSTALLER = "\\Windows\\wceload.exe"
REGISTRY = f"SOFTWARE\\{APPLICATION}"
APPS_KEY = f"SOFTWARE\\Apps\\{PROVIDER} {APPLICATION}"
PARTS = ("apps001.zip", "apps002.zip")
HURRY = "4"  # nobody reads the device's screen here


def noise(seed, size):
    return random.Random(seed).randbytes(size)


def make_package(out):
    application = out / "application"
    (application / "bin").mkdir(parents=True)
    (application / "bin/scan.exe").write_bytes(noise(1, 200 * 1024))
    (application / "scan.ini").write_text("[scan]\nbeep=1\n")
    values = out / "scan.reg"
    values.write_text("Windows Registry Editor Version 5.00\n\n"
                      f"[HKEY_LOCAL_MACHINE\\{REGISTRY}]\n\"Version\"=dword:00000007\n")
    demo.must("orvenix bundle cab", "bundle", "cab", application, out / "firmware" / CABINET,
              "--application", APPLICATION, "--provider", PROVIDER, "--registry", values)
    shutil.copyfile(out / "firmware" / CABINET, out / "files" / CABINET)


def make_inputs(out):
    """Images, loaders and numbered parts."""
    firmware, files = out / "firmware", out / "files"
    for folder in (firmware, files):
        folder.mkdir(parents=True)
    (firmware / IMAGE).write_bytes(noise(52, 5 * 1024 * 1024))
    (firmware / RADIO).write_bytes(noise(53, 300 * 1024))
    for number, name in enumerate(LOADERS.values()):
        (firmware / name).write_bytes(noise(number, 64 * 1024))
    for number, name in enumerate(PARTS):
        (firmware / name).write_bytes(noise(90 + number, 700 * 1024))
    for name in (IMAGE, RADIO, *LOADERS.values()):
        shutil.copyfile(firmware / name, files / name)


def make_device(folder, *settings):
    demo.must("orvenix device new", "device", "new", folder, "--set", f"disk.generation={CHIP}",
              "--set", "disk.capacity=67108864",
              *(word for setting in settings for word in ("--set", setting)))


def on_device(device, path):
    return device / "storage" / path.lstrip("\\").replace("\\", "/")


def run(device, evidence, *arguments):
    events = evidence / "run-events.jsonl"
    with (evidence / "run.txt").open("w") as shown:
        result = demo.orvenix("run", *arguments, "--device", device, "--hurry", HURRY, "--timeout",
                              demo.RUN_LIMIT_S, "--events", events, stdin=subprocess.DEVNULL,
                              stdout=shown, stderr=shown)
    return result.returncode, demo.read_events(events)


def log_of(device, evidence):
    file = device / "storage/FileXfer.log"
    if not file.is_file():
        return []
    shutil.copyfile(file, evidence / file.name)
    return file.read_text(errors="replace").splitlines()


def statuses(events):
    return [event["text"] for event in events if event["event"] == "status"]


def judge_flash(device, evidence, wanted, firmware):
    """The flash folder holds the images that were meant for it and no other, byte for byte."""
    flashed = {path.name: demo.sha256(path) for path in (device / "flash").glob("*")}
    right = {name: demo.sha256(firmware / name) for name in wanted}
    record = device / "flash.record"
    lines = record.read_text().splitlines() if record.is_file() else []
    if record.is_file():
        shutil.copyfile(record, evidence / record.name)
    (evidence / "flash.json").write_text(json.dumps(flashed, indent=2) + "\n")
    names = [json.loads(line)["name"] for line in lines]
    return [demo.row("flash folder", flashed == right, ", ".join(sorted(flashed)) or "empty"),
            demo.row("flash record", sorted(names) == sorted(wanted),
                     f"{len(lines)} lines, each image once" if len(set(names)) == len(names)
                     else f"{len(lines)} lines, an image more than once")]


def judge_loaders(device, events, firmware):
    """Only the image of the device's own chip is left, and the screen has named the others."""
    left = [name for name in LOADERS.values() if on_device(device, "\\" + name).is_file()]
    own = LOADERS[GENERATION]
    deleted = sorted({text for text in statuses(events) if text.startswith("Deleting !")})
    same = demo.sha256(on_device(device, "\\" + own)) == demo.sha256(firmware / own)
    others = [f"Deleting !{name}!" for name in LOADERS.values() if name != own]
    return [demo.row("loader images", left == [own] and same, f"{', '.join(left)} is left"),
            demo.row("loaders deleted", sorted(deleted) == sorted(others) and
                     f"DOC is !{GENERATION}!" in statuses(events), "; ".join(deleted))]


def judge_package(device, events, out):
    """What the installer was started with, and what it has left in storage and registry."""
    started = [launch for event in events if event["event"] == "ended"
               for launch in event["launched"]]
    lines = [launch["command_line"] for launch in started]
    installed = on_device(device, f"\\Program Files\\{APPLICATION}\\bin\\scan.exe")
    registry = (device / "registry.reg").read_text().lower()  # keys keep their first spelling
    known = f"[HKEY_LOCAL_MACHINE\\{APPS_KEY}]".lower() in registry
    value = f"[HKEY_LOCAL_MACHINE\\{REGISTRY}]\n\"Version\"=dword:00000007".lower() in registry
    right = demo.sha256(installed) == demo.sha256(out / "application/bin/scan.exe")
    return [demo.row("installer", len(started) == 1 and CABINET in lines[0], "; ".join(lines)),
            demo.row("installed files", right, str(installed.relative_to(device))),
            demo.row("registry", known and value, f"{APPS_KEY}; {REGISTRY}")]


def upgrade_by_host(out, firmware):
    """The first device: multicast, repair by HTTP, loaders, flash, package."""
    device, evidence, bundle = out / "device", out / "evidence", out / "bundle"
    evidence.mkdir()
    port = demo.free_port()
    demo.must("orvenix bundle make", "bundle", "make", out / "files", bundle, "--address",
              demo.SERVER, "--port", port, "--name", "demo", "--dest", "\\", "--dest-for",
              f"{IMAGE}=RAM:", "--dest-for", f"{RADIO}=RAM:", "--dest-for", f"{CABINET}=\\Temp",
              "--program", INSTALLER, "--parameters", f"/noui \\Temp\\{CABINET}", "--multicast",
              f"{demo.GROUP}:{demo.free_udp_port()}", "--device-text", demo.DEVICE_TEXT)
    demo.must("orvenix job lint", "job", "lint", bundle)
    make_device(device, "network.datagram_loss_percent=2", "flash.start=writes")
    # What the group gets is damaged; what HTTP serves is not: the server has opened the file.
    served = bundle / "tree/demo" / IMAGE
    demo.damage(served)
    server = demo.Server(bundle, port, evidence, ["--expect", "1", "--wait", "30", "--force"])
    server.await_line('"what":"ready"')
    good = served.with_name("good")
    shutil.copyfile(firmware / IMAGE, good)
    good.rename(served)
    try:
        code, events = run(device, evidence, bundle / "job.xml")
    finally:
        server.stop()
    report = json.loads((evidence / "server-report.json").read_text())
    log = log_of(device, evidence)
    fetched = sorted(fetch["path"] for entry in report["devices"] for fetch in entry["files"]
                     if fetch["completed"] > 0)
    received = [event["file"] for event in events
                if event["event"] == "multicast" and event["step"] == "received"]
    mismatch = [line for line in log if f"crc mismatch, RAM:{IMAGE}," in line]
    rows = [demo.row("exit code", code == 0, f"`orvenix run` exit code {code}"),
            demo.row("by multicast", {f"RAM:{IMAGE}", f"RAM:{RADIO}"} <= set(received),
                     f"{len(received)} files, {', '.join(sorted(received)[:2])}, ..."),
            demo.row("repaired by HTTP", fetched == [f"demo/{IMAGE}"] and len(mismatch) == 1,
                     f"{', '.join(fetched) or 'nothing'}: damaged on its way")]
    rows += judge_flash(device, evidence, (IMAGE, RADIO), firmware)
    rows += judge_loaders(device, events, firmware)
    rows += judge_package(device, events, out)
    return rows


def upgrade_by_client(out, firmware):
    """The second device: a configuration file of two passes, and a restart between them."""
    device, evidence, bundle = out / "device-2", out / "evidence-2", out / "bundle-2"
    evidence.mkdir()
    empty = out / "no-files"
    empty.mkdir()
    port = demo.free_port()
    packages = [f"{firmware / IMAGE};hardware=TQ52*;pass=1"]
    packages += [f"{firmware / name};to=\\;hardware=TQ52*;pass=1" for name in LOADERS.values()]
    packages += [f"{firmware / PARTS[0]};to=\\Application;pass=2",
                 f"{firmware / CABINET};to=\\Temp;pass=2;cmd=\\Temp\\{CABINET}",
                 f"{firmware / IMAGE};hardware=MV41*;pass=1"]
    demo.must("orvenix bundle make", "bundle", "make", empty, bundle, "--address", demo.SERVER,
              "--port", port, "--name", "demo",
              "--program", INSTALLER, "--parameters", "/noui",
              *(word for package in packages for word in ("--firmware", package)))
    demo.must("orvenix job lint", "job", "lint", bundle)
    make_device(device, "flash.start=restarts")
    server = demo.Server(bundle, port, evidence, [])
    try:
        code, events = run(device, evidence, bundle / "upgrade.xml", "--mode", "client")
    finally:
        server.stop()
    log = log_of(device, evidence)
    passes = [event.get("pass") for event in events if event["event"] == "started"]
    causes = [event["cause"] for event in events if event["event"] == "restart"]
    ended = [event for event in events if event["event"] == "ended"]
    right = [file["path"] for event in ended for file in event["files"] if file["state"] == "right"]
    noted = on_device(device, "\\kvoupgclnt.txt")
    starts = sum(line.endswith("Orvenix thread - Started") for line in log)
    rows = [demo.row("exit code", code == 0, f"`orvenix run --mode client` exit code {code}"),
            demo.row("passes", passes == [1, 2] and noted.read_text() == "2" and starts == 2,
                     f"{passes}, the device notes {noted.read_text()}"),
            demo.row("restart", causes == ["flash"] and ended[0]["restarted"],
                     f"after pass 1, by the {', '.join(causes) or 'nobody'}"),
            demo.row("parts", all("\\Application\\" + name in right for name in PARTS),
                     f"{len(right)} files right")]
    rows += judge_flash(device, evidence, (IMAGE,), firmware)
    rows += judge_loaders(device, events, firmware)
    rows += judge_package(device, [event for event in events if event is not ended[0]], out)
    for entry in rows:
        entry["what"] = f"client: {entry['what']}"
    return rows


def main(out: pathlib.Path):
    out.mkdir(parents=True)
    print("making firmware, a package and bundles ...", flush=True)
    make_inputs(out)
    make_package(out)
    firmware = out / "firmware"
    print("upgrading a device by multicast ...", flush=True)
    rows = upgrade_by_host(out, firmware)
    print("upgrading a device without a host, in two passes ...", flush=True)
    rows += upgrade_by_client(out, firmware)
    return demo.show(rows, out)
