#!/usr/bin/env python3
"""Compares the progress window of desktop Windows with the simulated device's.

usage: compare_windows.py <progress_window.exe> <simulated_window> <folder for the pictures>

The first program shows the window under Wine, on a screen of its own; the second one draws it as the
simulator does, with a font of the same sizes. Lines, bars and frames have to be the same, pixel by
pixel; the letters are different ones, so of each line of text only the place is compared. Leaves both
pictures of each state in the folder. Exit code 77: a program is missing here.
"""

import pathlib
import shutil
import struct
import subprocess
import sys
import tempfile
import threading
import time
import zlib

import wine_run
import xvfb

STATES = ("normal", "caption")
SKIPPED = 77
SLACK = 3  # pixels that a text's first or last row or column may stand elsewhere
LONGEST_WAIT = 60
# The window leaves some rows as they are: on the device they show what lies behind, on a desktop a new
# window's black.
UNPAINTED = (72, 96, 120)


class Picture:
    """Rows of (red, green, blue)."""

    def __init__(self, width, height, pixels):
        self.width, self.height, self.pixels = width, height, pixels

    def at(self, x, y):
        return self.pixels[y * self.width + x]

    def save_png(self, path):
        rows = b"".join(b"\0" + bytes(value for x in range(self.width) for value in self.at(x, y))
                        for y in range(self.height))

        def chunk(kind, data):
            return struct.pack(">I", len(data)) + kind + data + struct.pack(">I", zlib.crc32(kind + data))

        header = struct.pack(">IIBBBBB", self.width, self.height, 8, 2, 0, 0, 0)
        path.write_bytes(b"\x89PNG\r\n\x1a\n" + chunk(b"IHDR", header) +
                         chunk(b"IDAT", zlib.compress(rows)) + chunk(b"IEND", b""))


def read_xwd(data):
    """A picture as an X server keeps it: a header, a colour map, and rows of 32 bits a pixel."""
    fields = struct.unpack(">25I", data[:100])
    header_size, version = fields[0], fields[1]
    width, height, byte_order = fields[4], fields[5], fields[7]
    bits, row_size, colours = fields[11], fields[12], fields[19]
    if version != 7 or bits != 32 or byte_order != 0:
        raise ValueError(f"an XWD file of version {version} with {bits} bits a pixel")
    start = header_size + colours * 12
    pixels = []
    for y in range(height):
        row = data[start + y * row_size:start + y * row_size + width * 4]
        pixels += [(row[i + 2], row[i + 1], row[i]) for i in range(0, width * 4, 4)]
    return Picture(width, height, pixels)


def read_ppm(data):
    header, _, rest = data.partition(b"\n")
    _, width, height, _ = header.split()
    pixels = [tuple(rest[i:i + 3]) for i in range(0, len(rest), 3)]
    return Picture(int(width), int(height), pixels)


def desktop_picture(program, state):
    """The screen while the window is up, and the sizes of its font."""
    results = {}
    with tempfile.TemporaryDirectory() as name, xvfb.Screen(*wine_run.SCREEN) as screen:
        folder = pathlib.Path(name)

        def show():
            results["end"] = wine_run.run([program, state], folder, LONGEST_WAIT, screen.display)

        thread = threading.Thread(target=show)
        thread.start()
        while thread.is_alive() and not (folder / "shown").exists():
            time.sleep(0.05)
        picture = read_xwd(screen.picture())
        font = (folder / "font").read_text().split() if (folder / "font").exists() else []
        (folder / "done").touch()
        thread.join()
    code, output, errors = results["end"]
    if code != 0 or not font:
        sys.exit(f"{program} ended with {code}: {(output + errors).decode(errors='replace')}")
    return picture, font


def simulated_picture(program, state, font):
    with tempfile.TemporaryDirectory() as name:
        file = pathlib.Path(name) / "picture.ppm"
        subprocess.run([program, state, file, *font], check=True, stdin=subprocess.DEVNULL)
        return read_ppm(file.read_bytes())


class Rows:
    """Where texts stand, from the sizes of the font."""

    BORDER = 1
    LINES = 16  # of the normal layout; below them come the caption or the file's bar, then the other

    def __init__(self, font):
        height, _, _, internal, external = map(int, font[:5])
        self.pitch = height + external
        self.left = self.BORDER + 3 + internal
        self.first = self.BORDER + 2 + 3 + external

    def of_lines(self, count):
        return [(self.first + i * self.pitch, self.first + (i + 1) * self.pitch) for i in range(count)]

    def of_caption(self):
        top = self.BORDER + self.pitch * (self.LINES + 2)
        return (top, top + self.pitch)


def ink(picture, rows, left):
    """The box around everything that is not white in some rows, inside the window's frame."""
    inside = range(left - 1, picture.width - 3)
    found = [(x, y) for y in range(*rows) for x in inside if picture.at(x, y) != (255, 255, 255)]
    if not found:
        return None
    xs, ys = [x for x, _ in found], [y for _, y in found]
    return min(xs), min(ys), max(xs), max(ys)


def compare(state, desktop, simulated, font):
    """Yields what is different."""
    if (desktop.width, desktop.height) != (simulated.width, simulated.height):
        yield f"sizes: {desktop.width} by {desktop.height}, {simulated.width} by {simulated.height}"
        return
    rows = Rows(font)
    texts = rows.of_lines(6) + ([rows.of_caption()] if state == "caption" else [])
    for number, band in enumerate(texts, 1):
        one, other = ink(desktop, band, rows.left), ink(simulated, band, rows.left)
        if one is None or other is None:
            yield f"text {number}: {one} on the desktop, {other} on the device"
        # Where a line ends depends on the widths of its letters.
        elif max(abs(one[side] - other[side]) for side in (0, 1, 3)) > SLACK:
            yield f"text {number}: {one} on the desktop, {other} on the device"
    of_text = {y for band in texts for y in range(*band)}
    wrong = [(x, y) for y in range(desktop.height) for x in range(desktop.width)
             if not (y in of_text and rows.left - 1 <= x < desktop.width - 3)
             and desktop.at(x, y) != simulated.at(x, y)
             and not (simulated.at(x, y) == UNPAINTED and desktop.at(x, y) == (0, 0, 0))]
    if wrong:
        x, y = wrong[0]
        yield (f"{len(wrong)} pixels of lines, bars and frames; the first at {x}, {y}: "
               f"{desktop.at(x, y)} on the desktop, {simulated.at(x, y)} on the device")


def why_not(simulated):
    reason = wine_run.why_not() or xvfb.why_not()
    return reason or (None if simulated.exists() else f"{simulated} has not been built")


def main():
    if len(sys.argv) != 4:
        sys.exit(__doc__)
    program, simulated, folder = map(pathlib.Path, sys.argv[1:])
    reason = why_not(simulated)
    if reason:
        print("skipped:", reason)
        return SKIPPED
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir(parents=True)
    failed = False
    for state in STATES:
        on_desktop, font = desktop_picture(program.resolve(), state)
        on_device = simulated_picture(simulated.resolve(), state, font)
        on_desktop.save_png(folder / f"{state}-desktop.png")
        on_device.save_png(folder / f"{state}-device.png")
        for difference in compare(state, on_desktop, on_device, font):
            print(f"{state}: {difference}")
            failed = True
    print(f"the pictures are in {folder}")
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
