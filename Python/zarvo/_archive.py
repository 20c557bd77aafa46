"""Archives and their entries."""

from __future__ import annotations

import io
import os
from collections.abc import Mapping

from . import _native
from ._errors import ArchiveChanged, CreationFailed, ExtractionFailed

TYPE_CHECKING = False  # that of typing, which takes long to import
if TYPE_CHECKING:
    from collections.abc import Callable, Iterable, Iterator
    from typing import Any, BinaryIO, Union

    from ._records import Created, Extracted, Info, Progress, TestResult

    StrPath = Union[str, os.PathLike[str]]

# What zarvo.h calls them.
_LAYOUTS = ("ZarvoFS", "ZarvoWeb", "ZarvoRaw", "ZarvoArchive")
_COMPRESSIONS = ("none", "lzma", "lz4", "lz4hc")
_OVERWRITE = ("always", "never", "fail")
_OPEN_OPTIONS = ("offset", "max_entries", "max_directory_bytes", "max_block_bytes", "cache_bytes")

# A larger file is read piece by piece, so that the user can interrupt.
_ONE_READ = 1 << 24


class _FileSource:
    """Reads a file object at any place. One thread at a time, because it has one position."""

    def __init__(self, file: BinaryIO) -> None:
        import threading

        self._file = file
        self._lock = threading.Lock()

    def size(self) -> int:
        return self._file.seek(0, os.SEEK_END)

    def read_at(self, offset: int, size: int) -> bytes:
        with self._lock:
            self._file.seek(offset)
            return self._file.read(size)


def _is_plain_file(file: object) -> bool:
    """Whether a file object shows the bytes of its descriptor, as decompressing ones don't."""
    if isinstance(file, (io.BufferedReader, io.BufferedRandom)):
        file = file.raw
    return type(file) is io.FileIO


class _EntryFile(io.RawIOBase):
    """A file of an archive, for an io.BufferedReader."""

    mode = "rb"

    def __init__(self, stream: _native.Stream, entry: Entry) -> None:
        self._stream: _native.Stream | None = stream
        self._position = 0
        self._size = entry.size
        self._data_end = entry._data_end()
        self.name = entry.path

    def _open_stream(self) -> _native.Stream:
        if self._stream is None:
            raise ValueError("I/O operation on closed file")
        return self._stream

    def close(self) -> None:
        self._stream = None
        super().close()

    def readable(self) -> bool:
        self._open_stream()
        return True

    def seekable(self) -> bool:
        self._open_stream()
        return True

    def readinto(self, buffer: Any) -> int:
        count = self._open_stream().readinto(buffer)
        self._position += count
        return count

    def readall(self) -> bytes:
        stream = self._open_stream()
        try:
            data = stream.read(_count_to_read(self._position, self._size, self._data_end))
        except BaseException:
            stream.seek(self._position)  # it may have read pieces before
            raise
        self._position += len(data)
        return data

    def seek(self, offset: int, whence: int = os.SEEK_SET) -> int:
        stream = self._open_stream()
        start = {os.SEEK_SET: 0, os.SEEK_CUR: self._position, os.SEEK_END: self._size}.get(whence)
        if start is None:
            raise ValueError(f"invalid whence ({whence})")
        position = start + offset
        if position < 0:
            raise ValueError(f"negative seek position {position}")
        stream.seek(position)
        self._position = position
        return position

    def tell(self) -> int:
        self._open_stream()
        return self._position


