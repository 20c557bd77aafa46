"""Compares zarvo mount with squashfuse: what programs take to read the files of a mounted archive."""

import os
import subprocess
import sys
import tempfile
import time
from collections import namedtuple

from measuring import Sample, parse_measured, place, progress, run, sizes_of, take_turns
from packing import KINDS, PEERS, describe_tree, make_tree, pack_all
from tables import Target, describe_machine, print_costs, print_targets
from zarvo_extract import HUGE_FILE, command, make_huge

POINT = "mnt"
RANDOM_READS = f"python3 -B {os.path.dirname(os.path.abspath(__file__))}/random_reads.py {POINT}/data "

# What is read of which archive: a name, its name in the tables, the folder of the archives, the kind of ours, the peer
# that packs for squashfuse (None: it stands beside zarvo test instead), and the command in the language of the shell.
Case = namedtuple("Case", "name title folder kind peer command")
CASES = [
    # tar reads no files if it writes to /dev/null; what it writes to a pipe it has read.
    Case("attributes", "`tar cf /dev/null`", "tree", "lz4hc", "squashfs-lz4hc", f"tar cf /dev/null -C {POINT} ."),
    Case("tar", "`tar cf -` into a pipe", "tree", "lz4hc", "squashfs-lz4hc", f"tar cf - -C {POINT} . | cat"),
    Case("grep", "two `grep`", "tree", "lz4hc", "squashfs-lz4hc",
         f"find {POINT} -type f -print0 | xargs -0 -n 100 -P 2 grep -a -c ."),
    Case("random-lz4hc", "10,000 random reads, LZ4HC", "huge", "lz4hc", "squashfs-lz4hc", RANDOM_READS + "10000"),
    Case("random-lzma", "1,000 random reads, LZMA or xz", "huge", "lzma", "squashfs-xz", RANDOM_READS + "1000"),
    Case("sequential-lz4hc", "`cat`, LZ4HC", "huge", "lz4hc", None, f"cat {POINT}/data"),
    Case("sequential-lzma", "`cat`, LZMA", "huge", "lzma", None, f"cat {POINT}/data"),
]
SQUASHFUSES = ["squashfuse", "squashfuse_ll"]

WANTED_TO_SQUASHFUSE = 0.80
WANTED_SEQUENTIAL_TO_TEST = 2.00

# The mount is the command that mounts the archive and stays in the foreground, or None. The command runs after it.
MountedRow = namedtuple("MountedRow", "title archive mount command")


def make_rows(build):
    rows = {}
    for case in CASES:
        reader = ["bash", "-o", "pipefail", "-c", case.command]
        archive = f"{case.folder}/{case.kind}.zarvo"
        rows[case.name] = MountedRow(f"**`mount`: {case.title}**", archive,
                                     [f"{build}/zarvo", "mount", "-f", archive, POINT], reader)
        if case.peer is None:
            rows["test-" + case.name] = MountedRow(f"`zarvo test`, {KINDS[case.kind]}", archive, None,
                                                   command(build, "test", archive))
            continue
        squashed = f"{case.folder}/{PEERS[case.peer].archive}"
        for program in SQUASHFUSES:
            rows[f"{program}-{case.name}"] = MountedRow(f"`{program}`: {case.title}", squashed,
                                                        [program, "-f", squashed, POINT], reader)
    return rows


def while_mounted(build, mount, folder, action):
    """Calls the action while the archive is mounted. Returns the action's result, and what the mount has cost."""
    process = subprocess.Popen([f"{build}/Benchmarks/Measure", *mount], cwd=folder, stdout=subprocess.PIPE, text=True)
    while not os.path.ismount(f"{folder}/{POINT}"):
        if process.poll() is not None:
            sys.exit(f"{' '.join(mount)} has mounted nothing")
        time.sleep(0.01)
    try:
        result = action()
    finally:
        run(["fusermount3", "-u", f"{folder}/{POINT}"])
    return result, parse_measured(process.communicate()[0], mount)


def measure_row(build, row, folder):
    """The wall time is the command's, the processor times are those of command and mount, and the peak is the mount's.
    The archive is mounted anew each time, so the kernel holds nothing of its files."""
    def read():
        return parse_measured(run([f"{build}/Benchmarks/Measure", *row.command], cwd=folder), row.command)

    if row.mount is None:
        return read()
    cost, served = while_mounted(build, row.mount, folder, read)
    return Sample(cost.wall, cost.user + served.user, cost.system + served.system, served.peak)


def verify_mounts(build, rows, folder, sources):
    """Compares each archive's files with the source."""
    for mount, archive in {(tuple(row.mount), row.archive) for row in rows.values() if row.mount}:
        progress(f"verifying {' '.join(mount)}")
        source = sources[os.path.dirname(archive)]
        compare = ["diff", "-rq", "--no-dereference", source, f"{folder}/{POINT}"]
        while_mounted(build, mount, folder, lambda: run(compare))


def print_mounts(options):
    sources = {"tree": make_tree(options), "huge": make_huge(options)}
    rows = make_rows(options.build)
    with tempfile.TemporaryDirectory(prefix="varnex-bench-", dir=options.memory) as folder:
        os.mkdir(f"{folder}/{POINT}")
        for name, source in sources.items():
            cases = [case for case in CASES if case.folder == name]
            archives = pack_all(options.build, source, {case.kind for case in cases},
                                {case.peer for case in cases if case.peer})
            os.mkdir(f"{folder}/{name}")
            place(archives, {os.path.basename(row.archive) for row in rows.values() if row.archive.startswith(name)},
                  f"{folder}/{name}")
        sizes = sizes_of(folder, rows)
        verify_mounts(options.build, rows, folder, sources)
        medians = take_turns(rows, options.rounds, "reading", lambda row: measure_row(options.build, row, folder))
    print(f"{describe_tree(sources['tree'])}, and one file of {HUGE_FILE:,} bytes; archives on a memory file system; "
          f"medians of {options.rounds} rounds")
    describe_machine()
    print_costs(rows, sizes, medians, {})
    targets = [Target(case.name, f"squashfuse-{case.name}", "wall", WANTED_TO_SQUASHFUSE) if case.peer else
               Target(case.name, f"test-{case.name}", "wall", WANTED_SEQUENTIAL_TO_TEST) for case in CASES]
    print_targets(rows, medians, targets, [])
