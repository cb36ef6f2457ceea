#!/usr/bin/env python3
"""Runs a Windows program under Wine as if it were a program of this system.

usage: wine_run.py [options] program.exe [argument...]
       wine_run.py --prepare     makes the prefix, when there is none yet
       wine_run.py --branch PATH makes PATH a prefix with a registry, drives and a server of its
                                 own, which shares the files of the common one
       wine_run.py --stop        ends whatever still runs in the prefix, and its server
       wine_run.py --why-not     exit code 1 and the reason when Wine cannot be used here

options:
  --folder PATH      the folder the program runs in: the root of its drive (default: a fresh one,
                     removed at the end). A DLL is found in the folder of the program, or here.
  --timeout SECONDS  when the program is ended (default 120); the exit code is then 124
  --screen           gives the program a screen of 240 by 320 that nobody sees (package xvfb);
                     without one it can make no window. It then has the prefix for itself, because
                     all programs of a prefix share one desktop.

All programs share one prefix (build/wine-prefix, made once, in about ten seconds; another place in
ORVENIX_WINE_PREFIX), because each needs 700 MB. It belongs to whoever made it: for another user of
the same tree there is another one.

A path like "\\FileXfer.log" means the root of the current drive. For a folder of Linux that would be
Z:, the root of this machine. So each program gets a drive of its own, whose root is its folder: T:, or
when another process has that the next free letter. Letters are taken by locking a file in the prefix,
and are free again when this script ends, however it ends.

What the program writes goes to files and is passed on at its end: Wine's own services, which the
first program starts, would keep a pipe open, and whoever reads it waiting. Its input is empty. The
exit code is the program's own, modulo 256. A program that wants to be talked to while it runs does so
over files of its folder or sockets of 127.0.0.1, which it shares with this system's own programs.

CMake's tests use it as CMAKE_CROSSCOMPILING_EMULATOR; tests in Python may import `run`.
"""

import argparse
import contextlib
import fcntl
import os
import pathlib
import shutil
import signal
import subprocess
import sys
import tempfile
import time

import xvfb

ROOT = pathlib.Path(__file__).resolve().parent.parent
LETTERS = "tuvwxyabdefghijklmnopqrs"
TIMED_OUT = 124
SCREEN = (240, 320)
# Windows lie on a desktop of that size, with no window manager between them and the program, and in
# the colours of a device.
SETTINGS = ((r"Software\\Wine\\Explorer", "Desktop", "Default"),
            (r"Software\\Wine\\Explorer\\Desktops", "Default", "{}x{}".format(*SCREEN)),
            (r"Control Panel\\Colors", "Background", "72 96 120"),
            (r"Control Panel\\Colors", "WindowFrame", "0 0 0"))
DEBIANS = pathlib.Path("/usr/lib/wine")  # where its packages put what they keep out of the PATH


def wine():
    """The loader for 64-bit programs, or None."""
    found = shutil.which("wine64") or shutil.which("wine64", path=str(DEBIANS))
    return found or shutil.which("wine")


def server():
    return shutil.which("wineserver") or shutil.which("wineserver64", path=str(DEBIANS))


def why_not():
    """The reason why nothing runs under Wine here, or None."""
    if sys.platform != "linux":
        return "Wine is used on Linux only"
    return None if wine() and server() else "wine is missing (Debian package wine64)"


def prefix():
    named = os.environ.get("ORVENIX_WINE_PREFIX")
    if named:
        return pathlib.Path(named).resolve()
    shared = ROOT / "build" / "wine-prefix"
    if shared.exists() and shared.stat().st_uid != os.getuid():
        return shared.with_name(f"{shared.name}-{os.getuid()}")
    return shared


def environment(display=None):
    """What Wine reads from its environment; neither network, dialogs nor the user's home."""
    values = {name: value for name, value in os.environ.items()
              if not name.startswith("WINE") and name not in ("DISPLAY", "WAYLAND_DISPLAY")}
    values.update(WINEPREFIX=str(prefix()), WINEARCH="win64", WINEDEBUG="-all", HOME=str(prefix()),
                  WINEDLLOVERRIDES="mscoree,mshtml=;winemenubuilder.exe=d")
    if display:
        values["DISPLAY"] = display
    return values


@contextlib.contextmanager
def locked(path, wait=True):
    """Holds a lock on a file; yields False when another has it and `wait` is False."""
    with open(path, "a") as file:
        try:
            fcntl.flock(file, fcntl.LOCK_EX | (0 if wait else fcntl.LOCK_NB))
        except BlockingIOError:
            yield False
        else:
            yield True


def prepare():
    """Makes the prefix when there is none."""
    where = prefix()
    made = where / "orvenix-locks"  # comes last, so it is there only when all went well
    if made.is_dir():
        return
    where.parent.mkdir(parents=True, exist_ok=True)
    with locked(where.with_name(where.name + ".lock")):
        if made.is_dir():
            return
        shutil.rmtree(where, ignore_errors=True)
        with tempfile.TemporaryFile() as output:
            done = subprocess.run([wine(), "wineboot", "-u"], env=environment(), stdin=subprocess.DEVNULL,
                                  stdout=output, stderr=subprocess.STDOUT, timeout=180, check=False)
            if done.returncode != 0:
                output.seek(0)
                sys.exit("wineboot failed:\n" + output.read().decode(errors="replace"))
        tell_server("-w")  # it writes the registry last of all
        with open(where / "user.reg", "a") as registry:
            registry.writelines(f'\n[{key}]\n"{name}"="{value}"\n' for key, name, value in SETTINGS)
        made.mkdir()


