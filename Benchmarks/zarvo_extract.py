"""Compares zarvo extract and zarvo test with Varnex and with other extractors, all of them on two processors."""

import os
import sys

from compare import asked_peers, peer_rows, varnex_row
from measuring import Row, file_system_of, has_room, measure_in, sizes_of
from packing import KINDS, MIB, describe_tree, files_of, make_once, make_tree, pack_all, sizes_from_plan, write_data
from tables import Bound, Target, describe_machine, print_costs, print_ratios, print_targets

THREADS = 2
ROOM_FOR_ONE_ARCHIVE = 7 << 30  # a small file takes a page, and what the kernel knows of it
MOST_ROUNDS_ON_DISK = 3  # for a look; the targets are for memory
PEERS = ["squashfs-lz4hc", "squashfs-xz", "erofs", "7z2-128k", "7z2-8m", "tar"]
HUGE_FILE = 1_000_000_000
SMALL_FILES, SMALL_FILE, FILES_IN_FOLDER = 1_000_000, 100, 1_000

# Archives whose one block holds everything are never held whole; what they need is the dictionary (see PackFolder.cpp).
DICTIONARIES = {"web": 8 * MIB, "raw": 0}

# On the memory file system. A row without a prefix is zarvo extract with two threads.
WANTED = [
    Target("lz4hc", "varnex-lz4hc", "wall", 0.60),
    Target("lz4hc", "erofs", "wall", 0.50),
    Target("lz4hc", "squashfs-lz4hc", "wall", 0.45),
    Target("lz4hc", "tar", "wall", 0.60),
    Target("lzma", "varnex-lzma", "wall", 0.38),
    Target("lzma", "7z2-128k", "wall", 0.75),
    Target("lzma", "squashfs-xz", "wall", 0.75),
    Target("streamed", "varnex-streamed", "wall", 0.38),
    Target("streamed", "7z2-8m", "wall", 0.75),
    Target("streamed", "squashfs-xz", "wall", 0.75),
    Target("stored", "tar", "wall", 0.60),
    Target("raw", "tar", "wall", 0.60),
]
WANTED_ONE_THREAD_TO_VARNEX = 1.05
WANTED_TEST_TO_EXTRACT = {"lz4hc": 0.90, "stored": 0.90, "lzma": 1.00, "streamed": 1.00, "web": 1.00, "raw": 1.00}
WANTED_HUGE_TO_VARNEX = 0.70
WANTED_SMALL_TO_VARNEX = 0.75


def command(build, subcommand, *arguments, threads=THREADS):
    return [f"{build}/zarvo", subcommand, "-q", "-j", str(threads), *map(str, arguments)]


def make_rows(build, kinds):
    """For each archive: zarvo extract with two threads and with one, zarvo test, and Varnex."""
    rows = {}
    for kind in kinds:
        title, archive = KINDS[kind], f"{kind}.zarvo"
        rows[kind] = Row(f"**`extract`: {title}**", archive, command(build, "extract", "-o", "out", archive), "out")
        rows["single-" + kind] = Row(f"`extract -j 1`: {title}", archive,
                                     command(build, "extract", "-o", "out", archive, threads=1), "out")
        rows["test-" + kind] = Row(f"`test`: {title}", archive, command(build, "test", archive), None)
        rows["varnex-" + kind] = varnex_row(f"`Varnex`: {title}", build, archive)
    return rows


def make_bound(archives, kind):
    block, directory = sizes_from_plan(archives, kind)
    if kind in DICTIONARIES:
        return Bound(kind, "16 MiB + dictionary + directory", 16 * MIB + DICTIONARIES[kind] + directory)
    return Bound(kind, f"16 MiB + {THREADS} x 2 blocks + directory", 16 * MIB + THREADS * 2 * block + directory)