class Entry:
    """A file or a folder of an archive. It can be used until the archive is closed."""

    __slots__ = {
        "archive": "The archive that it is in.",
        "index": "The number in the archive's directory.",
        "path": "As the archive stores it. Bytes that are not UTF-8 are lone surrogates, as in the names of files.",
        "kind": '"file" or "folder".',
        "size": "Bytes of the file.",
        "offset": "Of the file's first byte in the archive's data.",
        "flags": "As stored.",
    }

    archive: Archive
    index: int
    path: str
    kind: str
    size: int
    offset: int
    flags: int

    def __init__(self, archive: Archive, fields: _native.EntryFields) -> None:
        self.archive = archive
        self.index, self.path, self.kind, self.size, self.offset, self.flags = fields

    def is_dir(self) -> bool:
        """Whether it is a folder."""
        return self.kind == "folder"

    def read(self) -> bytes:
        """Return the file's bytes."""
        if self.kind == "file" and self.size <= _ONE_READ:  # most files; two calls less count where they are small
            return self.archive._native.read(self.index, 0, self.size)
        return self._read_range(0, self.size)

    def open(self) -> io.BufferedReader:
        """Open the file for reading: a binary file object that can seek.

        Several may be open at once, in several threads. It stays usable when the archive is closed meanwhile.
        """
        self._require_file()
        return io.BufferedReader(_EntryFile(self.archive._native.open_stream(self.index), self), 1 << 16)

    def _read_range(self, start: int, end: int) -> bytes:
        """Bytes [start, end) of the file; both lie in it."""
        self._require_file()
        if end - start <= _ONE_READ:
            return self.archive._native.read(self.index, start, end - start)
        stream = self.archive._native.open_stream(self.index)
        stream.seek(start)
        return stream.read(_count_to_read(start, end, self._data_end()))

    def _data_end(self) -> int:
        """Where the archive's data ends, from the file's start on; negative if that is past it."""
        return self.archive._native.data_size() - self.offset

    def _require_file(self) -> None:
        if self.kind != "file":
            raise IsADirectoryError(f"{self.archive.name}: {self.path} is a folder")

    def __eq__(self, other: object) -> bool:
        return isinstance(other, Entry) and other.archive is self.archive and other.index == self.index

    def __hash__(self) -> int:
        return hash((id(self.archive), self.index))

    def __repr__(self) -> str:
        return f"<zarvo.Entry {self.path!r} ({self.kind}, {self.size} bytes)>"

    def __reduce__(self) -> tuple[Any, ...]:
        return (_find_again, (self.archive, self.index, self.path))


def _count_to_read(start: int, end: int, data_end: int) -> int:
    """How many bytes to ask for, of [start, end) of a file.

    A damaged size must not ask for memory: of what lies past the end of the data, one byte tells that.
    """
    return max(0, min(end, max(start, data_end) + 1) - start)


def _reopen(file: str | BinaryIO, options: dict[str, int]) -> Archive:
    return Archive(file, **options)


def _get_entry(archive: Archive, index: int) -> Entry:
    return Entry(archive, archive._native.entry(index))


def _find_again(archive: Archive, index: int, path: str) -> Entry:
    """Return the entry of an archive that has been opened anew, and may be another one by now."""
    if index < archive._native.entry_count():
        entry = _get_entry(archive, index)
        if entry.path == path:
            return entry
    raise ArchiveChanged(f"{archive.name}: {path}: the archive has changed since the entry was pickled")


