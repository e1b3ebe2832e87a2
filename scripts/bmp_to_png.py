#!/usr/bin/env python3
"""Turns 24-bit uncompressed BMP files into PNG files, with the standard
library only: bmp_to_png.py IN.bmp OUT.png [IN.bmp OUT.png ...]"""

import struct
import sys
import zlib


def read_bmp(path):
    with open(path, "rb") as f:
        data = f.read()
    if data[:2] != b"BM":
        sys.exit(f"{path}: not a BMP file")
    offset = struct.unpack_from("<I", data, 10)[0]
    width, height, _, bits, compression = struct.unpack_from("<iiHHI", data, 18)
    if bits != 24 or compression != 0:
        sys.exit(f"{path}: only 24-bit uncompressed BMP files are read")
    stride = (width * 3 + 3) & ~3
    rows = []
    for y in range(abs(height)):
        # Rows are stored bottom-up unless the height is negative.
        at = offset + (abs(height) - 1 - y if height > 0 else y) * stride
        bgr = data[at : at + width * 3]
        rgb = bytearray(len(bgr))
        rgb[0::3], rgb[1::3], rgb[2::3] = bgr[2::3], bgr[1::3], bgr[0::3]
        rows.append(bytes(rgb))
    return width, abs(height), rows


def chunk(kind, payload):
    return struct.pack(">I", len(payload)) + kind + payload + struct.pack(">I", zlib.crc32(kind + payload))


def write_png(path, width, height, rows):
    raw = b"".join(b"\x00" + row for row in rows)
    header = struct.pack(">IIBBBBB", width, height, 8, 2, 0, 0, 0)
    with open(path, "wb") as f:
        f.write(b"\x89PNG\r\n\x1a\n")
        f.write(chunk(b"IHDR", header))
        f.write(chunk(b"IDAT", zlib.compress(raw, 9)))
        f.write(chunk(b"IEND", b""))


def main(args):
    if not args or len(args) % 2:
        sys.exit("usage: bmp_to_png.py IN.bmp OUT.png [IN.bmp OUT.png ...]")
    for source, target in zip(args[0::2], args[1::2]):
        write_png(target, *read_bmp(source))


if __name__ == "__main__":
    main(sys.argv[1:])
