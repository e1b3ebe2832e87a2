#!/usr/bin/env python3
"""Draws the add-in's code icons and writes them as .ico files.

One icon per code-item kind, each in a small (16x16) and a large (32x32)
size: res/icons/<kind>-16.ico and res/icons/<kind>-32.ico, one 32-bit BGRA
image with its AND mask each. The DLL carries them as ICON resources
(src/com/kpxaddin.rc); the key and resource ids of each kind are listed in
src/dialogs/code_icons.cpp. It also writes a contact sheet of all of them,
docs/pictures/code-icons.png, to look at.

Python's standard library only, so anyone can run it:

    python3 scripts/make_code_icons.py            # from the repository's root

The output is the same bytes every time; the generated files are committed,
so the build needs no Python.

Drawing: every shape is a signed distance function (negative inside). A
pixel is sampled SS x SS times; each sample inside a shape takes the
shape's fill, or its outline colour within `outline` of the edge. The
geometry is written on a 16-unit grid and scaled by 2 for the large size,
with outlines staying one pixel wide, so edges on whole units stay crisp.
"""

import math
import os
import struct
import sys
import zlib

SS = 4  # samples per pixel along each axis

# ------------------------------------------------------------------ colours


def rgb(hex_text):
    return tuple(int(hex_text[i:i + 2], 16) / 255.0 for i in (0, 2, 4))


def mix(a, b, t):
    return tuple(x + (y - x) * t for x, y in zip(a, b))


WHITE = (1.0, 1.0, 1.0)
INK = rgb("2b2d42")  # the outline of every shape


def shade(base, size, top_light=0.45):
    """A fill that is lighter at the top and the base colour at the bottom."""
    light = mix(base, WHITE, top_light)

    def fill(x, y):
        return mix(light, base, min(1.0, max(0.0, y / size)))

    return fill


def flat(colour):
    return lambda x, y: colour


# -------------------------------------------------------------------- shapes
# Each returns f(x, y) -> signed distance in pixels (negative inside).


def rect(x0, y0, x1, y1, radius=0.0):
    cx, cy = (x0 + x1) / 2, (y0 + y1) / 2
    hx, hy = (x1 - x0) / 2 - radius, (y1 - y0) / 2 - radius

    def sdf(x, y):
        dx, dy = abs(x - cx) - hx, abs(y - cy) - hy
        outside = math.hypot(max(dx, 0.0), max(dy, 0.0))
        return outside + min(max(dx, dy), 0.0) - radius

    return sdf


def circle(cx, cy, r):
    return lambda x, y: math.hypot(x - cx, y - cy) - r


def segment(x0, y0, x1, y1, width):
    """A stroke with square ends cut flush at its end points."""
    length = math.hypot(x1 - x0, y1 - y0)
    ux, uy = (x1 - x0) / length, (y1 - y0) / length

    def sdf(x, y):
        px, py = x - x0, y - y0
        along = px * ux + py * uy
        across = abs(-px * uy + py * ux)
        return max(across - width / 2, -along, along - length)

    return sdf


def polygon(points):
    def sdf(x, y):
        best = float("inf")
        inside = False
        n = len(points)
        for i in range(n):
            ax, ay = points[i]
            bx, by = points[(i + 1) % n]
            ex, ey = bx - ax, by - ay
            t = max(0.0, min(1.0, ((x - ax) * ex + (y - ay) * ey) / (ex * ex + ey * ey)))
            best = min(best, math.hypot(x - ax - ex * t, y - ay - ey * t))
            if (ay > y) != (by > y) and x < ax + (y - ay) * ex / (ey or 1e-12):
                inside = not inside
        return -best if inside else best

    return sdf


def union(*shapes):
    return lambda x, y: min(s(x, y) for s in shapes)


def cut(shape, hole):
    return lambda x, y: max(shape(x, y), -hole(x, y))


# -------------------------------------------------------------------- canvas


