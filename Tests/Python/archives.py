"""What the tests share: block-based archives, made here, in a folder for each test."""

import lzma
import pathlib
import random
import struct
import tempfile
import unittest

import zarvo

STORED, LZMA, UNKNOWN = 0, 1, 9

FOLDER = None  # in place of a file's bytes

ROAD = pathlib.Path(__file__).parents[2] / "Samples" / "road.zarvo"


def compress(data: bytes) -> bytes:
    alone = lzma.compress(data, lzma.FORMAT_ALONE, preset=0)
    return alone[:5] + alone[13:]  # without the size


def build(entries, *, kind=STORED, block_size=1 << 16, streamed=False, damage=()) -> bytes:
    """entries: (path, bytes or FOLDER). damage: numbers of blocks whose stored bytes are spoiled from their middle on."""
    data = b"".join(content or b"" for _, content in entries)
    blocks, stored = b"", b""
    for number, start in enumerate(range(0, len(data), block_size)):
        plain = data[start : start + block_size]
        coded = compress(plain) if kind == LZMA else plain
        if number in damage:
            half = len(coded) // 2
            coded = coded[:half] + b"\xff" * (len(coded) - half)
        blocks += struct.pack(">IIH", len(plain), len(coded), kind | (0x40 if streamed else 0))
        stored += coded
    nodes, offset = b"", 0
    for path, content in entries:
        size = len(content or b"")
        nodes += struct.pack(">QQI", offset, size, 1 if content is FOLDER else 0) + path.encode() + b"\0"
        offset += size
    section = bytes(16) + struct.pack(">I", len(blocks) // 10) + blocks + struct.pack(">I", len(entries)) + nodes
    front = struct.pack(">8sI", b"ZarvoFS\0", 8) + b"5.x.x\0" + b"7041.3.0b12\0"
    header_size = -(-(len(front) + 20) // 16) * 16
    sizes = struct.pack(">QIII", header_size + len(section) + len(stored), len(section), len(section), 0x40)
    return (front + sizes).ljust(header_size, b"\0") + section + stored


def make_text(size: int, seed: int = 1) -> bytes:
    """Bytes that compress to about a half, in lines."""
    chosen = random.Random(seed)
    words = [chosen.randbytes(5).hex() for _ in range(500)]
    text = bytearray()
    while len(text) < size:
        text += " ".join(chosen.choices(words, k=9)).encode() + b"\n"
    return bytes(text[:size])


TEXT = make_text(300_000)

TREE = [
    ("readme.txt", b"first\n"),
    ("tables", FOLDER),
    ("tables/one.csv", TEXT),
    ("road/of/one.txt", b"\xef\xbb\xbfon the way\r\n"),
    ("empty", b""),
]


class ArchiveTest(unittest.TestCase):
    """Has a folder, and archives in it."""

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def write(self, entries, **form):
        path = self.folder / "a.zarvo"
        path.write_bytes(build(entries, **form))
        return path

    def open(self, entries, **form):
        archive = zarvo.open(self.write(entries, **form))
        self.addCleanup(archive.close)
        return archive
