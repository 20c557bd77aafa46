"""Archives for whatever speaks fsspec, under the protocol "zarvo"."""

from __future__ import annotations

import io
from typing import Any

import fsspec  # type: ignore[import]
from fsspec.implementations.local import LocalFileSystem  # type: ignore[import]

from ._archive import Archive, Entry, _get_entry

# The library asks for pieces of 16 KiB of the directory, and for one block of data at a time. Reading so much more at
# once saves requests.
_READ_AHEAD = 1 << 18


class ZarvoFileSystem(fsspec.AbstractFileSystem):  # type: ignore[misc]
    """The files and folders of an archive, read only.

        fsspec.open("zarvo://inside.csv::game.zarvo")
        fsspec.filesystem("zarvo", fo="https://example.org/game.zarvo").ls("")

    The archive may be wherever fsspec reads files. Opening it reads its header and directory, and no more. It is closed
    when the file system, and all files that were opened from it, are no longer used.
    """

    protocol = "zarvo"
    root_marker = ""
    cachable = False  # the archive is open as long as this object lives

    def __init__(
        self,
        fo: Any,
        target_protocol: str | None = None,
        target_options: dict[str, Any] | None = None,
        archive_options: dict[str, Any] | None = None,
        **kwargs: Any,
    ) -> None:
        """
        fo: the archive: a URL or a path, or a binary file object that can seek.
        target_protocol: of the URL, if it does not begin with it.
        target_options: what the archive's own file system is made with.
        archive_options: what zarvo.open is called with: the offset, and limits.
        """
        super().__init__(**kwargs)
        options = archive_options or {}
        if not isinstance(fo, str):
            self.archive = Archive(fo, **options)
            return
        there = fsspec.open(fo, "rb", protocol=target_protocol, **(target_options or {}))
        if isinstance(there.fs, LocalFileSystem):
            self.archive = Archive(there.path, **options)
            return
        file = there.fs.open(there.path, "rb", block_size=_READ_AHEAD, cache_type="readahead")
        # The file system "memory" gives the same object, with one position, to everybody who opens the file.
        self.archive = Archive(io.BytesIO(file.getvalue()) if isinstance(file, io.BytesIO) else file, **options)

    @classmethod
    def _strip_protocol(cls, path: Any) -> Any:
        if isinstance(path, list):
            return [cls._strip_protocol(each) for each in path]
        return super()._strip_protocol(path).lstrip("/")

    def _find(self, path: str) -> int:
        item = self.archive._native.find(path)
        if item is None:
            raise FileNotFoundError(f"{path} is not in {self.archive.name}")
        return item

    def _entry(self, path: str) -> Entry:
        item = self._find(path)
        if self.archive._native.kind(item) == "folder":
            raise IsADirectoryError(f"{path} is a folder of {self.archive.name}")
        return _get_entry(self.archive, item)

    def info(self, path: str, **kwargs: Any) -> dict[str, Any]:
        path = self._strip_protocol(path)
        item = self._find(path)
        if self.archive._native.kind(item) == "folder":
            return {"name": path, "size": 0, "type": "directory"}
        return {"name": path, "size": _get_entry(self.archive, item).size, "type": "file"}

    def ls(self, path: str, detail: bool = True, **kwargs: Any) -> list[Any]:
        path = self._strip_protocol(path)
        info = self.info(path)
        found = [info]
        if info["type"] == "directory":
            front = path + "/" if path else ""
            found = [
                {"name": front + name, "size": size, "type": "directory" if kind == "folder" else "file"}
                for _, name, kind, size in self.archive._native.children(self._find(path))
            ]
        return found if detail else [each["name"] for each in found]

    def _open(self, path: str, mode: str = "rb", **kwargs: Any) -> io.BufferedReader:
        if mode != "rb":
            raise ValueError(f"mode is {mode!r}; archives can only be read")
        entry = self._entry(path)
        file = entry.open()
        setattr(file, "size", entry.size)  # as the files of other file systems have it
        return file

    def cat_file(self, path: str, start: int | None = None, end: int | None = None, **kwargs: Any) -> bytes:
        entry = self._entry(self._strip_protocol(path))
        if start is None and end is None:
            return entry.read()
        first, last, _ = slice(start, end).indices(entry.size)
        return entry._read_range(first, max(first, last))