class Canvas:
    """Premultiplied RGBA floats, row by row from the top."""

    def __init__(self, size):
        self.size = size
        self.px = [[(0.0, 0.0, 0.0, 0.0)] * size for _ in range(size)]

    def paint(self, shape, fill, outline=1.0, ink=INK):
        n = self.size
        step = 1.0 / SS
        for j in range(n):
            row = self.px[j]
            for i in range(n):
                r = g = b = 0.0
                hits = 0
                for sj in range(SS):
                    y = j + (sj + 0.5) * step
                    for si in range(SS):
                        x = i + (si + 0.5) * step
                        d = shape(x, y)
                        if d > 0:
                            continue
                        c = ink if d > -outline else fill(x, y)
                        r += c[0]
                        g += c[1]
                        b += c[2]
                        hits += 1
                if not hits:
                    continue
                a = hits / (SS * SS)
                # r, g, b summed over the hits: premultiplied by coverage.
                pr, pg, pb = r / (SS * SS), g / (SS * SS), b / (SS * SS)
                dr, dg, db, da = row[i]
                row[i] = (pr + dr * (1 - a), pg + dg * (1 - a), pb + db * (1 - a), a + da * (1 - a))

    def rgba8(self):
        """Straight (not premultiplied) 8-bit RGBA rows."""
        out = []
        for row in self.px:
            line = []
            for r, g, b, a in row:
                if a <= 0:
                    line.append((0, 0, 0, 0))
                    continue
                line.append(tuple(int(round(min(1.0, v / a) * 255)) for v in (r, g, b)) + (int(round(a * 255)),))
            out.append(line)
        return out


# --------------------------------------------------------------------- icons
# Each draws one kind at `size` (16 or 32); `u` turns grid units to pixels.

GOLD = rgb("f2b632")
PURPLE = rgb("7b5cd6")
GREEN = rgb("3aa55d")
RED = rgb("d9472b")
BLUE = rgb("4a86c8")
MAGENTA = rgb("c23b9a")
TEAL = rgb("1f9fb4")


def draw_class(c, u):
    # A UML class: a box of three compartments under a coloured name band.
    c.paint(rect(1 * u, 2 * u, 15 * u, 14 * u), flat(mix(GOLD, WHITE, 0.75)))
    c.paint(rect(1 * u, 2 * u, 15 * u, 6 * u + 1), shade(GOLD, c.size))
    c.paint(rect(1 * u, 10 * u, 15 * u, 10 * u + 1), flat(INK), outline=0)


def draw_interface(c, u):
    # A lollipop: the UML mark of an interface.
    c.paint(rect(7 * u, 9 * u, 9 * u, 15 * u), shade(PURPLE, c.size, 0.2))
    c.paint(circle(8 * u, 5.5 * u, 4.5 * u), shade(PURPLE, c.size))
    c.paint(circle(6.6 * u, 4.1 * u, 1.1 * u), flat(mix(PURPLE, WHITE, 0.8)), outline=0)


def draw_coclass(c, u):
    # A green class box with the lollipop of the interface it implements.
    c.paint(rect(3.5 * u, 8 * u, 6 * u + 1, 9 * u), flat(INK), outline=0)
    c.paint(circle(2.5 * u, 8.5 * u, 2.3 * u), flat(WHITE))
    c.paint(rect(6 * u, 2 * u, 15 * u, 15 * u), flat(mix(GREEN, WHITE, 0.72)))
    c.paint(rect(6 * u, 2 * u, 15 * u, 7 * u + 1), shade(GREEN, c.size))
    c.paint(rect(6 * u, 11 * u, 15 * u, 11 * u + 1), flat(INK), outline=0)


def draw_atl_object(c, u):
    # A red tile with a white "A".
    c.paint(rect(1 * u, 1 * u, 15 * u, 15 * u, radius=1.5 * u), shade(RED, c.size))
    w = 2.0 * u if u > 1 else 1.9
    letter = union(segment(8 * u, 3 * u, 4.2 * u, 13.2 * u, w),
                   segment(8 * u, 3 * u, 11.8 * u, 13.2 * u, w),
                   segment(5.6 * u, 9.6 * u, 10.4 * u, 9.6 * u, 1.6 * u))
    c.paint(letter, flat(WHITE), outline=0)


def draw_component(c, u):
    # A UML component: a box with two tabs on its left side.
    c.paint(rect(4 * u, 2 * u, 15 * u, 15 * u), shade(BLUE, c.size))
    c.paint(rect(1 * u, 4 * u, 7 * u, 7 * u + 1), flat(mix(BLUE, WHITE, 0.7)))
    c.paint(rect(1 * u, 9 * u, 7 * u, 12 * u + 1), flat(mix(BLUE, WHITE, 0.7)))


