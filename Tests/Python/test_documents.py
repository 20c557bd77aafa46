"""What documents and examples show."""

import doctest
import importlib.util
import os
import pathlib
import shutil
import subprocess
import sys
import unittest

from archives import ArchiveTest

ROOT = pathlib.Path(__file__).parents[2]
# What the packages that the example imports leave behind is not ours.
ENVIRONMENT = {**os.environ, "ASAN_OPTIONS": os.environ.get("ASAN_OPTIONS", "") + ":detect_leaks=0"}


class Documents(ArchiveTest):
    def setUp(self):
        super().setUp()
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(self.folder)
        shutil.copy(ROOT / "Samples" / "road.zarvo", "game.zarvo")

    def test_show_sessions_as_they_are(self):
        ran = doctest.testfile(str(ROOT / "docs" / "python.md"), module_relative=False, verbose=False)
        self.assertEqual(0, ran.failed)
        self.assertGreater(ran.attempted, 15)

    @unittest.skipUnless(importlib.util.find_spec("distributed"), "distributed is not installed")
    def test_example_for_many_archives_names_what_failed(self):
        data = pathlib.Path("game.zarvo").read_bytes()
        pathlib.Path("broken.zarvo").write_bytes(data[:1000] + bytes(40_000) + data[41_000:])
        command = [sys.executable, str(ROOT / "Examples" / "TestManyArchives.py")]
        shown = subprocess.run(
            [*command, "game.zarvo", "broken.zarvo", "missing.zarvo"],
            stdout=subprocess.PIPE,
            text=True,
            timeout=300,
            env=ENVIRONMENT,
        )
        lines = sorted(shown.stdout.splitlines())
        self.assertEqual(1, shown.returncode)
        self.assertEqual("3 archives, 2 failed", lines[0])
        self.assertRegex(lines[1], "^broken.zarvo\tValueError\t1 damaged files, the first is tables/squares.csv$")
        self.assertRegex(lines[2], "^missing.zarvo\tFileNotFoundError\t")

    @unittest.skipUnless(importlib.util.find_spec("distributed"), "distributed is not installed")
    def test_example_for_many_archives_mixes_no_folders(self):
        command = [sys.executable, str(ROOT / "Examples" / "TestManyArchives.py"), "--extract", "out"]
        ended = subprocess.run(
            [*command, "a/game.zarvo", "b/game.zarvo"], capture_output=True, text=True, timeout=300, env=ENVIRONMENT
        )
        self.assertEqual(2, ended.returncode)
        self.assertIn("archives of the same name would share a folder", ended.stderr)


if __name__ == "__main__":
    unittest.main()
