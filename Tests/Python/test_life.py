"""Threads, forks, and objects that live longer than others."""

import gc
import importlib.util
import io
import os
import pathlib
import signal
import subprocess
import sys
import threading
import time
import unittest
from concurrent.futures import ThreadPoolExecutor

import zarvo
from archives import LZMA, UNKNOWN, ArchiveTest, build, make_text

TEXTS = {f"{number}.txt": make_text(40_000, number) for number in range(20)}


def run_python(script, *arguments):
    # What threads hold when a process ends is no leak.
    environment = {**os.environ, "ASAN_OPTIONS": os.environ.get("ASAN_OPTIONS", "") + ":detect_leaks=0"}
    return subprocess.run(
        [sys.executable, "-c", script, *arguments], capture_output=True, text=True, timeout=300, env=environment
    )


class BlockingFile(io.BytesIO):
    """Waits in its reads, when it is told to, until it may go on."""

    def __init__(self, data):
        super().__init__(data)
        self.is_blocking = False
        self.has_come = threading.Event()
        self.may_go_on = threading.Event()

    def read(self, size=-1):
        if self.is_blocking:
            self.has_come.set()
            self.may_go_on.wait()
        return super().read(size)


class LifeTest(ArchiveTest):
    def setUp(self):
        super().setUp()
        self.path = self.write(TEXTS.items(), kind=LZMA)


class Objects(LifeTest):
    def test_files_outlive_their_archive(self):
        archive = zarvo.open(self.path)
        files = [archive[path].open() for path in TEXTS]
        for file in files:
            file.raw.readinto(bytearray(10))
        archive.close()
        del archive
        gc.collect()
        for file, text in zip(files, TEXTS.values()):
            self.assertEqual(text[10:], file.read())

    def test_thousand_archives_leave_nothing(self):
        self.path.write_bytes(build([("1.txt", TEXTS["1.txt"][:4000])], kind=LZMA))

        def use():
            archive = zarvo.open(self.path)
            file = archive["1.txt"].open()
            file.read(10)
            with self.assertRaises(KeyError):
                archive["missing"]
            failing = zarvo.open(io.BytesIO(self.path.read_bytes()))
            failing._file.close()
            with self.assertRaises(ValueError):
                failing["1.txt"].read()
            with self.assertRaises(zarvo.BadArchive):
                zarvo.open(__file__)

        def measure():
            gc.collect()
            pages = int(pathlib.Path("/proc/self/statm").read_text().split()[1])
            return len(os.listdir("/proc/self/fd")), pages * os.sysconf("SC_PAGESIZE")

        for _ in range(100):
            use()
        descriptors, memory = measure()
        for _ in range(1000):
            use()
        descriptors_after, memory_after = measure()
        self.assertEqual(descriptors, descriptors_after)
        self.assertLess(memory_after - memory, 16 << 20, "an open archive takes 100 KB and more")

    def test_in_a_ring_are_collected(self):
        class File(io.BytesIO):
            pass

        file = File(self.path.read_bytes())
        file.archive = zarvo.open(file)
        file.file = file.archive["1.txt"].open()
        gone = threading.Event()
        file.sentinel = type("Sentinel", (), {"__del__": lambda self: gone.set()})()
        del file
        gc.collect()
        self.assertTrue(gone.is_set())


