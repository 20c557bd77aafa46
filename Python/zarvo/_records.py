"""What archives tell about themselves, and what became of runs."""

from typing import NamedTuple


class Blocks(NamedTuple):
    """The blocks of an archive.

    total: how many there are.
    largest: decoded bytes of the largest one.
    streamed: how many can only be decoded from their start on.
    none, lzma, lz4, lz4hc, unknown: how many there are of each kind.
    """

    total: int
    largest: int
    streamed: int
    none: int
    lzma: int
    lz4: int
    lz4hc: int
    unknown: int


class Info(NamedTuple):
    """What an archive is. Sizes are in bytes.

    layout: "ZarvoFS", "ZarvoWeb", "ZarvoRaw" or "ZarvoArchive".
    version: of the layout.
    engine_version, engine_revision: of the engine that wrote the archive.
    recorded_size: of the archive, as its writer recorded it; 0 where it did not.
    file_size: of the archive, as it is.
    data_size: of the data, decoded.
    stored_size: of the data, as the blocks are stored.
    entries: how many the directory lists, also repeated ones.
    files, folders: how many of them are files, and folders.
    file_bytes: of all files, also repeated ones.
    """

    layout: str
    version: int
    engine_version: str
    engine_revision: str
    recorded_size: int
    file_size: int
    data_size: int
    stored_size: int
    blocks: Blocks
    entries: int
    files: int
    folders: int
    file_bytes: int


class Progress(NamedTuple):
    """How far an extraction, a test or a creation has come."""

    bytes: int
    bytes_total: int
    files: int
    files_total: int


class Extracted(NamedTuple):
    """What an extraction has put in place.

    kept: files that were there and were left (overwrite="never").
    bytes: of the files.
    """

    files: int
    folders: int
    kept: int
    bytes: int


class Damage(NamedTuple):
    """An entry with bytes that can't be read.

    readable: how many bytes from its start can be read.
    """

    path: str
    size: int
    readable: int


class TestResult(NamedTuple):
    """What a test has found.

    files, bytes: how many were tested.
    damaged: the entries with bytes that can't be read, in the archive's order.
    blocks: number and reason of each damaged block, also of those that no file uses.
    """

    files: int
    bytes: int
    damaged: list[Damage]
    blocks: dict[int, str]


class Created(NamedTuple):
    """What an archive was made of.

    bytes: of the files.
    archive_bytes: of the archive.
    left_out: path and reason of links, devices, and folders that the layout does not hold.
    """

    files: int
    folders: int
    bytes: int
    archive_bytes: int
    left_out: list[tuple[str, str]]
