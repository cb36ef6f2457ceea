"""Runs every check and test of the project and closes with one line of counts.

A step is a check of its own (passed or failed) or a set of tests whose results are counted one by
one. Long output goes to build/logs/<step>.log and is shown only when the step fails.
"""

import argparse
import concurrent.futures
import os
import pathlib
import re
import shutil
import subprocess
import sys
import time
import xml.etree.ElementTree as ElementTree

ROOT = pathlib.Path(__file__).resolve().parent.parent
LOGS = ROOT / "build" / "logs"
JOBS = str(os.cpu_count() or 2)


class Counts:
    def __init__(self):
        self.passed = self.failed = self.skipped = 0

    def line(self):
        return f"{self.passed} passed, {self.failed} failed, {self.skipped} skipped"


def run(step, command):
    """Runs a command with its output in the step's log. Returns True when it exits with 0."""
    LOGS.mkdir(parents=True, exist_ok=True)
    with open(LOGS / f"{step}.log", "ab") as log:
        log.write(("$ " + " ".join(command) + "\n").encode())
        log.flush()
        return subprocess.run(command, cwd=ROOT, stdout=log, stderr=subprocess.STDOUT,
                              stdin=subprocess.DEVNULL, check=False).returncode == 0


def show_log(step, lines=40):
    text = (LOGS / f"{step}.log").read_text(errors="replace").splitlines()
    print("\n".join("    " + line for line in text[-lines:]))


def check(*commands):
    """A step that passes when all its commands do."""

    def action(step, counts):
        if all(run(step, command) for command in commands):
            counts.passed += 1
            return True
        counts.failed += 1
        show_log(step)
        return False

    return action


def unless_missing(packages, action):
    """A step that is skipped where the programs or folders of some packages are not there.

    packages: what each brings, as {package: program on the path or absolute path}
    """

    def guarded(step, counts):
        missing = [package for package, what in packages.items()
                   if not (pathlib.Path(what).exists() if what.startswith("/") else shutil.which(what))]
        if not missing:
            return action(step, counts)
        counts.skipped += 1
        print(f"    skipped: {step}: not installed: {', '.join(missing)}")
        return True

    return guarded


def unless_unbuilt(result, action):
    """A step that is skipped where the build before it has not left its result."""

    def guarded(step, counts):
        if (ROOT / result).exists():
            return action(step, counts)
        counts.skipped += 1
        print(f"    skipped: {step}: there is no {result}")
        return True

    return guarded


def build(preset, *targets):
    command = ["cmake", "--build", "--preset", preset, "-j", JOBS]
    return check(["cmake", "--preset", preset], command + (["--target", *targets] if targets else []))


def ctest(preset, *arguments):
    """A step that counts each test of a build tree: those of a test program one by one."""

    def action(step, counts):
        report = LOGS / f"{step}.xml"
        results = ROOT / "build" / preset / "results"
        report.unlink(missing_ok=True)
        shutil.rmtree(results, ignore_errors=True)
        results.mkdir(parents=True)
        # One more than there are processors: some tests only wait, on the host's clock.
        run(step, ["ctest", "--preset", preset, "-j", str(int(JOBS) + 1), "--output-junit", str(report),
                   "--no-tests=error", *arguments])
        if not report.exists():
            counts.failed += 1
            show_log(step)
            return False
        found = [result for case in ElementTree.parse(report).getroot().iter("testcase")
                 for result in results_of(case, results)]
        for name, state, text in found:
            setattr(counts, state, getattr(counts, state) + 1)
            if state == "skipped":
                print(f"    skipped: {name}: {skip_reason(text)}")
            elif state == "failed":
                print(f"    FAILED: {name}")
        good = bool(found) and all(state != "failed" for _, state, _ in found)
        if not found:
            counts.failed += 1
            print("    FAILED: there was no test to run")
        if not good:
            show_log(step, 80)
        return good

    return action


