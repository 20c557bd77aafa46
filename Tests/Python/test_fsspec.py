"""Archives as an fsspec file system."""

import importlib.metadata
import io
import os
import pickle
import struct
import unittest
import zipfile

import fsspec
from fsspec.spec import AbstractBufferedFile

import zarvo
from archives import FOLDER, LZMA, TEXT, ArchiveTest, build, make_text

TREE = [
    ("readme.txt", b"first\n"),
    ("tables", FOLDER),
    ("tables/one.csv", TEXT),
    ("tables/two.csv", TEXT[1:]),
    ("road/of/one.txt", b"on the way\n"),
    ("empty", b""),
]


class Elsewhere(fsspec.AbstractFileSystem):
    """Files of this machine as if they were on another one: counts the bytes that are asked for."""

    protocol = "elsewhere"
    fetched: list[int] = []

    def info(self, path, **kwargs):
        path = self._strip_protocol(path)
        return {"name": path, "size": os.stat(path).st_size, "type": "file"}

    def _open(self, path, mode="rb", block_size=None, cache_options=None, **kwargs):
        return self.File(self, path, mode, block_size, cache_options=cache_options, **kwargs)

    class File(AbstractBufferedFile):
        def _fetch_range(self, start, end):
            Elsewhere.fetched.append(end - start)
            with open(self.path, "rb") as file:
                file.seek(start)
                return file.read(end - start)


fsspec.register_implementation("elsewhere", Elsewhere, clobber=True)


