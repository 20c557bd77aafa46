"""Folders and files of an archive, walked through as pathlib does."""

from __future__ import annotations

import fnmatch
import io
import os
import pathlib

from ._archive import Archive, Entry, _get_entry

TYPE_CHECKING = False  # that of typing, which takes long to import
if TYPE_CHECKING:
    from collections.abc import Iterator
    from typing import IO, Any, BinaryIO

    from ._archive import StrPath


class Path:
    """A place in an archive, with the part of pathlib's interface that zipfile.Path has in Python 3.11, and glob().

    Folders that no entry names, but that the paths of entries imply, are there, too.

        root = zarvo.Path("game.zarvo")
        for path in (root / "tables").iterdir():
            print(path.name, len(path.read_bytes()))
    """

    __slots__ = {
        "root": "The archive.",
        "at": 'The place in it, without "/" at its ends; "" is the archive\'s root.',
        "_item": "The number of what is there, once it is known.",
    }

    root: Archive
    at: str
    _item: int | None

    def __init__(self, root: Archive | StrPath | BinaryIO, at: str = "") -> None:
        self.root = root if isinstance(root, Archive) else Archive(root)
        self.at = "/".join(part for part in at.replace("\\", "/").split("/") if part not in ("", "."))
        self._item = None

    def _find(self) -> int | None:
        if self._item is None:
            self._item = self.root._native.find(self.at)
        return self._item

    def _kind(self) -> str | None:
        item = self._find()
        return None if item is None else self.root._native.kind(item)

    @property
    def _pure(self) -> pathlib.PurePosixPath:
        return pathlib.PurePosixPath(self.at) if self.at else pathlib.PurePosixPath(self.root.name)

    @property
    def name(self) -> str:
        """The last component; of the root, the archive's."""
        return self._pure.name

    @property
    def stem(self) -> str:
        """The name without its suffix."""
        return self._pure.stem

    @property
    def suffix(self) -> str:
        """The name's last part from a "." on."""
        return self._pure.suffix

    @property
    def suffixes(self) -> list[str]:
        """All suffixes of the name."""
        return self._pure.suffixes

    @property
    def filename(self) -> pathlib.Path:
        """The archive's path and the place in it, joined."""
        return pathlib.Path(self.root.name) / self.at

    @property
    def parent(self) -> Path:
        """The folder that it is in; of the root, the root."""
        return Path(self.root, self.at.rpartition("/")[0])

    def joinpath(self, *others: StrPath) -> Path:
        """Return the place that others lead to from here."""
        return Path(self.root, "/".join((self.at, *(os.fspath(other) for other in others))))

    def __truediv__(self, other: StrPath) -> Path:
        return self.joinpath(other)

    def exists(self) -> bool:
        """Whether there is a file or a folder."""
        return self._find() is not None

    def is_dir(self) -> bool:
        """Whether there is a folder."""
        return self._kind() == "folder"

    def is_file(self) -> bool:
        """Whether there is a file."""
        return self._kind() == "file"

    def iterdir(self) -> Iterator[Path]:
        """Yield what the folder holds, in the archive's order."""
        folder = self._find()
        if folder is None:
            raise FileNotFoundError(f"{self} is not there")
        if not self.is_dir():
            raise NotADirectoryError(f"{self} is not a folder")
        for item, name, _, _ in self.root._native.children(folder):
            child = self.joinpath(name)
            child._item = item
            yield child

    def glob(self, pattern: str) -> Iterator[Path]:
        """Yield what a pattern matches below here, as pathlib does: what a folder holds only if it matches itself.

        "*", "?" and "[...]" match within one component, and the component "**" stands for any number of folders. A
        pattern that ends with "/" matches only folders.
        """
        parts = pathlib.PurePosixPath(pattern).parts
        if not parts or pattern.startswith("/"):
            raise ValueError(f"{pattern!r} is not a relative pattern")
        found = dict.fromkeys(self._select(parts))
        return (path for path in found if not pattern.endswith("/") or path.is_dir())

    def rglob(self, pattern: str) -> Iterator[Path]:
        """Yield what glob() does with "**/" in front of the pattern."""
        return self.glob("**/" + pattern)

    def _select(self, parts: tuple[str, ...]) -> Iterator[Path]:
        left = [(self, parts)]  # the next one last: archives hold folders deeper than calls may be
        while left:
            path, parts = left.pop()
            if not parts:
                yield path
            elif path.is_dir():
                children = list(path.iterdir())
                if parts[0] == "**":
                    left += [(child, parts) for child in reversed(children)]
                    left.append((path, parts[1:]))
                else:
                    matches = [child for child in children if fnmatch.fnmatchcase(child.name, parts[0])]
                    left += [(child, parts[1:]) for child in reversed(matches)]

    def open(self, mode: str = "r", *args: Any, **kwargs: Any) -> IO[Any]:
        """Open the file: mode "r" for text, with the arguments of io.TextIOWrapper, or "rb" for bytes."""
        if mode not in ("r", "rt", "rb"):
            raise ValueError(f"mode is {mode!r}; archives can only be read")
        file = self._entry().open()
        if mode != "rb":
            return io.TextIOWrapper(file, *args, **kwargs)
        if args or kwargs:
            file.close()
            raise ValueError("a binary file takes no encoding")
        return file

    def read_bytes(self) -> bytes:
        """Return the file's bytes."""
        return self._entry().read()

    def read_text(self, *args: Any, **kwargs: Any) -> str:
        """Return the file's text, with the arguments of io.TextIOWrapper."""
        with io.TextIOWrapper(self._entry().open(), *args, **kwargs) as file:
            return file.read()

    def _entry(self) -> Entry:
        item = self._find()
        if item is None:
            raise FileNotFoundError(f"{self} is not there")
        if self.is_dir():
            raise IsADirectoryError(f"{self} is a folder")
        return _get_entry(self.root, item)

    def __str__(self) -> str:
        return f"{self.root.name}/{self.at}"

    def __repr__(self) -> str:
        return f"zarvo.Path({self.root.name!r}, {self.at!r})"

    def __eq__(self, other: object) -> bool:
        return isinstance(other, Path) and other.root is self.root and other.at == self.at

    def __hash__(self) -> int:
        return hash((self.root, self.at))

    def __reduce__(self) -> tuple[Any, ...]:
        return (Path, (self.root, self.at))