def results_of(case, results):
    """What a test of ctest's came to: (name, state, output) of each test that its program ran."""
    name = case.get("name")
    passed = case.get("status") == "run"
    own = results / (re.sub("[^A-Za-z0-9_]", "_", name) + ".xml")
    if not own.exists():
        skip = case.find("skipped")
        # One that could not be started has failed; one that ended with its code for it is skipped.
        skipped = case.get("status") == "disabled" or (
            skip is not None and "SKIP_RETURN_CODE" in (skip.get("message") or ""))
        return [(name, "passed" if passed else "skipped" if skipped else "failed",
                 case.findtext("system-out") or "")]
    found = []
    for test in ElementTree.parse(own).getroot().iter("testcase"):
        states = [(part.tag, part.get("message")) for part in test]
        state, text = states[0] if states else ("passed", "")
        found.append((f"{name}: {test.get('classname')}.{test.get('name')}",
                      {"failure": "failed"}.get(state, state), text))
    if not found or not passed and all(state != "failed" for _, state, _ in found):
        found.append((f"{name}: the program itself", "failed", ""))
    return found


def skip_reason(output):
    reasons = [line.strip() for line in output.strip().splitlines()
               if line.strip() and not re.search(r"^\[|^Note:|Skipped$", line.strip())]
    return reasons[-1] if reasons else "no reason given"


def fuzz(step, counts):
    """Each fuzz target for a few seconds, from its seeds."""
    if not build("fuzz", "fuzzers")(step, counts):
        return False
    counts.passed -= 1  # the build is part of the step, not a result of its own
    targets = sorted((ROOT / "build/fuzz/bin").glob("fuzz_*"))
    with concurrent.futures.ThreadPoolExecutor(int(JOBS)) as pool:
        results = list(pool.map(fuzz_target, targets))
    for target, good in zip(targets, results):
        if not good:
            print(f"    FAILED: {target.name}")
            show_log(target.name)
    counts.passed += results.count(True)
    counts.failed += results.count(False)
    return all(results)


def fuzz_target(target):
    name = target.name[len("fuzz_"):]
    work = ROOT / "build/fuzz/corpus" / name
    work.mkdir(parents=True, exist_ok=True)
    (LOGS / f"{target.name}.log").unlink(missing_ok=True)
    return run(target.name, [
        str(target), f"-max_total_time={FUZZ_SECONDS}", "-timeout=10", "-rss_limit_mb=2048",
        f"-artifact_prefix={work}/crash-", str(work), str(ROOT / "fuzz/corpus" / name)])


FUZZ_SECONDS = 5

# Without these nothing can be made for desktop Windows, or not be carried out.
MINGW = {"g++-mingw-w64-x86-64": "x86_64-w64-mingw32-g++",
         "googletest": "/usr/src/googletest/googletest/src/gtest-all.cc"}
MINGW32 = {"g++-mingw-w64-i686": "i686-w64-mingw32-g++"}
WINE = {"wine64": "/usr/lib/wine/wine64", "xvfb": "Xvfb"}

# Without these nothing can be made for 32-bit ARM, or not be carried out.
ARM_LINUX = {"g++-arm-linux-gnueabi": "arm-linux-gnueabi-g++", "qemu-user": "qemu-arm",
             "googletest": "/usr/src/googletest/googletest/src/gtest-all.cc"}

ARM_NONE = {"gcc-arm-none-eabi": "arm-none-eabi-g++",
            "libstdc++-arm-none-eabi-newlib": "/usr/include/newlib/c++"}

# What looks at the device's library.
CE_LINT = {"gcc-arm-none-eabi": "arm-none-eabi-g++", "binutils-arm-none-eabi": "arm-none-eabi-objdump",
           "llvm-14": "llvm-readobj-14"}

