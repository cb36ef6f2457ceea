"""An X server without a screen, for windows that nobody looks at but a test.

    with xvfb.Screen(240, 320) as screen:
        ... a program with DISPLAY=screen.display ...
        picture = screen.picture()
"""

import os
import pathlib
import shutil
import subprocess
import tempfile


def why_not():
    """The reason why there is no such server here, or None."""
    return None if shutil.which("Xvfb") else "Xvfb is missing (Debian package xvfb)"


class Screen:
    """A server with one screen, under a number that it finds itself; ended by leaving the block."""

    def __init__(self, width, height):
        self._size = f"{width}x{height}x24"

    def __enter__(self):
        self._folder = tempfile.TemporaryDirectory(prefix="orvenix-xvfb-")
        read, write = os.pipe()
        # Without -noreset it would forget everything when its last client goes.
        self._server = subprocess.Popen(
            ["Xvfb", "-displayfd", str(write), "-screen", "0", self._size, "-fbdir", self._folder.name,
             "-nolisten", "tcp", "-noreset"],
            pass_fds=[write], stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
            stderr=subprocess.DEVNULL)
        os.close(write)
        with os.fdopen(read) as numbers:
            number = numbers.readline().strip()
        if not number:
            self.__exit__()
            raise RuntimeError("Xvfb did not start")
        self.display = f":{number}"
        return self

    def __exit__(self, *_):
        self._server.terminate()
        self._server.wait()
        self._folder.cleanup()

    def picture(self):
        """What the screen shows, as the bytes of an XWD file."""
        return (pathlib.Path(self._folder.name) / "Xvfb_screen0").read_bytes()
