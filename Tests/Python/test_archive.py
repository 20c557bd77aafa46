"""Archives as mappings, and their entries as files."""

import errno
import gzip
import io
import os
import pathlib
import pickle
import random
import struct
import subprocess
import sys
import tempfile
import unittest
import zipfile

import zarvo
from archives import FOLDER, LZMA, ROAD, TEXT, TREE, UNKNOWN, ArchiveTest, build, make_text


class Mapping(ArchiveTest):
    def test_holds_entries_in_order(self):
        archive = self.open(TREE)
        self.assertEqual([path for path, _ in TREE], list(archive))
        self.assertEqual(len(TREE), len(archive))
        self.assertEqual(
            [("folder" if content is FOLDER else "file", len(content or b"")) for _, content in TREE],
            [(entry.kind, entry.size) for entry in archive.values()],
        )

    def test_last_of_equal_paths_counts(self):
        archive = self.open([("a", b"1"), ("b", b"2"), ("./a", b"3")])
        self.assertEqual({"b": b"2", "./a": b"3"}, {path: entry.read() for path, entry in archive.items()})
        self.assertEqual(2, len(archive))
        self.assertEqual(b"3", archive["a"].read())
        self.assertEqual(["a", "b", "./a"], [entry.path for entry in archive.entries()])

    def test_has_only_what_extraction_takes(self):
        archive = self.open([("../up", b"1"), ("a", b"2")])
        self.assertEqual(["a"], list(archive))
        self.assertEqual([b"1", b"2"], [entry.read() for entry in archive.entries()])

    def test_looks_up_any_form_of_a_path(self):
        archive = self.open(TREE)
        for path in ("road/of/one.txt", "/road//of/./one.txt", "road\\of\\one.txt"):
            self.assertIn(path, archive)
            self.assertEqual("road/of/one.txt", archive[path].path)
        for path in ("road", "", "road/of/one.tx", "a\0b", "\ud800", 7):
            self.assertNotIn(path, archive)
        with self.assertRaisesRegex(KeyError, "there is no entry 'road' in .*a.zarvo"):
            archive["road"]
        with self.assertRaisesRegex(TypeError, "expected a str, not 7"):
            archive[7]

    def test_keeps_bytes_that_are_not_text(self):
        data = bytearray(build([("aXb", b"1")]))
        data[data.index(b"aXb") + 1] = 0xFF
        archive = zarvo.open(io.BytesIO(data))
        self.assertEqual(["a\udcffb"], list(archive))
        self.assertEqual(b"1", archive["a\udcffb"].read())
        archive.extract(self.folder / "out")
        self.assertEqual([b"a\xffb"], os.listdir(bytes(self.folder / "out")))

    def test_glob_chooses_what_extraction_would(self):
        archive = self.open(TREE)
        for pattern, paths in {
            "**/*.txt": ["readme.txt", "road/of/one.txt"],
            "tables": ["tables", "tables/one.csv"],
            "nothing*": [],
        }.items():
            self.assertEqual(paths, [entry.path for entry in archive.glob(pattern)], pattern)

    def test_tells_what_it_is(self):
        with zarvo.open(ROAD) as archive:
            info = archive.info
        self.assertEqual(("ZarvoFS", 8, "5.x.x", "7041.3.0b12"), info[:4])
        self.assertEqual(zarvo.Blocks(5, 16384, 0, none=0, lzma=0, lz4=0, lz4hc=5, unknown=0), info.blocks)
        self.assertEqual((ROAD.stat().st_size, 6, 4, 2, 78354), (info.file_size, *info[9:]))

    def test_can_begin_anywhere_in_a_file(self):
        path = self.folder / "front"
        path.write_bytes(b"front" + build(TREE))
        with open(path, "rb") as file:
            for source in (path, file, io.BytesIO(path.read_bytes())):
                self.assertEqual(TEXT, zarvo.open(source, offset=5)["tables/one.csv"].read())