def draw_operation(c, u):
    # A magenta diamond, lit from the top left, with "()" marks beside it.
    c.paint(polygon([(8 * u, 1 * u), (15 * u, 8 * u), (8 * u, 15 * u), (1 * u, 8 * u)]), shade(MAGENTA, c.size))
    c.paint(polygon([(8 * u, 3.5 * u), (12.5 * u, 8 * u), (8 * u, 8 * u), (3.5 * u, 8 * u)]),
            flat(mix(MAGENTA, WHITE, 0.45)), outline=0)


def draw_attribute(c, u):
    # A teal tag with its eyelet: a value attached to a class.
    tag = polygon([(1 * u, 4 * u), (10 * u, 4 * u), (15 * u, 8.5 * u), (10 * u, 13 * u), (1 * u, 13 * u)])
    c.paint(cut(tag, circle(10.5 * u, 8.5 * u, 1.5 * u)), shade(TEAL, c.size))
    c.paint(rect(3 * u, 8 * u, 7.5 * u, 8 * u + 1 * (u if u > 1 else 1)), flat(mix(TEAL, WHITE, 0.85)), outline=0)


# file name stem, key, drawing; in the order of the image lists
KINDS = [
    ("class", "Class", draw_class),
    ("interface", "Interface", draw_interface),
    ("coclass", "CoClass", draw_coclass),
    ("atlobject", "ATLObject", draw_atl_object),
    ("component", "Component", draw_component),
    ("operation", "Operation", draw_operation),
    ("attribute", "Attribute", draw_attribute),
]
SIZES = (16, 32)