class FileSystem(ArchiveTest):
    def setUp(self):
        super().setUp()
        self.path = self.write(TREE, kind=LZMA)
        self.fs = fsspec.filesystem("zarvo", fo=str(self.path))

    def test_is_found_by_its_protocol(self):
        (found,) = importlib.metadata.entry_points(group="fsspec.specs", name="zarvo")
        self.assertIs(type(self.fs), found.load())
        for url in (f"zarvo://tables/one.csv::{self.path}", f"zarvo://tables/one.csv::file://{self.path}"):
            with fsspec.open(url) as file:
                self.assertEqual(TEXT, file.read())
        with fsspec.open(f"zarvo://readme.txt::{self.path}", "rt") as file:
            self.assertEqual("first\n", file.read())
        self.assertEqual(2, len(fsspec.open_files(f"zarvo://tables/*.csv::{self.path}")))

    def test_shows_what_that_of_zip_files_shows(self):
        with zipfile.ZipFile(self.path.with_suffix(".zip"), "w") as written:
            for path, content in TREE:
                written.writestr(path + "/" if content is FOLDER else path, content or b"")
        theirs = fsspec.filesystem("zip", fo=str(self.path.with_suffix(".zip")))
        for name, argument in (
            ("find", ""),
            ("find", "tables"),
            ("glob", "**/*.csv"),
            ("glob", "road/*/*"),
            ("isdir", "road/of"),
            ("isfile", "road/of"),
            ("exists", "tables/none"),
            ("cat", "tables/one.csv"),
            ("size", "tables/one.csv"),
            ("head", "tables/one.csv"),
            ("tail", "tables/one.csv"),
            ("du", ""),
        ):
            expected = getattr(theirs, name)(argument)
            self.assertEqual(expected, getattr(self.fs, name)(argument), f"{name}({argument!r})")
        self.assertEqual(["readme.txt", "tables", "road", "empty"], self.fs.ls("", detail=False))
        self.assertEqual([{"name": "road/of", "size": 0, "type": "directory"}], self.fs.ls("zarvo://road/"))
        self.assertEqual([{"name": "empty", "size": 0, "type": "file"}], self.fs.ls("/empty"))

    def test_reads_ranges(self):
        ranges = [(0, 5), (5, None), (None, 9), (-7, None), (100_000, 200_000), (-9, -3), (299_999, 400_000), (7, 3)]
        self.assertEqual(
            [TEXT[start:end] for start, end in ranges],
            self.fs.cat_ranges(
                ["tables/one.csv"] * len(ranges), [start for start, _ in ranges], [end for _, end in ranges]
            ),
        )

    def test_ranges_of_impossible_sizes_are_damaged(self):
        for size in (1 << 40, (1 << 64) - 1):
            data = build([("one", b"123")]).replace(struct.pack(">QQ", 0, 3), struct.pack(">QQ", 0, size))
            fs = fsspec.filesystem("zarvo", fo=io.BytesIO(data))
            self.assertEqual(b"12", fs.cat_file("one", end=2))
            for start in (0, 1 << 30, -2):
                with self.assertRaises(zarvo.DamagedData, msg=f"{size}, {start}"):
                    fs.cat_file("one", start=start)

    def test_does_not_move_others_in_a_file_in_memory(self):
        memory = fsspec.filesystem("memory")
        memory.pipe("/a.zarvo", self.path.read_bytes())
        self.addCleanup(memory.rm, "/a.zarvo")
        fs = fsspec.filesystem("zarvo", fo="memory://a.zarvo")
        other = memory.open("/a.zarvo")
        other.seek(7)
        self.assertEqual(TEXT, fs.cat("tables/one.csv"))
        self.assertEqual(7, other.tell())

    def test_raises_as_others_do(self):
        for use, error in (
            (lambda: self.fs.info("none"), FileNotFoundError),
            (lambda: self.fs.ls("none"), FileNotFoundError),
            (lambda: self.fs.open("none"), FileNotFoundError),
            (lambda: self.fs.cat_file("tables"), IsADirectoryError),
            (lambda: self.fs.open("empty", "wb"), ValueError),
            (lambda: fsspec.filesystem("zarvo", fo=__file__), zarvo.BadArchive),
            (lambda: fsspec.filesystem("zarvo"), TypeError),
            (lambda: fsspec.filesystem("zarvo", fo=str(self.path) + "x"), FileNotFoundError),
        ):
            with self.assertRaises(error):
                use()

    def test_lists_archives_elsewhere_by_their_directory(self):
        entries = [(f"{folder}/{number}", make_text(20_000, number)) for folder in "abc" for number in range(100)]
        self.path.write_bytes(build(entries))
        directory = self.path.stat().st_size - sum(len(content) for _, content in entries)
        Elsewhere.fetched.clear()
        there = fsspec.filesystem("zarvo", fo=f"elsewhere://{self.path}")
        self.assertEqual(300, len(there.find("")))
        self.assertEqual([f"b/{number}" for number in range(100)], there.ls("b", detail=False))
        block = 1 << 18
        self.assertLessEqual(sum(Elsewhere.fetched), directory + block)
        before = sum(Elsewhere.fetched)
        with fsspec.open(f"zarvo://a/7::elsewhere://{self.path}") as file:
            self.assertEqual(entries[7][1], file.read())
        self.assertGreater(sum(Elsewhere.fetched), before)
        before = sum(Elsewhere.fetched)
        self.assertEqual(entries[250][1], there.cat("c/50"))
        self.assertLessEqual(sum(Elsewhere.fetched) - before, (1 << 16) * 2 + block)

    def test_gives_options_to_the_archive(self):
        archive = self.path.read_bytes()
        self.path.write_bytes(b"front" + archive)
        for fo in (str(self.path), f"elsewhere://{self.path}", io.BytesIO(b"front" + archive)):
            fs = fsspec.filesystem("zarvo", fo=fo, archive_options={"offset": 5})
            self.assertEqual(TEXT, fs.cat("tables/one.csv"), fo)
        with self.assertRaises(zarvo.LimitExceeded):
            fsspec.filesystem("zarvo", fo=str(self.path), archive_options={"offset": 5, "max_entries": 3})

    def test_can_be_pickled_and_made_of_file_objects(self):
        there = fsspec.filesystem("zarvo", fo=f"elsewhere://{self.path}")
        for made in (self.fs, there, fsspec.filesystem("zarvo", fo=io.BytesIO(self.path.read_bytes()))):
            self.assertEqual(TEXT, made.cat("tables/one.csv"))
            if made is self.fs or made is there:
                self.assertEqual(TEXT, pickle.loads(pickle.dumps(made)).cat("tables/one.csv"))


if __name__ == "__main__":
    unittest.main()