class Files(ArchiveTest):
    def test_behave_as_other_binary_files(self):
        for form in ({}, {"kind": LZMA}, {"kind": LZMA, "streamed": True, "block_size": 1 << 18}):
            file = self.open([("before", b"xyz"), ("text", TEXT)], **form)["text"].open()
            twin = io.BytesIO(TEXT)
            chosen = random.Random(7)
            for step in range(300):
                name, arguments = chosen.choice(
                    [
                        ("read", (chosen.choice([0, 1, 100, 70_000, 150_000]),)),
                        ("seek", (chosen.randrange(310_000), os.SEEK_SET)),
                        ("seek", (-chosen.randrange(300_000), os.SEEK_END)),
                        ("seek", (-file.tell() // 2, os.SEEK_CUR)),
                        ("readline", ()),
                        ("tell", ()),
                        ("read", ()),
                    ]
                )
                expected = getattr(twin, name)(*arguments)
                self.assertEqual(expected, getattr(file, name)(*arguments), f"{form}, step {step}: {name}{arguments}")
            file.close()
            with self.assertRaises(ValueError):
                file.read(1)

    def test_larger_than_one_read_are_whole(self):
        large = b"0123456789abcdef" * (3 << 20)
        archive = self.open([("large", large)], block_size=1 << 22)
        self.assertEqual(large, archive["large"].read())

    def test_refuse_what_makes_no_sense(self):
        archive = self.open(TREE)
        with self.assertRaises(IsADirectoryError):
            archive["tables"].read()
        file = archive["empty"].open()
        for offset, whence in ((-1, os.SEEK_SET), (-1, os.SEEK_CUR), (0, 9)):
            with self.assertRaises(ValueError):
                file.raw.seek(offset, whence)
        self.assertEqual((True, True, False), (file.readable(), file.seekable(), file.writable()))

    def test_deliver_what_lies_before_damage(self):
        archive = self.open([("text", TEXT)], kind=LZMA, damage=[1])
        file = archive["text"].open()
        self.assertEqual(TEXT[: 1 << 16], file.read(1 << 16))
        for read in (file.read, archive["text"].read):
            with self.assertRaisesRegex(zarvo.DamagedData, "a.zarvo: text: "):
                read()

    def test_stay_where_they_are_when_a_read_fails(self):
        data = make_text(20 << 20)  # more than is read at a time
        file = self.open([("text", data)], kind=LZMA, block_size=1 << 20, damage=[19])["text"].open()
        with self.assertRaises(zarvo.DamagedData):
            file.read()
        self.assertEqual((0, data[:20]), (file.tell(), file.read(20)))

    def test_of_impossible_sizes_are_damaged(self):
        for size in (1 << 40, (1 << 63) + 1, (1 << 64) - 1):
            data = build([("one", b"123")]).replace(struct.pack(">QQ", 0, 3), struct.pack(">QQ", 0, size))
            entry = zarvo.open(io.BytesIO(data))["one"]
            self.assertEqual(size, entry.size)
            self.assertEqual(b"123", entry.open().read(3))
            at_end = entry.open().detach()
            at_end.seek(-5, os.SEEK_END)
            for read in (entry.read, entry.open().read, at_end.readall):
                with self.assertRaises(zarvo.DamagedData):
                    read()


class Errors(ArchiveTest):
    def test_are_those_of_python_and_of_archives(self):
        (self.folder / "text").write_text("no archive")
        (self.folder / "cut.zarvo").write_bytes(build(TREE)[:100])
        os.mkfifo(self.folder / "pipe")
        for name, error in {
            "missing": FileNotFoundError,
            "text/a": NotADirectoryError,
            ".": IsADirectoryError,
            "pipe": OSError,
            "text": zarvo.BadArchive,
            "cut.zarvo": zarvo.BadArchive,
        }.items():
            with self.assertRaises(error) as caught:
                zarvo.open(self.folder / name)
            self.assertIn(str(self.folder / name), str(caught.exception))
        with self.assertRaises(zarvo.UnsupportedData):
            self.open([("a", b"1")], kind=UNKNOWN)["a"].read()
        self.assertTrue(issubclass(zarvo.UnsupportedData, NotImplementedError))

    def test_tell_what_can_be_an_archive(self):
        for file, name in ((build(TREE), "bytes"), (7, "int"), (None, "NoneType")):
            with self.assertRaisesRegex(TypeError, f"a path or a binary file object that can seek, and not {name}"):
                zarvo.open(file)

    def test_after_close_are_value_errors(self):
        archive = self.open(TREE)
        entry = archive["readme.txt"]
        archive.close()
        archive.close()
        self.assertTrue(archive.closed)
        for use in (
            lambda: archive["readme.txt"],
            lambda: list(archive),
            lambda: len(archive),
            lambda: "x" in archive,
            lambda: archive.glob("*"),
            lambda: archive.extract(self.folder / "out"),
            lambda: archive.test(),
            lambda: archive.__enter__(),
            lambda: archive.info,
            lambda: (zarvo.Path(archive) / "readme.txt").exists(),
            entry.read,
            entry.open,
        ):
            with self.assertRaisesRegex(ValueError, "the archive is closed"):
                use()
        self.assertEqual("readme.txt", entry.path)

    def test_tell_that_the_file_has_changed(self):
        archive = self.open(TREE)
        with open(self.folder / "a.zarvo", "ab") as file:
            file.write(b"more")
        with self.assertRaises(zarvo.ArchiveChanged):
            archive["tables/one.csv"].read()


class Limits(ArchiveTest):
    def test_are_kept_by_every_way_to_open(self):
        for options, message in (
            ({"max_entries": 5}, r"6 entries; the limit \(max_entries\) is 5"),
            ({"max_directory_bytes": 100}, r"the limit \(max_directory_bytes\) is 100"),
        ):
            with open(ROAD, "rb") as file:
                for source in (ROAD, file, io.BytesIO(ROAD.read_bytes())):
                    with self.assertRaisesRegex(zarvo.LimitExceeded, message, msg=source):
                        zarvo.open(source, **options)
        zarvo.open(ROAD, max_entries=6).close()
        with self.assertRaises(ValueError):
            zarvo.open(ROAD, max_entries=-1)

    def test_of_blocks_are_kept_by_reads(self):
        archive = zarvo.open(ROAD, max_block_bytes=16383)
        for limited in (archive, pickle.loads(pickle.dumps(archive))):
            with self.assertRaisesRegex(zarvo.LimitExceeded, "block 0 of 16384 bytes is too large"):
                limited["readme.txt"].read()
        self.assertEqual(47, len(zarvo.open(ROAD, max_block_bytes=16384)["readme.txt"].read()))

    def test_of_the_cache_make_reads_decode_again(self):
        for options, is_read_again in (({}, False), ({"cache_bytes": 1}, True)):
            file = FlakyFile(ROAD.read_bytes())
            archive = zarvo.open(file, **options)
            archive["readme.txt"].read()
            archive["road/of/one/file.txt"].read()  # of the last block
            before = file.left
            archive["readme.txt"].read()
            self.assertEqual(is_read_again, file.left < before, options)


class FlakyFile(io.BytesIO):
    """Fails after so many reads, with an exception of the test's choice."""

    left = 1 << 30
    error: BaseException = OSError(errno.ECONNRESET, "gone")

    def read(self, size=-1):
        self.left -= 1
        if self.left < 0:
            raise self.error
        return super().read(size)


class FileObjects(ArchiveTest):
    def test_deliver_the_archive(self):
        path = self.write(TREE, kind=LZMA)
        packed = self.folder / "a.gz"
        packed.write_bytes(gzip.compress(path.read_bytes()))
        with open(path, "rb") as plain, open(path, "rb", buffering=0) as raw, gzip.open(packed) as unpacked:
            for file in (plain, raw, unpacked, io.BytesIO(path.read_bytes())):
                with zarvo.open(file) as archive:
                    self.assertEqual(TEXT, archive["tables/one.csv"].read(), file)
                    self.assertEqual([], archive.test().damaged, file)
                self.assertFalse(file.closed)

    def test_deliver_what_is_not_in_the_file_yet(self):
        with tempfile.TemporaryFile() as file:
            file.write(build([("one", b"1")]))
            self.assertEqual(b"1", zarvo.open(file)["one"].read())

    def test_raise_their_exceptions_from_the_call(self):
        file = FlakyFile(build([("one", TEXT), ("two", b"2")]))
        archive = zarvo.open(file)
        out = self.folder / "out"
        for error in (OSError(errno.ECONNRESET, "gone"), LookupError("mine"), KeyboardInterrupt()):
            file.error = error
            for use in (archive["one"].read, archive["one"].open().read, archive.test, lambda: archive.extract(out)):
                file.left = 0
                with self.assertRaises(type(error)) as caught:
                    use()
                self.assertIs(error, caught.exception)
                file.left = 1 << 30
                self.assertEqual(TEXT, archive["one"].read())
        file.left, file.error = 2, LookupError("while it is opened")
        with self.assertRaises(LookupError):
            zarvo.open(file)

    def test_that_deliver_nonsense_do_no_harm(self):
        for answer, error in (
            (lambda size: bytes(size + 1), OSError),
            (lambda size: "text", TypeError),
            (lambda size: None, TypeError),
            (lambda size: b"", zarvo.DamagedData),
        ):

            class Turned(io.BytesIO):
                turned = False

                def read(self, size=-1):
                    return answer(size) if self.turned else super().read(size)

            turned = Turned(build([("one", TEXT)]))
            archive = zarvo.open(turned)
            turned.turned = True
            with self.assertRaises(error):
                archive["one"].read()


class Paths(ArchiveTest):
    @staticmethod
    def walk(path):
        """What code for zip files sees of a tree."""
        seen = [(path.name, path.suffix, path.is_dir(), path.is_file(), path.exists())]
        if path.is_dir():
            for child in sorted(path.iterdir(), key=lambda each: each.name):
                seen += Paths.walk(child)
                assert child.parent.name == path.name
        else:
            seen.append((path.read_bytes(), path.open("rb").readline()))
        return seen

    def test_show_what_zipfile_shows(self):
        twin = self.folder / "twin.zip"
        with zipfile.ZipFile(twin, "w") as written:
            for path, content in TREE:
                written.writestr(path + "/" if content is FOLDER else path, content or b"")
        ours = zarvo.Path(self.write(TREE))
        theirs = zipfile.Path(twin)
        for part in ("tables", "road"):
            self.assertEqual(self.walk(theirs / part), self.walk(ours / part))
        for path in (
            ours / "road/of" / "one.txt",
            ours.joinpath("road", "of", "one.txt"),
            ours / pathlib.PurePosixPath("road/of/one.txt"),
        ):
            self.assertEqual("on the way\n", path.read_text("utf-8-sig"))
        self.assertEqual(theirs.joinpath("a", "b.tar.gz").suffixes, ours.joinpath("a", "b.tar.gz").suffixes)

    def test_glob_as_pathlib_does(self):
        archive = self.open([*TREE, ("road/road/one.txt", b"")])
        archive.extract(self.folder / "out")
        for pattern in (
            "*",
            "*.txt",
            "**/*.txt",
            "ROAD/*",
            "road/*",
            "road/**/one.txt",
            "**/road/**/*.txt",
            "**/[!o]*/*",
            "r??d",
            "tables/one.csv",
            "empty/*",
            "none/*",
            "*/",
            "*/**",
            "tables/*/",
        ):
            self.assertEqual(
                sorted(str(path.relative_to(self.folder / "out")) for path in (self.folder / "out").glob(pattern)),
                sorted(path.at for path in zarvo.Path(archive).glob(pattern)),
                pattern,
            )
        self.assertEqual(["road/of/one.txt"], [path.at for path in zarvo.Path(archive, "road/of").rglob("*.txt")])
        for pattern in ("", "/road"):
            with self.assertRaises(ValueError):
                zarvo.Path(archive).glob(pattern)

    def test_glob_goes_to_any_depth(self):
        path = "/".join(["d"] * 1200) + "/x"
        archive = self.open([(path, b"")])
        self.assertEqual([path], [found.at for found in zarvo.Path(archive).glob("**/x")])

    def test_say_what_is_not_there(self):
        root = zarvo.Path(self.write(TREE))
        for use, error in (
            ((root / "no").read_bytes, FileNotFoundError),
            (lambda: next((root / "no").iterdir()), FileNotFoundError),
            ((root / "tables").read_bytes, IsADirectoryError),
            (lambda: next((root / "empty").iterdir()), NotADirectoryError),
            (lambda: (root / "empty").open("w"), ValueError),
        ):
            with self.assertRaises(error):
                use()
        self.assertFalse((root / "no").exists())


class Pickles(ArchiveTest):
    def test_open_the_archive_where_they_are_read(self):
        self.write(TREE)
        script = "import pickle, sys; print(pickle.load(sys.stdin.buffer)())"
        here = os.getcwd()
        self.addCleanup(os.chdir, here)
        os.chdir(self.folder)
        archive = zarvo.open("a.zarvo")
        for use in (archive["empty"].read, (zarvo.Path(archive) / "empty").read_bytes, archive.__len__):
            shown = subprocess.run(
                [sys.executable, "-c", script], input=pickle.dumps(use), capture_output=True, check=True, cwd="/"
            )
            self.assertEqual(f"{use()}\n".encode(), shown.stdout)

    def test_notice_that_the_entry_is_another_one(self):
        kept = [pickle.dumps(entry) for entry in self.open([("a", b"1"), ("b", b"2")]).entries()]
        self.write([("c", b"3")])
        for number, copy in enumerate(kept):
            with self.subTest(number), self.assertRaisesRegex(zarvo.ArchiveChanged, "changed since the entry was"):
                pickle.loads(copy)


if __name__ == "__main__":
    unittest.main()
