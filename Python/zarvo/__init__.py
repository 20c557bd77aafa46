"""Reads and makes archives of the Zarvo engine's formats.

    import zarvo

    with zarvo.open("game.zarvo") as archive:
        print(len(archive), archive.info.layout)
        text = archive["road/of/one.txt"].read()
        archive.extract("out", patterns=["tables/*.csv"])

An archive is a mapping of paths to entries, and an entry opens as a binary file. zarvo.Path walks through an archive as
pathlib does through folders. With fsspec installed, "zarvo://inside.csv::game.zarvo" is a URL that pandas and others
read.

Any number of threads may use one archive. All calls let other threads run while the library works.
"""

from ._archive import Archive, Entry, create, open
from ._errors import (
    ArchiveChanged,
    BadArchive,
    CreationFailed,
    DamagedData,
    EntryRefused,
    Error,
    ExtractionFailed,
    LimitExceeded,
    UnsupportedData,
)
from ._native import version as __version__

TYPE_CHECKING = False  # that of typing, which takes long to import
if TYPE_CHECKING:
    from ._path import Path
    from ._records import Blocks, Created, Damage, Extracted, Info, Progress, TestResult

__all__ = [
    "Archive",
    "ArchiveChanged",
    "BadArchive",
    "Blocks",
    "Created",
    "CreationFailed",
    "Damage",
    "DamagedData",
    "Entry",
    "EntryRefused",
    "Error",
    "Extracted",
    "ExtractionFailed",
    "Info",
    "LimitExceeded",
    "Path",
    "Progress",
    "TestResult",
    "UnsupportedData",
    "create",
    "open",
]


if not TYPE_CHECKING:

    def __getattr__(name: str) -> object:
        """Import what many scripts don't use when it is first asked for."""
        if name not in __all__:
            raise AttributeError(f"module {__name__!r} has no attribute {name!r}")
        from . import _path, _records

        found = _path.Path if name == "Path" else getattr(_records, name)
        found.__module__ = __name__
        globals()[name] = found
        return found

    def __dir__() -> list[str]:
        return sorted({*globals(), *__all__})


# In messages and in help(), they are called what users call them.
for _name in __all__:
    if _name in globals():
        globals()[_name].__module__ = __name__
