"""./demo --target ce: the device's own binary, carried out by qemu, takes the place of the simulated one.

The simulator is compiled for 32-bit ARM and brings the device; the library on it is
build/ce/orvenix.dll. A management client on the device, written in the device's API alone, walks the
job; what it was answered and handed, and what the server saw, take the place of what `orvenix run`
tells of the native demo. The device draws no screen there, so nobody sees its progress window or how
its block map fills.
"""

import json
import re
import shutil
import subprocess
import sys
import xml.etree.ElementTree as ElementTree

import run_demo as demo

BINARY = demo.ROOT / "build/ce/orvenix.dll"
CLIENT = demo.ROOT / "build/ce-loader/bin/target_host"
NEEDED = {"gcc-arm-none-eabi": "arm-none-eabi-g++", "g++-arm-linux-gnueabi": "arm-linux-gnueabi-g++",
          "qemu-user": "qemu-arm"}
RESULTS = {"ok": 0, "no-space": 0xC4111002, "no-power": 0xC4111003, "test-failed": 0xC4111005}
SHOWN = re.compile(r"UpgradeThread - |http fetching|mc\.Start|SendUpgradeComplete$|Local Upgrade")
MISSING_PACKAGES = 3  # exit code


def build():
    missing = [package for package, program in NEEDED.items() if not shutil.which(program)]
    if missing:
        print(f"demo: --target ce needs the packages {', '.join(missing)}", file=sys.stderr)
        sys.exit(MISSING_PACKAGES)
    demo.build()
    demo.build_with("ce")
    demo.build_with("ce-loader", "target_host")


def walk_of(job, scenario):
    """The lines that the client on the device follows."""
    lines = [f'is-process "{demo.STOPPED}"', "initialize", "callbacks on"]

    def add(element):
        for child in element:
            if child.tag == "Field":
                lines.append(f'set "{child.get("Name")}" "{child.text or ""}"')
            elif child.tag == "Group":
                lines.append(f'begin "{child.get("Name")}"')
                add(child)
                lines.append(f'end "{child.get("Name")}"')
            else:
                add(child)

    add(ElementTree.parse(job).getroot())
    lines += ["await-end"] if scenario.result == 0 else []
    return "\n".join([*lines, f'is-process "{demo.STOPPED}"', "uninitialize"]) + "\n"


class Device(demo.Device):
    """A device whose binary runs under qemu."""

    draws = False

    def make(self, scenario, options):
        super().make(scenario, options)
        self.scenario = scenario
        shutil.copyfile(BINARY, self.folder / "storage/orvenix.dll")
        self.shown = 0

    def start(self, job):
        (self.folder / "storage/host.walk").write_text(walk_of(job, self.scenario))
        with (self.evidence / "run.txt").open("w") as said:
            self.process = subprocess.Popen(["qemu-arm", str(CLIENT), str(self.folder)],
                                            stdin=subprocess.DEVNULL, stdout=said, stderr=said)

    def exit_code(self, scenario):
        return 0, "target_host"

    def watch(self):
        """Shows the main lines of the device's log as they come."""
        log = self.folder / "storage/FileXfer.log"
        lines = log.read_text(errors="replace").splitlines() if log.is_file() else []
        for line in lines[self.shown:]:
            if SHOWN.search(line):
                print(f"  {line}", flush=True)
        self.shown = len(lines)

    def spoil_when_received(self):
        """Damages one file when the device has joined the next one's announcement."""
        wanted = demo.DESTINATION + "\\" + demo.SPOILT.replace("/", "\\")
        events = self.server.multicast_events()
        ended = [number for number, event in enumerate(events)
                 if event["what"] == "file-ended" and event["file"] == wanted]
        if ended and any(event["what"] == "joined" for event in events[ended[0]:]):
            demo.damage(demo.on_device(self.folder, demo.SPOILT))
            self.spoilt = True

    def finish(self):
        """Tells what happened in the words of `orvenix run`."""
        storage = self.folder / "storage"
        trace = lines_of(storage / "host.trace")
        (self.evidence / "host.trace").write_text("\n".join(trace) + "\n")
        events = [{"event": "processes", "names": [demo.STOPPED] if line.endswith('"yes"') else []}
                  for line in trace if line.startswith("is-process ")]
        for line in trace:
            ended = re.fullmatch(r'end "Upgrade" = "(.*)"', line)
            if ended:
                events.append({"event": "call", "function": "IcfgEndGroup", "name": "Upgrade",
                               "result": RESULTS.get(ended[1], -1)})
        events += [status_of(text) for text in lines_of(storage / "documents.trace")]
        events += [{"event": "multicast", "step": "received", "file": event["file"]}
                   for event in self.server.multicast_events() if event["what"] == "proven"]
        lost = re.search(r"datagrams lost: (\d+)", (self.evidence / "run.txt").read_text())
        events.append({"event": "ended", "datagrams_lost": int(lost[1]) if lost else 0})
        self.events_file.write_text("".join(json.dumps(event) + "\n" for event in events))


def lines_of(file):
    return file.read_text().splitlines() if file.is_file() else []


def status_of(text):
    fields = {field.get("Name"): field.text or "" for field in ElementTree.fromstring(text).iter("Field")}
    return {"event": "document", "kind": "status", "state": int(fields["State"]),
            "reason": fields["Reason"]}
