from collections.abc import Callable
from os import PathLike

version: str

_Info = tuple[int, int, str, str, int, int, int, int, tuple[int, int, int, int, int, int, int, int], int, int, int, int]
# Number, path, kind, size, offset, flags.
EntryFields = tuple[int, str, str, int, int, int]
_Summary = tuple[int, int, int, int]
# Offset, max_entries, max_directory_bytes, max_block_bytes, cache_bytes; a zero asks for the default.
OpenOptions = tuple[int, int, int, int, int]
_Progress = Callable[[int, int, int, int], object]

class Archive:
    def info(self) -> _Info: ...
    def data_size(self) -> int: ...
    def entry_count(self) -> int: ...
    def entry(self, index: int, /) -> EntryFields: ...
    def find(self, path: str, /) -> int | None: ...
    def find_entry(self, path: str, /) -> EntryFields | None: ...
    def count_found(self) -> int: ...
    def next_found(self, index: int, /) -> tuple[int, str] | None: ...
    def kind(self, item: int, /) -> str: ...
    def children(self, item: int, /) -> list[tuple[int, str, str, int]]: ...
    def match(self, patterns: list[str], /) -> list[int]: ...
    def read(self, index: int, offset: int, size: int, /) -> bytes: ...
    def open_stream(self, index: int, /) -> Stream: ...
    def extract(
        self,
        folder: str | bytes | PathLike[str] | PathLike[bytes],
        patterns: list[str] | None,
        exclude: list[str] | None,
        threads: int,
        memory: int,
        overwrite: int,
        strip: int,
        keep_broken: bool,
        dry_run: bool,
        max_bytes: int,
        progress: _Progress | None,
        /,
    ) -> tuple[_Summary, list[tuple[int, Exception]], list[int]]: ...
    def test(
        self, threads: int, memory: int, progress: _Progress | None, /
    ) -> tuple[_Summary, list[tuple[int, int]], list[tuple[int, str]]]: ...

class Stream:
    def readinto(self, buffer: bytearray | memoryview, /) -> int: ...
    def read(self, size: int, /) -> bytes: ...
    def seek(self, position: int, /) -> None: ...

def create(
    path: str | bytes | PathLike[str] | PathLike[bytes],
    folder: str | bytes | PathLike[str] | PathLike[bytes],
    exclude: list[str] | None,
    threads: int,
    memory: int,
    layout: int,
    compression: int,
    level: int,
    streamed: bool,
    block_size: int,
    engine_version: str | None,
    engine_revision: str | None,
    force: bool,
    dry_run: bool,
    progress: _Progress | None,
    /,
) -> tuple[int, int, int, int, list[tuple[str, str]], list[tuple[str, Exception]]]: ...
def open_path(
    path: str | bytes | PathLike[str] | PathLike[bytes], name: str, options: OpenOptions, /
) -> Archive: ...
def open_descriptor(descriptor: int, name: str, options: OpenOptions, /) -> Archive: ...
def open_source(
    read_at: Callable[[int, int], bytes], size: int, name: str, options: OpenOptions, /
) -> Archive: ...
