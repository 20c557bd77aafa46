"""Runs over whole archives: extraction, tests and creation."""

import pickle
import unittest

import zarvo
from archives import FOLDER, LZMA, ROAD, TEXT, TREE, ArchiveTest


class Extraction(ArchiveTest):
    def files(self, name="out"):
        out = self.folder / name
        return {str(path.relative_to(out)): path.read_bytes() for path in out.rglob("*") if path.is_file()}

    def test_writes_what_is_chosen(self):
        archive = self.open(TREE)
        everything = {path: content for path, content in TREE if content is not FOLDER}
        for number, (options, paths) in enumerate(
            [
                ({}, {path: path for path in everything}),
                ({"patterns": ["tables", "empty"]}, {"tables/one.csv": "tables/one.csv", "empty": "empty"}),
                ({"exclude": ["**/*.txt", "tables"]}, {"empty": "empty"}),
                ({"strip": 1}, {"one.csv": "tables/one.csv", "of/one.txt": "road/of/one.txt"}),
                ({"threads": 1, "patterns": iter(["readme.txt"])}, {"readme.txt": "readme.txt"}),
            ]
        ):
            extracted = archive.extract(self.folder / str(number), **options)
            self.assertEqual({new: everything[old] for new, old in paths.items()}, self.files(str(number)), options)
            self.assertEqual(len(paths), extracted.files, options)

    def test_does_with_old_files_as_told(self):
        archive = self.open([("a", b"new"), ("b", b"new")])
        (self.folder / "out").mkdir()
        for overwrite, content, kept in (("never", b"old", 1), ("always", b"new", 0)):
            (self.folder / "out" / "a").write_bytes(b"old")
            extracted = archive.extract(self.folder / "out", patterns=["a"], overwrite=overwrite)
            self.assertEqual((content, kept), (self.files()["a"], extracted.kept))
        with self.assertRaises(zarvo.ExtractionFailed) as caught:
            archive.extract(self.folder / "out", overwrite="fail")
        self.assertEqual([("a", FileExistsError)], [(path, type(e)) for path, e in caught.exception.failures])
        self.assertEqual({"a": b"new", "b": b"new"}, self.files())

    def test_names_all_that_failed_at_the_end(self):
        entries = [("../up", b"1"), ("good", b"2"), ("broken", TEXT), ("last", b"3")]
        archive = self.open(entries, kind=LZMA, damage=[1])
        with self.assertRaises(zarvo.ExtractionFailed) as caught:
            archive.extract(self.folder / "out", patterns=["**", "nothing"], keep_broken=True)
        failures = [(path, type(error)) for path, error in caught.exception.failures]
        self.assertEqual(
            [("../up", zarvo.EntryRefused), ("broken", zarvo.DamagedData), ("nothing", KeyError)], failures
        )
        self.assertEqual(2, caught.exception.extracted.files)
        self.assertEqual({"good", "broken", "last"}, set(self.files()))
        self.assertEqual(TEXT[: (1 << 16) - 2], self.files()["broken"][: (1 << 16) - 2])
        self.assertRegex(str(caught.exception), r"^\.\./up: .*, and 2 more$")
        copy = pickle.loads(pickle.dumps(caught.exception))
        self.assertEqual(failures, [(path, type(error)) for path, error in copy.failures])

    def test_ends_by_exceptions_of_progress(self):
        archive = self.open(TREE)
        told = []
        archive.extract(self.folder / "out", progress=told.append)
        self.assertEqual(zarvo.Progress(archive.info.data_size, archive.info.data_size, 5, 5), told[-1])

        def stop(progress):
            raise LookupError("enough")

        for run in (
            lambda: archive.extract(self.folder / "out", progress=stop),
            lambda: archive.test(progress=stop),
            lambda: zarvo.create(self.folder / "new.zarvo", self.folder, progress=stop),
        ):
            with self.assertRaisesRegex(LookupError, "enough"):
                run()

    def test_refuses_wrong_arguments(self):
        archive = self.open(TREE)
        for options, error in (
            ({"overwrite": "perhaps"}, ValueError),
            ({"patterns": "*.txt"}, TypeError),
            ({"patterns": [b"a"]}, TypeError),
            ({"threads": -1}, ValueError),
            ({"strip": -1}, ValueError),
            ({"strip": "1"}, TypeError),
        ):
            with self.assertRaises(error, msg=options):
                archive.extract(self.folder / "out", **options)
        with self.assertRaisesRegex(TypeError, "expected an int, not None"):
            archive.extract(self.folder / "out", threads=None)
        self.assertFalse((self.folder / "out").exists())
        with self.assertRaises(OSError) as caught:
            archive.extract(self.folder / "a.zarvo")
        self.assertEqual(str(self.folder / "a.zarvo"), caught.exception.filename)

    def test_keeps_limits(self):
        archive = zarvo.open(ROAD)
        with self.assertRaisesRegex(zarvo.LimitExceeded, r"road.zarvo: .*; the limit \(max_bytes\) is 78353"):
            archive.extract(self.folder / "out", max_bytes=78353)
        self.assertFalse((self.folder / "out").exists())
        with self.assertRaises(zarvo.ExtractionFailed) as caught:
            archive.extract(self.folder / "out", memory=16384)
        failed = {path: type(error) for path, error in caught.exception.failures}
        self.assertEqual(
            dict.fromkeys(("readme.txt", "tables/squares.csv", "road/of/one/file.txt"), zarvo.LimitExceeded), failed
        )
        tested = archive.test(memory=16384)
        self.assertEqual("block 0 of 16384 bytes is too large to be held in memory", tested.blocks[0])
        self.assertEqual(4, archive.extract(self.folder / "out", max_bytes=78354, memory=32768).files)

    def test_of_a_dry_run_writes_nothing(self):
        archive = self.open([("good", b"2"), ("broken", TEXT)], kind=LZMA, damage=[1])
        with self.assertRaises(zarvo.ExtractionFailed) as caught:
            archive.extract(self.folder / "out", dry_run=True)
        self.assertEqual(["broken"], [path for path, _ in caught.exception.failures])
        self.assertEqual(1, caught.exception.extracted.files)
        self.assertFalse((self.folder / "out").exists())

    def test_of_nothing_names_damage(self):
        archive = self.open([("good", b"2"), ("broken", TEXT)], kind=LZMA, damage=[1])
        result = archive.test(threads=2)
        self.assertEqual((2, len(TEXT) + 1), (result.files, result.bytes))
        self.assertEqual([("broken", len(TEXT))], [damage[:2] for damage in result.damaged])
        self.assertGreaterEqual(result.damaged[0].readable, (1 << 16) - 1)
        self.assertEqual([1], list(result.blocks))