def render(draw, size):
    canvas = Canvas(size)
    draw(canvas, size // 16)
    return canvas.rgba8()


# ---------------------------------------------------------------- .ico files


def ico_bytes(pixels):
    """One 32-bit image: BITMAPINFOHEADER (height doubled for the mask),
    BGRA rows from the bottom, then the AND mask (1 = transparent), each of
    its rows padded to 32 bits."""
    size = len(pixels)
    xor = bytearray()
    for row in reversed(pixels):
        for r, g, b, a in row:
            xor += bytes((b, g, r, a))
    mask_stride = ((size + 31) // 32) * 4
    mask = bytearray()
    for row in reversed(pixels):
        line = bytearray(mask_stride)
        for x, (_, _, _, a) in enumerate(row):
            if a < 128:
                line[x // 8] |= 0x80 >> (x % 8)
        mask += line
    header = struct.pack("<IiiHHIIiiII", 40, size, size * 2, 1, 32, 0, len(xor) + len(mask), 0, 0, 0, 0)
    image = header + bytes(xor) + bytes(mask)
    directory = struct.pack("<HHH", 0, 1, 1)
    entry = struct.pack("<BBBBHHII", size % 256, size % 256, 0, 0, 1, 32, len(image), 6 + 16)
    return directory + entry + image


# ------------------------------------------------------------- contact sheet

# A 5x7 font for the sheet's labels: each glyph is seven rows of five bits.
FONT = {
    "A": "01110 10001 10001 11111 10001 10001 10001", "B": "11110 10001 10001 11110 10001 10001 11110",
    "C": "01110 10001 10000 10000 10000 10001 01110", "E": "11111 10000 10000 11110 10000 10000 11111",
    "F": "11111 10000 10000 11110 10000 10000 10000", "I": "01110 00100 00100 00100 00100 00100 01110",
    "J": "00111 00010 00010 00010 00010 10010 01100", "L": "10000 10000 10000 10000 10000 10000 11111",
    "M": "10001 11011 10101 10101 10001 10001 10001", "N": "10001 11001 10101 10011 10001 10001 10001",
    "O": "01110 10001 10001 10001 10001 10001 01110", "P": "11110 10001 10001 11110 10000 10000 10000",
    "R": "11110 10001 10001 11110 10100 10010 10001", "S": "01111 10000 10000 01110 00001 00001 11110",
    "T": "11111 00100 00100 00100 00100 00100 00100", "U": "10001 10001 10001 10001 10001 10001 01110",
    "1": "00100 01100 00100 00100 00100 00100 01110", "2": "01110 10001 00001 00010 00100 01000 11111",
    "3": "11110 00001 00001 01110 00001 00001 11110", "4": "00010 00110 01010 10010 11111 00010 00010",
    "6": "00110 01000 10000 11110 10001 10001 01110",
    "X": "10001 10001 01010 00100 01010 10001 10001", " ": "00000 00000 00000 00000 00000 00000 00000",
}


def png_bytes(rows):
    raw = bytearray()
    for row in rows:
        raw.append(0)
        for pixel in row:
            raw += bytes(pixel)
    height, width = len(rows), len(rows[0])

    def chunk(kind, data):
        body = kind + data
        return struct.pack(">I", len(data)) + body + struct.pack(">I", zlib.crc32(body) & 0xFFFFFFFF)

    header = struct.pack(">IIBBBBB", width, height, 8, 2, 0, 0, 0)
    return b"\x89PNG\r\n\x1a\n" + chunk(b"IHDR", header) + chunk(b"IDAT", zlib.compress(bytes(raw), 9)) + chunk(
        b"IEND", b"")


def contact_sheet(images):
    """A row per kind: its key, then each size on white and on a dark
    background at its own size, then both enlarged to 64 pixels."""
    light, dark, paper = (255, 255, 255), (45, 48, 56), (236, 238, 242)
    label_w, cell, gap = 96, 72, 8
    columns = 6
    width = label_w + columns * cell + gap
    height = gap + len(images) * cell + 24
    sheet = [[paper] * width for _ in range(height)]

    def put(x, y, colour):
        if 0 <= x < width and 0 <= y < height:
            sheet[y][x] = colour

    def text(x, y, s, colour=(40, 40, 50)):
        for ch in s.upper():
            rows = FONT.get(ch, FONT[" "]).split()
            for j, bits in enumerate(rows):
                for i, bit in enumerate(bits):
                    if bit == "1":
                        put(x + i, y + j, colour)
            x += 6

    def blit(x0, y0, pixels, scale, background):
        size = len(pixels) * scale
        for y in range(64):
            for x in range(64):
                put(x0 + x, y0 + y, background)
        off = (64 - size) // 2
        for y in range(size):
            for x in range(size):
                r, g, b, a = pixels[y // scale][x // scale]
                t = a / 255.0
                put(x0 + off + x, y0 + off + y,
                    tuple(int(round(c * t + bg * (1 - t))) for c, bg in zip((r, g, b), background)))

    headings = ["16", "32", "16", "32", "16 X4", "32 X2"]
    for n, h in enumerate(headings):
        text(label_w + n * cell + 4, height - 16, h)
    for row, (key, small, large) in enumerate(images):
        y = gap + row * cell
        text(8, y + 28, key)
        blit(label_w + 0 * cell, y, small, 1, light)
        blit(label_w + 1 * cell, y, large, 1, light)
        blit(label_w + 2 * cell, y, small, 1, dark)
        blit(label_w + 3 * cell, y, large, 1, dark)
        blit(label_w + 4 * cell, y, small, 4, light)
        blit(label_w + 5 * cell, y, large, 2, light)
    return png_bytes(sheet)


def main():
    root = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
    icons = os.path.join(root, "res", "icons")
    pictures = os.path.join(root, "docs", "pictures")
    os.makedirs(icons, exist_ok=True)
    os.makedirs(pictures, exist_ok=True)
    sheet_rows = []
    for stem, key, draw in KINDS:
        drawn = {}
        for size in SIZES:
            drawn[size] = render(draw, size)
            path = os.path.join(icons, "%s-%d.ico" % (stem, size))
            with open(path, "wb") as f:
                f.write(ico_bytes(drawn[size]))
        sheet_rows.append((key, drawn[16], drawn[32]))
    with open(os.path.join(pictures, "code-icons.png"), "wb") as f:
        f.write(contact_sheet(sheet_rows))
    print("wrote %d icons to %s and the contact sheet to %s" % (len(KINDS) * len(SIZES), icons, pictures))
    return 0


if __name__ == "__main__":
    sys.exit(main())