STEPS = [
    ("layers", "who may include whom", check([sys.executable, "scripts/check_layers.py"])),
    ("words", "words and paths that must not be in the project",
     check([sys.executable, "scripts/check_words.py"])),
    ("oddities", "docs/oddities.md says what the sources say",
     check([sys.executable, "scripts/collect_oddities.py", "--check"])),
    ("differences", "docs/platform.md says how desktop Windows differs",
     check([sys.executable, "scripts/collect_differences.py", "--check"])),
    ("format", "clang-format", check([sys.executable, "scripts/check_format.py"])),
    ("dev-build", "debug build with address and undefined-behaviour sanitizers", build("dev")),
    ("dev", "all tests", ctest("dev", "-LE", "targets")),
    ("tsan-build", "build with the thread sanitizer", build("tsan", "threaded_tests")),
    ("tsan", "the threaded tests", ctest("tsan", "-L", "threads")),
    ("release-build", "the optimised library", build("release", "orvenix")),
    ("exports", "what the library exports and needs",
     check([sys.executable, "scripts/check_exports.py", "build/release/lib/liborvenix.so"],
           [sys.executable, "scripts/check_surface.py", "build/release/lib/liborvenix.so"])),
    ("windows", "the library for desktop Windows", unless_missing(MINGW, check(
        ["cmake", "--preset", "windows"], ["cmake", "--build", "--preset", "windows", "-j", JOBS],
        [sys.executable, "scripts/check_exports.py", "build/windows/bin/orvenix.dll"]))),
    ("windows32", "the same for 32 bits", unless_missing(MINGW32, check(
        ["cmake", "--preset", "windows32"],
        ["cmake", "--build", "--preset", "windows32", "-j", JOBS, "--target", "orvenix"],
        [sys.executable, "scripts/check_exports.py", "build/windows32/bin/orvenix.dll"]))),
    ("desktop", "what Wine says of the platform", unless_missing({**MINGW, **WINE}, unless_unbuilt(
        "build/windows/bin/test_conformance.exe", ctest("windows")))),
    ("ce", "the library for Windows CE on 32-bit ARM", unless_missing(ARM_NONE, check(
        ["cmake", "--preset", "ce"], ["cmake", "--build", "--preset", "ce", "-j", JOBS],
        [sys.executable, "scripts/check_ce.py", "build/ce"]))),
    ("install", "the installed library, used by integrators in C and in C++",
     unless_unbuilt("build/release/lib/liborvenix.so", unless_unbuilt("build/dev/bin/orvenix", check(
         [sys.executable, "scripts/check_install.py", "build/release", "build/dev"])))),
    ("ce-lint", "what the device's library consists of", unless_missing(CE_LINT, unless_unbuilt(
        "build/ce/orvenix.dll", check([sys.executable, "scripts/check_ce_binary.py", "build/ce"])))),
    ("ce-loader-build", "the simulator and the loader for 32-bit ARM",
     unless_missing(ARM_LINUX, build("ce-loader"))),
    ("ce-loader", "their tests, carried out by qemu", unless_missing(ARM_LINUX, ctest("ce-loader"))),
    ("targets", "the same jobs on Linux, with the device's binary and on Windows",
     ctest("dev", "-L", "targets")),
    ("fuzz", "every fuzz target for a few seconds", fuzz),
    ("tidy", "clang-tidy",
     check(["cmake", "--preset", "release", "-B", "build/tidy", "-DCMAKE_DISABLE_PRECOMPILE_HEADERS=ON"],
           [sys.executable, "scripts/check_tidy.py"])),
]

# Not part of a plain ./test, whose first run should end within twenty minutes.
ON_REQUEST = {"tidy"}


def main():
    names = [name for name, _, _ in STEPS]
    epilog = "steps:\n" + "\n".join(f"  {name:14} {what}" for name, what, _ in STEPS)
    parser = argparse.ArgumentParser(prog="./test", description=__doc__.splitlines()[0], epilog=epilog,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("step", nargs="*", help="steps to run (default: all but " + ", ".join(sorted(ON_REQUEST)) + ")")
    arguments = parser.parse_args()
    unknown = [name for name in arguments.step if name not in names]
    if unknown:
        parser.error(f"no step is called {', '.join(unknown)}; the steps are {', '.join(names)}")

    counts = Counts()
    for name, what, action in STEPS:
        if name not in arguments.step if arguments.step else name in ON_REQUEST:
            continue
        (LOGS / f"{name}.log").unlink(missing_ok=True)
        started = time.monotonic()
        print(f"{name}: {what} ...", flush=True)
        good = action(name, counts)
        print(f"{name}: {'ok' if good else 'FAILED'} ({time.monotonic() - started:.0f} s)", flush=True)
    print(counts.line())
    return 0 if counts.failed == 0 and counts.passed > 0 else 1


if __name__ == "__main__":
    sys.exit(main())