class Imports(LifeTest):
    def test_load_only_what_reads_archives(self):
        script = """if True:
            import sys, zarvo
            zarvo.open(sys.argv[1])["1.txt"].open().read()
            print({"pathlib", "threading", "typing", "zarvo._path", "zarvo._records"} & set(sys.modules))
            """
        command = [sys.executable, "-S", "-c", script, str(self.path)]
        ended = subprocess.run(command, capture_output=True, text=True, timeout=300)
        self.assertEqual(("set()\n", ""), (ended.stdout, ended.stderr))

    def test_show_all_names_where_users_find_them(self):
        shown = run_python("import zarvo; print(*dir(zarvo))").stdout.split()
        self.assertEqual([], [name for name in zarvo.__all__ if name not in shown])
        self.assertEqual({"zarvo"}, {getattr(zarvo, name).__module__ for name in zarvo.__all__})
        with self.assertRaisesRegex(AttributeError, "module 'zarvo' has no attribute 'ZipFile'"):
            zarvo.ZipFile

    @unittest.skipUnless(importlib.util.find_spec("_xxsubinterpreters"), "Python 3.13 calls them something else")
    def test_are_refused_outside_the_main_interpreter(self):
        script = """if True:
            import sys, _xxsubinterpreters, zarvo
            other = _xxsubinterpreters.create()
            front = f"import sys; sys.path[:] = {sys.path!r}\\n"
            try:
                _xxsubinterpreters.run_string(other, front + "import zarvo")
            except _xxsubinterpreters.RunFailedError as error:
                print(error)
            """
        self.assertRegex(run_python(script).stdout, "ImportError.*zarvo can only be used in the main interpreter")


class Threads(LifeTest):
    def test_read_one_archive_and_close_it_meanwhile(self):
        for _ in range(10):
            archive = zarvo.open(self.path)
            ready = threading.Barrier(5)

            def read():
                ready.wait()
                for count in range(1_000_000):
                    path = f"{count % len(TEXTS)}.txt"
                    try:
                        entry = archive[path]
                        with entry.open() as file:
                            if (entry.read(), file.read()) != (TEXTS[path], TEXTS[path]):
                                return "other bytes"
                    except ValueError:
                        return count

            with ThreadPoolExecutor(4) as pool:
                readers = [pool.submit(read) for _ in range(4)]
                ready.wait()
                archive.test()
                archive.close()
            for reader in readers:
                self.assertIsInstance(reader.result(), int)

    def test_share_one_raw_file(self):
        archive = zarvo.open(self.path)
        raw = archive["1.txt"].open().detach()

        def read():
            pieces = []
            while True:
                piece = bytearray(7)
                count = raw.readinto(piece)
                if count == 0:
                    return pieces
                pieces.append(bytes(piece[:count]))

        with ThreadPoolExecutor(4) as pool:
            readers = [pool.submit(read) for _ in range(4)]
            pieces = [piece for reader in readers for piece in reader.result()]
        text = TEXTS["1.txt"]
        self.assertEqual(sorted(text[at : at + 7] for at in range(0, len(text), 7)), sorted(pieces))

    def test_run_while_the_library_works(self):
        data = make_text(3_000_000)
        self.path.write_bytes(build([("large", data)], kind=LZMA, block_size=1 << 20))
        archive = zarvo.open(self.path)
        stream = archive["large"].open()
        interval = sys.getswitchinterval()
        self.addCleanup(sys.setswitchinterval, interval)
        for name, work in {
            "read": archive["large"].read,
            "stream": stream.read,
            "test": archive.test,
            "extract": lambda: archive.extract(self.folder / "out"),
        }.items():
            gate = threading.Lock()
            gate.acquire()
            ran = []

            def run_at_once():
                with gate:
                    ran.append(name)

            thread = threading.Thread(target=run_at_once)
            thread.start()
            time.sleep(0.01)  # lets it come to the gate
            sys.setswitchinterval(1000)  # from now on it runs only if this thread gives up the interpreter
            gate.release()
            work()
            self.assertEqual([name], ran)
            sys.setswitchinterval(interval)
            thread.join()

    def test_of_a_process_that_ends_do_no_harm(self):
        script = """if True:
            import sys, threading, zarvo
            archive = zarvo.open(sys.argv[1])
            def read():
                while True:
                    for path in archive: archive[path].read()
            for _ in range(4): threading.Thread(target=read, daemon=True).start()
            archive.test()
            """
        for _ in range(5):
            ended = run_python(script, str(self.path))
            self.assertEqual((0, ""), (ended.returncode, ended.stderr))

    def test_of_a_process_that_ends_may_still_drop_archives(self):
        script = """if True:
            import ctypes, sys
            c = ctypes.CDLL(None)
            # Called after the static objects of all that is loaded later are destroyed.
            drop = ctypes.CFUNCTYPE(None, ctypes.c_void_p)(lambda _: archives.clear())
            c.__cxa_atexit(drop, None, None)
            import zarvo
            archives = [zarvo.open(sys.argv[1]) for _ in range(3)]
            c.exit(len(archives))
            """
        ended = run_python(script, str(self.path))
        self.assertEqual((3, ""), (ended.returncode, ended.stderr))