class Archive(Mapping[str, Entry]):
    """An open archive: a mapping of the paths of its entries to the entries, in the archive's order.

    The keys are paths as the archive stores them. A look-up takes any form of a path: "\\" is "/", and empty and "."
    components don't count. Of entries with the same path, the last is in the mapping (of files and folders, the last
    file). Entries whose paths extraction refuses are not in it; entries() has all.

    Use it in a with statement, or close it. Any number of threads may use it. It can be pickled, and is then opened
    again where it is unpickled.

    name: the path that it was opened by, or the name of the file object.
    """

    def __init__(
        self,
        file: StrPath | BinaryIO,
        *,
        offset: int = 0,
        max_entries: int = 0,
        max_directory_bytes: int = 0,
        max_block_bytes: int = 0,
        cache_bytes: int = 0,
    ) -> None:
        self._handle: _native.Archive | None = None
        options = (offset, max_entries, max_directory_bytes, max_block_bytes, cache_bytes)
        self._options = dict(zip(_OPEN_OPTIONS, options))
        self._info: Info | None = None
        self._length: int | None = None
        self._file: str | BinaryIO
        if isinstance(file, (str, os.PathLike)):
            self._file = os.path.abspath(file)  # where an unpickled copy finds it
            self.name: str = os.fspath(file)
            self._handle = _native.open_path(file, self.name, options)
            return
        if not hasattr(file, "seek"):
            given = type(file).__name__
            raise TypeError(f"an archive is a path or a binary file object that can seek, and not {given}")
        self._file = file
        self.name = str(getattr(file, "name", file))
        if _is_plain_file(file):
            file.flush()  # what was written and is not in the file yet
            self._handle = _native.open_descriptor(file.fileno(), self.name, options)
        else:
            source = _FileSource(file)
            self._handle = _native.open_source(source.read_at, source.size(), self.name, options)

    @property
    def _native(self) -> _native.Archive:
        if self._handle is None:
            raise ValueError(f"{self.name}: the archive is closed")
        return self._handle

    def close(self) -> None:
        """Close the archive. Calls that go on, and files that are open, go on until their ends."""
        self._handle = None

    @property
    def closed(self) -> bool:
        """Whether the archive is closed."""
        return self._handle is None

    def __enter__(self) -> Archive:
        self._native  # a closed one can't be entered
        return self

    def __exit__(self, *exception: object) -> None:
        self.close()

    @property
    def info(self) -> Info:
        """What the archive is."""
        if self._info is None:
            from ._records import Blocks, Info

            info = self._native.info()
            self._info = Info(_LAYOUTS[info[0]], *info[1:8], Blocks(*info[8]), *info[9:])
        return self._info

    def __getitem__(self, path: str) -> Entry:
        fields = self._native.find_entry(path)
        if fields is None:
            raise KeyError(f"there is no entry {path!r} in {self.name}")
        return Entry(self, fields)

    def __contains__(self, path: object) -> bool:
        return isinstance(path, str) and self._native.find_entry(path) is not None

    def __len__(self) -> int:
        native = self._native  # a closed one has no length
        if self._length is None:
            self._length = native.count_found()
        return self._length

    def __iter__(self) -> Iterator[str]:
        found = self._native.next_found(0)
        while found is not None:
            index, path = found
            yield path
            found = self._native.next_found(index + 1)

    # Archives are compared as objects, and not by their contents, as other mappings are.
    def __eq__(self, other: object) -> bool:
        return self is other

    def __hash__(self) -> int:
        return id(self)

    def entries(self) -> Iterator[Entry]:
        """Yield every entry of the directory, also those that are not in the mapping."""
        for index in range(self._native.entry_count()):
            yield _get_entry(self, index)

    def glob(self, pattern: str) -> list[Entry]:
        """Return the entries that a pattern chooses, in the archive's order.

        "*", "?" and "[...]" match anything but "/", "**" matches anything, and "\\" makes the next character stand for
        itself. A pattern that matches a folder also chooses everything below it.
        """
        return [_get_entry(self, index) for index in self._native.match([pattern])]

    def extract(
        self,
        folder: StrPath,
        *,
        patterns: Iterable[str] | None = None,
        exclude: Iterable[str] | None = None,
        threads: int = 0,
        memory: int = 0,
        overwrite: str = "always",
        strip: int = 0,
        keep_broken: bool = False,
        dry_run: bool = False,
        max_bytes: int = 0,
        progress: Callable[[Progress], object] | None = None,
    ) -> Extracted:
        """Write entries below a folder, which is made if it is missing. Nothing is written outside it.

        patterns: which entries to take, as for glob(). Default: all.
        exclude: which of them to leave out.
        threads: at most so many; 0 is one per processor.
        memory: bytes that blocks may take while they are decoded, each twice its size; 0 is half of what is free. With
            too little for all threads, fewer work; entries of a block that is too large even for one fail.
        overwrite: "always" replaces files that are there, "never" leaves them, and "fail" takes them for failures.
        strip: how many leading components each path loses.
        keep_broken: whether the bytes of a damaged file before the damage are written.
        dry_run: whether everything is only read and decoded, and nothing is written.
        max_bytes: of all files together; 0 is no limit.
        progress: called ten times a second. An exception that it raises ends the extraction.

        Raises ExtractionFailed at the end if entries failed or a pattern matches nothing. A disk that is full or can't
        be written ends the extraction with an OSError, and files of more than max_bytes are a LimitExceeded before
        anything is written.
        """
        wanted = _to_list("patterns", patterns)
        summary, failed, unused = self._native.extract(
            folder,
            wanted,
            _to_list("exclude", exclude),
            threads,
            memory,
            _choose("overwrite", overwrite, _OVERWRITE),
            strip,
            keep_broken,
            dry_run,
            max_bytes,
            _wrap_progress(progress),
        )
        from ._records import Extracted

        extracted = Extracted(*summary)
        failures: list[tuple[str, Exception]] = [(_get_entry(self, index).path, error) for index, error in failed]
        failures += [(wanted[index], KeyError("the pattern matches nothing")) for index in unused if wanted]
        if failures:
            raise ExtractionFailed(extracted, failures)
        return extracted

    def test(
        self, *, threads: int = 0, memory: int = 0, progress: Callable[[Progress], object] | None = None
    ) -> TestResult:
        """Decode every block once, and write nothing. Parameters are those of extract().

        The formats hold no checksums, so damage that still decodes is not found.
        """
        from ._records import Damage, TestResult

        summary, entries, blocks = self._native.test(threads, memory, _wrap_progress(progress))
        damaged = []
        for index, readable in entries:
            entry = _get_entry(self, index)
            damaged.append(Damage(entry.path, entry.size, readable))
        return TestResult(summary[0], summary[3], damaged, dict(blocks))

    def __repr__(self) -> str:
        return f"<zarvo.Archive {self.name!r}{' (closed)' if self.closed else ''}>"

    def __reduce__(self) -> tuple[Any, ...]:
        return (_reopen, (self._file, self._options))


