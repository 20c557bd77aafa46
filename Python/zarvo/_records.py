"""What archives tell about themselves, and what became of runs."""

from __future__ import annotations

from typing import NamedTuple


class Blocks(NamedTuple):
    """The blocks of an archive."""

    total: int
    #: Decoded bytes of the largest block.
    largest: int
    #: How many can only be decoded from their start on.
    streamed: int
    #: How many there are of each kind.
    none: int
    lzma: int
    lz4: int
    lz4hc: int
    unknown: int


class Info(NamedTuple):
    """What an archive is. Sizes are in bytes."""

    #: "ZarvoFS", "ZarvoWeb", "ZarvoRaw" or "ZarvoArchive".
    layout: str
    version: int
    engine_version: str
    engine_revision: str
    #: Of the archive, as its writer recorded it; 0 where it did not.
    recorded_size: int
    file_size: int
    #: Of the data, decoded.
    data_size: int
    #: Of the data, as the blocks are stored.
    stored_size: int
    blocks: Blocks
    #: Of the directory: files and folders, also repeated ones.
    entries: int
    files: int
    folders: int
    #: Of all files, also repeated ones.
    file_bytes: int


class Progress(NamedTuple):
    """How far an extraction or a test has come."""

    bytes: int
    bytes_total: int
    files: int
    files_total: int


class Extracted(NamedTuple):
    """What an extraction has put in place."""

    files: int
    folders: int
    #: Files that were there and were left (overwrite="never").
    kept: int
    #: Of the files.
    bytes: int


class Damage(NamedTuple):
    """An entry with bytes that can't be read."""

    path: str
    size: int
    #: How many bytes from its start can be read.
    readable: int


class TestResult(NamedTuple):
    """What a test has found."""

    files: int
    bytes: int
    #: In the archive's order.
    damaged: list[Damage]
    #: Damaged blocks, also those that no file uses: number and reason.
    blocks: dict[int, str]


class Created(NamedTuple):
    """What an archive was made of."""

    files: int
    folders: int
    #: Of the files.
    bytes: int
    #: Of the archive.
    archive_bytes: int
    #: Links, devices, and folders that the layout does not hold: path and reason.
    left_out: list[tuple[str, str]]