class Memory(LifeTest):
    @unittest.skipIf("Sanitized" in sys.executable, "the sanitizers need more memory than the limit leaves")
    def test_that_is_refused_for_a_message_is_an_error(self):
        path = self.write([("p" * (20 << 20), b"text")], kind=UNKNOWN)
        script = """if True:
            import resource, sys, zarvo
            archive = zarvo.open(sys.argv[1])
            entry = next(archive.entries())
            with open("/proc/self/statm") as file:
                used = int(file.read().split()[0]) * resource.getpagesize()
            met = set()
            for more in range(0, 300 << 20, 10 << 20):
                resource.setrlimit(resource.RLIMIT_AS, (used + more, resource.RLIM_INFINITY))
                try:
                    entry.read()
                except (MemoryError, zarvo.UnsupportedData) as error:
                    met.add(type(error).__name__)
            print(sorted(met))
            """
        ended = run_python(script, str(path))
        self.assertEqual(("['MemoryError', 'UnsupportedData']\n", ""), (ended.stdout, ended.stderr))


class Signals(LifeTest):
    def test_interrupt_a_run(self):
        blocks = 32

        class SlowFile(io.BytesIO):
            reads = 0

            def read(self, size=-1):
                self.reads += 1
                if self.reads == 1:
                    os.kill(os.getpid(), signal.SIGINT)
                time.sleep(0.1)
                return super().read(size)

        file = SlowFile(build([("zeros", bytes(blocks << 19))], kind=LZMA, block_size=1 << 19))
        file.reads = 1
        archive = zarvo.open(file)
        for run in (archive.test, lambda threads: archive.extract(self.folder / "out", threads=threads)):
            file.reads = 0
            with self.assertRaises(KeyboardInterrupt):
                run(threads=1)
            self.assertLess(file.reads, blocks)


class Forks(LifeTest):
    def in_child(self, use):
        """What use returns in a forked process, as a text."""
        reader, writer = os.pipe()
        child = os.fork()
        if child == 0:
            signal.alarm(20)  # a deadlock ends by it
            try:
                os.write(writer, str(use()).encode())
            except BaseException as error:
                os.write(writer, repr(error).encode())
            os._exit(0)
        os.close(writer)
        with open(reader) as answer:
            said = answer.read()
        self.assertEqual(0, os.waitpid(child, 0)[1])
        return said

    def test_leave_both_processes_a_working_archive(self):
        archive = zarvo.open(self.path)
        file = archive["1.txt"].open()
        head = file.raw.read(100)
        self.assertEqual(TEXTS["1.txt"][:100], head)
        for _ in range(3):
            self.assertEqual("True", self.in_child(lambda: file.read() == TEXTS["1.txt"][100:]))
            self.assertEqual("[]", self.in_child(lambda: archive.test(threads=2).damaged))
        self.assertEqual(TEXTS["1.txt"][100:], file.read())

    def test_tell_when_a_thread_was_in_the_archive(self):
        file = BlockingFile(self.path.read_bytes())
        archive = zarvo.open(file)
        stream = archive["2.txt"].open()
        file.is_blocking = True
        with ThreadPoolExecutor(1) as pool:
            reading = pool.submit(archive["1.txt"].read)
            file.has_come.wait()
            try:
                for use in (archive["1.txt"].read, stream.read, archive.test, lambda: archive["1.txt"]):
                    self.assertIn("another thread was using the archive when this process was", self.in_child(use))
                self.assertEqual("None", self.in_child(archive.close))
                self.assertEqual(str(TEXTS["1.txt"]), self.in_child(lambda: zarvo.open(self.path)["1.txt"].read()))
            finally:
                file.is_blocking = False
                file.may_go_on.set()
            self.assertEqual(TEXTS["1.txt"], reading.result())
        self.assertEqual([], archive.test().damaged)


if __name__ == "__main__":
    unittest.main()
