"""Compares zarvo create with other packers, all of them on two processors and with the same coders and levels."""

import os
import shutil
import tempfile

from measuring import Row, discard, measure, progress, run, take_turns
from packing import MIB, PEERS, describe_tree, make_tree
from tables import Bound, Target, describe_machine, print_costs, print_targets
from zarvo_extract import THREADS, command

# Name, title, options, block size, and what the coder needs for a thread: the state of LZ4HC, or ten times the
# dictionary of LZMA, which is as large as the block, but at most the 4 MiB of that level.
OURS = [
    ("lz4hc-12", "LZ4HC, level 12", ["-c", "lz4hc", "-l", 12, "-b", "128K"], MIB // 8, MIB // 4),
    ("lz4hc-9", "LZ4HC, level 9", ["-c", "lz4hc", "-l", 9, "-b", "128K"], MIB // 8, MIB // 4),
    ("lzma", "LZMA chunks, level 4", ["-c", "lzma", "-l", 4, "-b", "128K"], MIB // 8, 10 * MIB // 8),
    ("streamed", "LZMA, streamed, level 4", ["-c", "lzma", "-l", 4, "-b", "8M", "--streamed"], 8 * MIB, 40 * MIB),
]

# Those that pack with the same settings, and their names in the tables.
THEIRS = {
    "squashfs-lz4hc": "`mksquashfs -comp lz4 -Xhc`",
    "erofs": "`mkfs.erofs -zlz4hc,9`",
    "7z2-128k": "`7zz a -mmt=2`, LZMA2 blocks of 128 KiB",
    "7z2-8m": "`7zz a -mmt=2`, LZMA2 blocks of 8 MiB",
}

WANTED = [
    Target("lz4hc-12", "squashfs-lz4hc", "wall", 1.00),
    Target("lz4hc-9", "erofs", "wall", 0.60),
    Target("lzma", "7z2-128k", "wall", 1.00),
    Target("streamed", "7z2-8m", "wall", 1.00),
]


def make_rows(build):
    """All rows pack the folder that they run in, into a file beside it."""
    rows = {}
    for name, title, options, *_ in OURS:
        archive = f"../{name}.zarvo"
        rows[name] = Row(f"**`create`: {title}**", archive, command(build, "create", *options, archive, "."), archive)
    for name, title in THEIRS.items():
        archive = f"../{PEERS[name].archive}"
        rows[name] = Row(title, archive, PEERS[name].pack.format(archive=archive).split(), archive)
    return rows


def verify_packed(build, row, folder, is_ours):
    """Runs the row's command. Returns the size of its archive; compares what is in one of ours with the folder."""
    run(row.command, cwd=folder)
    archive = os.path.join(folder, row.output)
    size = os.path.getsize(archive)
    if is_ours:
        unpacked = os.path.join(folder, "..", "unpacked")
        run(command(build, "extract", "-o", unpacked, archive))
        run(["diff", "-rq", "--no-dereference", folder, unpacked])
        discard(unpacked, None)
    discard(archive, None)
    return size


def print_packers(options):
    tree = make_tree(options)
    rows = make_rows(options.build)
    ours = [name for name, *_ in OURS]
    with tempfile.TemporaryDirectory(prefix="varnex-bench-", dir=options.memory) as parent:
        folder = f"{parent}/tree"
        shutil.copytree(tree, folder)
        sizes = {}
        for name, row in rows.items():
            progress(f"verifying {row.output}")
            sizes[name] = verify_packed(options.build, row, folder, name in ours)
        medians = take_turns(rows, options.rounds, "packing", lambda row: measure(options.build, row, folder))
    print(f"{describe_tree(tree)}, packed on a memory file system; medians of {options.rounds} rounds")
    describe_machine()
    print_costs(rows, sizes, medians, {})
    print_targets(rows, medians, WANTED,
                  [Bound(name, f"16 MiB + {THREADS} x (block + coder)", 16 * MIB + THREADS * (block + coder))
                   for name, _, _, block, coder in OURS])