def branch(path):
    """Makes a prefix that costs next to nothing: for programs in a network of their own, whose sockets
    belong to the prefix's server."""
    prepare()
    for folder in ("dosdevices", "orvenix-locks"):
        (path / folder).mkdir(parents=True)
    for name in ("system.reg", "user.reg", "userdef.reg", ".update-timestamp"):
        shutil.copyfile(prefix() / name, path / name)
    (path / "drive_c").symlink_to(prefix() / "drive_c")
    (path / "dosdevices/c:").symlink_to("../drive_c")
    (path / "dosdevices/z:").symlink_to("/")


def stop():
    """Ends the programs of the prefix, if any run, and its server."""
    if prefix().exists():
        tell_server("-k")
        tell_server("-w")


@contextlib.contextmanager
def session(alone):
    """Holds the prefix: with others, or alone, with nothing left of whoever had it before."""
    with open(prefix() / "orvenix-locks" / "session", "a") as file:
        fcntl.flock(file, fcntl.LOCK_EX if alone else fcntl.LOCK_SH)
        if alone:
            stop()
        try:
            yield
        finally:
            if alone:
                stop()


def tell_server(option):
    subprocess.run([server(), option], env=environment(), stdin=subprocess.DEVNULL,
                   stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, timeout=60, check=False)


@contextlib.contextmanager
def drive(folder):
    """A drive letter of the prefix, whose root is the folder."""
    while True:
        for letter in LETTERS:
            with locked(prefix() / "orvenix-locks" / letter, wait=False) as free:
                if not free:
                    continue
                link = prefix() / "dosdevices" / f"{letter}:"
                link.unlink(missing_ok=True)
                link.symlink_to(folder, target_is_directory=True)
                try:
                    yield letter
                finally:
                    link.unlink(missing_ok=True)
                return
        time.sleep(0.05)


def run(command, folder, timeout=120, display=None):
    """Runs a program in a folder, which becomes the root of its drive.

    Returns its exit code (TIMED_OUT when it had to be ended) and what it wrote to its output and its
    error output, as bytes.
    """
    prepare()
    with session(display is not None), drive(folder) as letter, \
            tempfile.TemporaryFile() as output, tempfile.TemporaryFile() as errors:
        # Tests empty their drive; this tells them that it is meant for them.
        values = {**environment(display), "ORVENIX_OWN_DRIVE": f"{letter.upper()}:"}
        program = subprocess.Popen([wine(), *map(str, command)], env=values, cwd=folder,
                                   stdin=subprocess.DEVNULL, stdout=output, stderr=errors,
                                   start_new_session=True)
        try:
            code = program.wait(timeout)
        except subprocess.TimeoutExpired:
            code = TIMED_OUT
        finally:
            if program.poll() is None:
                os.killpg(program.pid, signal.SIGKILL)  # its own processes and no others
                program.wait()
        texts = []
        for file in (output, errors):
            file.seek(0)
            texts.append(file.read())
        return code if code >= 0 else 128 - code, *texts


def main():
    parser = argparse.ArgumentParser(usage=__doc__.partition("usage: ")[2], add_help=False)
    parser.add_argument("--help", action="help")
    parser.add_argument("--folder", type=pathlib.Path)
    parser.add_argument("--branch", type=pathlib.Path)
    parser.add_argument("--timeout", type=float, default=120)
    for name in ("--screen", "--prepare", "--stop", "--why-not"):
        parser.add_argument(name, action="store_true")
    parser.add_argument("command", nargs=argparse.REMAINDER)
    arguments = parser.parse_args()
    reason = why_not() or (xvfb.why_not() if arguments.screen else None)
    if reason:
        print(reason, file=sys.stderr)
        return 1
    if arguments.why_not:
        return 0
    if arguments.prepare or arguments.stop:
        return prepare() if arguments.prepare else stop()
    if arguments.branch:
        return branch(arguments.branch)
    if not arguments.command:
        parser.error("name a program")
    program = pathlib.Path(arguments.command[0]).resolve()
    with contextlib.ExitStack() as stack:
        folder = arguments.folder
        if folder is None:
            folder = stack.enter_context(tempfile.TemporaryDirectory(prefix="orvenix-wine-"))
        command = [program, *arguments.command[1:]]
        display = None
        if arguments.screen:
            display = stack.enter_context(xvfb.Screen(*SCREEN)).display
        code, output, errors = run(command, pathlib.Path(folder).resolve(), arguments.timeout, display)
    sys.stdout.buffer.write(output)
    sys.stdout.flush()
    sys.stderr.buffer.write(errors)
    if code == TIMED_OUT:
        print(f"{program.name}: ended after {arguments.timeout:g} s", file=sys.stderr)
    return code


if __name__ == "__main__":
    sys.exit(main())
