"""What goes wrong with archives.

Other errors are Python's own: OSError for files and disks, KeyError for paths that an archive does not have, ValueError
for an archive that was closed, MemoryError.
"""

from __future__ import annotations

TYPE_CHECKING = False  # that of typing, which takes long to import
if TYPE_CHECKING:
    from ._records import Extracted


class Error(Exception):
    """An archive can't be used as asked; the base of the other classes."""


class BadArchive(Error):
    """The file is no archive, has an unknown version, or is damaged in its header or directory."""


class DamagedData(BadArchive):
    """Data can't be decoded, ends too early, or lies outside the archive."""


class UnsupportedData(Error, NotImplementedError):
    """The data needs a kind of compression that is not known."""


class LimitExceeded(Error):
    """A limit, given or the library's own, would be exceeded."""


class ArchiveChanged(Error):
    """The archive's file has changed since it was opened."""


class EntryRefused(Error):
    """Extraction refuses the path of an entry, or another entry has its place."""


class _Failures(Error):
    """Several things failed."""

    failures: list[tuple[str, Exception]]

    def __str__(self) -> str:
        path, error = self.failures[0]
        more = f", and {len(self.failures) - 1} more" if len(self.failures) > 1 else ""
        return f"{path}: {error}{more}"


class CreationFailed(_Failures):
    """Files could not be put into an archive, so none was made.

    failures: path and exception for each of them.
    """

    def __init__(self, failures: list[tuple[str, Exception]]) -> None:
        super().__init__(failures)
        self.failures = failures


class ExtractionFailed(_Failures):
    """Some entries were not extracted, all others were.

    extracted: what was extracted.
    failures: path and exception for each entry that was not, pattern and exception for each that matches nothing.
    """

    def __init__(self, extracted: Extracted, failures: list[tuple[str, Exception]]) -> None:
        super().__init__(extracted, failures)
        self.extracted = extracted
        self.failures = failures