class Creation(ArchiveTest):
    def setUp(self):
        super().setUp()
        self.new = self.folder / "new.zarvo"
        self.made_of = self.folder / "folder"
        for path, content in TREE:
            place = self.made_of / path
            if content is FOLDER:
                place.mkdir(parents=True)
            else:
                place.parent.mkdir(parents=True, exist_ok=True)
                place.write_bytes(content)

    def test_makes_what_is_read_back(self):
        everything = {path: content for path, content in TREE if content is not FOLDER}
        for options, kind in (
            ({}, "lz4hc"),
            ({"compression": "lzma", "level": 1, "block_size": 65536, "threads": 2}, "lzma"),
            ({"streamed": True}, "lzma"),
            ({"compression": "lz4"}, "lz4"),
            ({"compression": "none"}, "none"),
            ({"layout": "ZarvoWeb", "engine_version": "9.1"}, "lzma"),
        ):
            created = zarvo.create(self.new, self.made_of, force=True, **options)
            with zarvo.open(self.new) as archive:
                files = {path: entry.read() for path, entry in archive.items() if entry.kind == "file"}
                info = archive.info
            self.assertEqual(everything, files, options)
            self.assertEqual((len(files), info.file_bytes), (created.files, created.bytes), options)
            self.assertEqual(self.new.stat().st_size, created.archive_bytes)
            self.assertGreater(getattr(info.blocks, kind), 0, options)
            self.assertEqual(options.get("layout", "ZarvoFS"), info.layout)
            self.assertEqual(options.get("engine_version", "5.x.x"), info.engine_version)

    def test_keeps_its_limit_of_memory(self):
        with self.assertRaisesRegex(zarvo.LimitExceeded, "bytes of memory, and the limit is 4096"):
            zarvo.create(self.new, self.made_of, memory=4096)
        self.assertFalse(self.new.exists())

    def test_of_a_dry_run_writes_nothing(self):
        (self.made_of / "link").symlink_to("readme.txt")
        created = zarvo.create(self.new, self.made_of, dry_run=True)
        self.assertEqual((4, ["link"]), (created.files, [path for path, _ in created.left_out]))
        self.assertFalse(self.new.exists())

    def test_says_what_it_leaves_out(self):
        (self.made_of / "link").symlink_to("readme.txt")
        created = zarvo.create(self.new, self.made_of, exclude=["tables"])
        self.assertEqual(["link"], [path for path, _ in created.left_out])
        with zarvo.open(self.new) as archive:
            self.assertEqual({"empty", "readme.txt", "road/of/one.txt"}, {e.path for e in archive.values() if not e.is_dir()})

    def test_leaves_no_archive_when_it_fails(self):
        (self.made_of / "a\\b").write_bytes(b"1")
        with self.assertRaises(zarvo.CreationFailed) as caught:
            zarvo.create(self.new, self.made_of)
        self.assertEqual(
            [("a\\b", zarvo.EntryRefused)], [(path, type(error)) for path, error in caught.exception.failures]
        )
        (self.made_of / "a\\b").unlink()
        for options, error in (
            ({"layout": "ZIP"}, ValueError),
            ({"compression": "lz4", "streamed": True}, ValueError),
            ({"level": 99}, ValueError),
            ({"level": -1}, ValueError),
            ({"exclude": "a"}, TypeError),
        ):
            with self.assertRaises(error, msg=options):
                zarvo.create(self.new, self.made_of, **options)
        self.assertFalse(self.new.exists())
        with self.assertRaises(FileNotFoundError):
            zarvo.create(self.new, self.folder / "none")
        self.new.write_bytes(b"old")
        with self.assertRaises(FileExistsError):
            zarvo.create(self.new, self.made_of)
        self.assertEqual(b"old", self.new.read_bytes())

    def test_can_be_stopped_until_all_is_read(self):
        self.new.write_bytes(b"old")

        def stop(progress):
            if progress.bytes == progress.bytes_total:
                raise LookupError("enough")

        with self.assertRaisesRegex(LookupError, "enough"):
            zarvo.create(self.new, self.made_of, force=True, progress=stop)
        self.assertEqual(b"old", self.new.read_bytes())


if __name__ == "__main__":
    unittest.main()