def _choose(name: str, word: str, words: tuple[str, ...]) -> int:
    if word not in words:
        raise ValueError(f"{name} is {word!r}, and not one of {', '.join(words)}")
    return words.index(word)


def _to_level(level: int | None) -> int:
    if level is None:
        return -1
    if level < 0:
        raise ValueError(f"level is {level}, and not a number from 0 on")
    return level


def _to_list(name: str, patterns: Iterable[str] | None) -> list[str] | None:
    if isinstance(patterns, str):
        raise TypeError(f"{name} is a list of patterns, and not one str")
    return None if patterns is None else list(patterns)


def _wrap_progress(progress: Callable[[Progress], object] | None) -> Callable[..., object] | None:
    if progress is None:
        return None
    from ._records import Progress

    told = progress
    return lambda *numbers: told(Progress(*numbers))


def open(
    file: StrPath | BinaryIO,
    *,
    offset: int = 0,
    max_entries: int = 0,
    max_directory_bytes: int = 0,
    max_block_bytes: int = 0,
    cache_bytes: int = 0,
) -> Archive:
    """Open an archive, and read its header and directory.

    file: a path, or a binary file object that can seek, which stays open when the archive is closed. Nobody else may
    use the file object meanwhile. Exceptions that it raises come out of the call that reads.
    offset: of the archive's first byte in the file.
    max_entries, max_directory_bytes: limits for the directory, in entries and in decoded bytes; 0 is 2^26 and 2^30.
    max_block_bytes: limit for the decoded bytes of a block that is held in memory whole; 0 is 2^31.
    cache_bytes: what decoded blocks may take between calls, so that the next read need not decode them again; 0 is
        2^23.

    Raises BadArchive when it is no archive, LimitExceeded when it exceeds a limit, and OSError when it can't be read.
    """
    return Archive(
        file,
        offset=offset,
        max_entries=max_entries,
        max_directory_bytes=max_directory_bytes,
        max_block_bytes=max_block_bytes,
        cache_bytes=cache_bytes,
    )


def create(
    file: StrPath,
    folder: StrPath,
    *,
    layout: str = "ZarvoFS",
    compression: str | None = None,
    level: int | None = None,
    streamed: bool = False,
    block_size: int = 0,
    engine_version: str | None = None,
    engine_revision: str | None = None,
    exclude: Iterable[str] | None = None,
    force: bool = False,
    dry_run: bool = False,
    threads: int = 0,
    memory: int = 0,
    progress: Callable[[Progress], object] | None = None,
) -> Created:
    """Make an archive of the files and folders below a folder. The same files and options give the same bytes.

    layout: "ZarvoFS", "ZarvoWeb", "ZarvoRaw" or "ZarvoArchive".
    compression: "none", "lzma", "lz4" or "lz4hc". Default: "lz4hc", or "lzma" if streamed.
    level: 1 to 12 for LZ4HC, 0 to 9 for LZMA.
    streamed: whether blocks are decoded from their start on only, which LZMA and "none" allow.
    block_size: decoded bytes of a block; 0 is 131,072.
    engine_version, engine_revision: what the archive says it is for.
    exclude: patterns of what is left out.
    force: whether an archive that is there is replaced.
    dry_run: whether only folders are read, and nothing is written.
    threads, progress: as for Archive.extract().
    memory: bytes that all threads may take together; 0 is half of what is free.

    Raises CreationFailed if a file can't be read or the layout can't hold it, FileExistsError for an archive that is
    there, and ValueError for options that the layout does not allow. Then, and after an exception of progress, there is
    no new archive.
    """
    files, folders, size, archive_size, left_out, failures = _native.create(
        file,
        folder,
        _to_list("exclude", exclude),
        threads,
        memory,
        _choose("layout", layout, _LAYOUTS),
        -1 if compression is None else _choose("compression", compression, _COMPRESSIONS),
        _to_level(level),
        streamed,
        block_size,
        engine_version,
        engine_revision,
        force,
        dry_run,
        _wrap_progress(progress),
    )
    if failures:
        raise CreationFailed(failures)
    from ._records import Created

    return Created(files, folders, size, archive_size, left_out)
