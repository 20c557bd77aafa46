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

from ._archive import (
    Archive,
    Blocks,
    Created,
    Damage,
    Entry,
    Extracted,
    Info,
    Progress,
    TestResult,
    create,
    open,
)
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
from ._path import Path

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

# In messages and in help(), they are called what users call them.
for _name in __all__:
    globals()[_name].__module__ = __name__