def print_places(options, archives, source, rows, targets, bounds, ratios=None, on_disk=True):
    """Measures in memory and on the disk. The targets are for memory."""
    describe_machine()
    places = [(options.memory, "a memory file system", options.rounds)]
    if options.disk and on_disk:
        title = f"the disk ({file_system_of(options.disk)})"
        places.append((options.disk, title, min(options.rounds, MOST_ROUNDS_ON_DISK)))
    for parent, title, rounds in places:
        medians, _ = measure_in(parent, options.build, archives, source, rows, rounds)
        print(f"\nOn {title}, medians of {rounds} rounds:")
        print_costs(rows, sizes_of(archives, rows), medians, {})
        if ratios:
            print_ratios(medians, *ratios)
        if parent == options.memory:
            print_targets(rows, medians, targets, bounds)


def print_table(options):
    tree = make_tree(options)
    kinds = options.kinds
    peers = asked_peers(kinds, PEERS, WANTED)
    archives = pack_all(options.build, tree, kinds, peers)
    rows = make_rows(options.build, kinds) | peer_rows(peers, THREADS)
    targets = WANTED + [target for kind in kinds for target in [
        Target("single-" + kind, "varnex-" + kind, "wall", WANTED_ONE_THREAD_TO_VARNEX),
        Target("test-" + kind, kind, "wall", WANTED_TEST_TO_EXTRACT[kind])]]
    ratios = (["`Varnex`", *(rows[peer].title for peer in peers)],
              [(f"**{KINDS[kind]}**", kind, ["varnex-" + kind, *peers]) for kind in kinds])
    print(describe_tree(tree))
    print_places(options, archives, tree, rows, targets, [make_bound(archives, kind) for kind in kinds], ratios)


def make_huge(options):
    """A folder with one file of a gigabyte: the tree's files one after another."""
    tree = make_tree(options)
    return make_once(os.path.join(os.path.dirname(tree), "huge", "tree"),
                     lambda folder: write_data(tree, f"{folder}/data", HUGE_FILE))


def pieces_of(tree):
    """The bytes of the tree's files in small pieces, without an end."""
    while True:
        for path in files_of(tree):
            with open(path, "rb") as source:
                while piece := source.read(SMALL_FILE):
                    yield piece


def make_small(options):
    """A folder with a million small files that are cut from the tree's."""
    tree = make_tree(options)

    def fill(folder):
        for number, piece in zip(range(SMALL_FILES), pieces_of(tree)):
            place = f"{folder}/{number // FILES_IN_FOLDER:04}"
            if number % FILES_IN_FOLDER == 0:
                os.mkdir(place)
            with open(f"{place}/{number % FILES_IN_FOLDER:03}", "wb") as out:
                out.write(piece)

    return make_once(os.path.join(os.path.dirname(tree), "small", "tree"), fill)


def print_one_archive(options, source, title, wanted_to_varnex, left_out=(), on_disk=True):
    """One archive of LZ4HC chunks, against Varnex alone."""
    if not has_room(options.memory, ROOM_FOR_ONE_ARCHIVE):
        sys.exit(f"{options.memory} has too little room for {title}")
    archives = pack_all(options.build, source, ["lz4hc"], [])
    rows = {name: row for name, row in make_rows(options.build, ["lz4hc"]).items() if name not in left_out}
    targets = [Target("lz4hc", "varnex-lz4hc", "wall", wanted_to_varnex),
               Target("single-lz4hc", "varnex-lz4hc", "wall", WANTED_ONE_THREAD_TO_VARNEX)]
    print(f"{title} in LZ4HC chunks of 128 KiB")
    print_places(options, archives, source, rows, targets, [make_bound(archives, "lz4hc")], on_disk=on_disk)


def print_huge(options):
    print_one_archive(options, make_huge(options), f"One file of {HUGE_FILE:,} bytes", WANTED_HUGE_TO_VARNEX)


def print_small(options):
    """Only what the target needs, and only in memory: on a disk, making and removing the files would take minutes."""
    title = f"{SMALL_FILES:,} files of at most {SMALL_FILE} bytes"
    print_one_archive(options, make_small(options), title, WANTED_SMALL_TO_VARNEX,
                      left_out=("single-lz4hc", "test-lz4hc"), on_disk=False)
