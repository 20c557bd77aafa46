"""Compares Varnex with other extractors: packs a folder, extracts the archives in turn, prints what each costs."""

import hashlib
import os
import platform
import re
import shutil
import sys
import tempfile
from collections import namedtuple

from measuring import Row, count_calls, cpu, measure, median, run, table, verify

MIB = 1 << 20
DEFAULT_FOLDER = "/usr"
# How much of the default folder is packed. A few very large files would crowd out the rest.
WANTED_BYTES, WANTED_FILES, LARGEST_FILE = 400_000_000, 10_000, 16 * MIB

# Our archives: the name of the kind (see PackFolder.cpp) and its name in the tables.
KINDS = {
    "lz4hc": "LZ4HC chunks",
    "lzma": "LZMA chunks",
    "streamed": "LZMA, streamed",
    "stored": "stored",
    "web": "ZarvoWeb",
    "raw": "ZarvoRaw",
}

# The settings of PackFolder's encoder for 7-Zip: level 4 is the fast mode with 32 fast bytes. There is no filter for
# machine code, and solid blocks are as large as our blocks.
SEVEN_ZIP = "7zz a -bd -mf=off -mmt=1 -ms={size} -m0=LZMA:a=0:fb=32:mf=hc4:d={size} {archive} ."

# Other extractors: the name in the tables, the archive, the command that packs the current folder, and the command that
# extracts into the folder "out".
Peer = namedtuple("Peer", "title archive pack extract")
PEERS = {
    "squashfs-lz4hc": Peer("`unsquashfs -p 1`, lz4hc", "lz4hc.squashfs",
                           "mksquashfs . {archive} -quiet -no-progress -noappend -comp lz4 -Xhc -b 131072",
                           "unsquashfs -no-progress -p 1 -d out {archive}"),
    "squashfs-xz": Peer("`unsquashfs -p 1`, xz", "xz.squashfs",
                        "mksquashfs . {archive} -quiet -no-progress -noappend -comp xz -b 131072",
                        "unsquashfs -no-progress -p 1 -d out {archive}"),
    "erofs": Peer("`fsck.erofs --extract`, lz4hc", "lz4hc.erofs", "mkfs.erofs -zlz4hc -C131072 {archive} .",
                  "fsck.erofs --extract=out {archive}"),
    "7z-128k": Peer("`7zz x -mmt=1`, blocks of 128 KiB", "128k.7z",
                    SEVEN_ZIP.replace("{size}", "128k"), "7zz x -mmt=1 -oout {archive}"),
    "7z-8m": Peer("`7zz x -mmt=1`, blocks of 8 MiB", "8m.7z",
                  SEVEN_ZIP.replace("{size}", "8m"), "7zz x -mmt=1 -oout {archive}"),
    "tar": Peer("`tar xf`", "plain.tar", "tar cf {archive} .", "tar xf {archive} -C out"),
}

# Targets on the memory file system, as ratios: kind, peer, wall time, processor time. Every row also has its floor.
WANTED_WALL_TO_FLOOR = 1.15
WANTED = [
    ("lz4hc", "erofs", 0.90, None),
    ("lz4hc", "tar", 1.00, None),
    ("lz4hc", "squashfs-lz4hc", 0.75, 0.50),
    ("lzma", "7z-128k", 1.05, None),
    ("streamed", "7z-8m", 1.05, None),
    ("web", "7z-8m", 1.05, None),
    ("stored", "tar", 1.00, None),
    ("raw", "tar", 1.00, None),
]

# ---- the tree and the archives, kept between runs ----


def choose_files(folder, is_default):
    """The regular files in the order of a sorted walk; of the default folder, only as many as are wanted."""
    count = size = 0
    for parent, folders, names in os.walk(folder):
        folders.sort()
        for name in sorted(names):
            path = os.path.join(parent, name)
            if is_default and count >= WANTED_FILES and size >= WANTED_BYTES:
                return
            if "\n" in path or os.path.islink(path) or not os.path.isfile(path) or not os.access(path, os.R_OK):
                continue
            if is_default and os.path.getsize(path) > LARGEST_FILE:
                continue
            count += 1
            size += os.path.getsize(path)
            yield path


def make_tree(folder, is_default, scratch):
    """Copies the files once, so that all packers see the same tree. Returns its folder, which has no empty folders."""
    listing = [f"{os.path.getsize(path)} {path}" for path in choose_files(folder, is_default)]
    if not listing:
        sys.exit(f"{folder} holds no file")
    name = hashlib.sha256("\n".join(listing).encode(errors="surrogateescape")).hexdigest()[:12]
    tree = os.path.join(scratch, name, "tree")
    if not os.path.exists(tree):
        shutil.rmtree(tree + ".part", ignore_errors=True)
        for line in listing:
            path = line.split(" ", 1)[1]
            copy = os.path.join(tree + ".part", os.path.relpath(path, folder))
            os.makedirs(os.path.dirname(copy), exist_ok=True)
            shutil.copyfile(path, copy)
        os.rename(tree + ".part", tree)
    return tree


def pack(build, tree, archive, command=None, kind=None):
    """Makes an archive unless an earlier run has made it."""
    if os.path.exists(archive):
        return
    print(f"packing {os.path.basename(archive)}", file=sys.stderr, flush=True)
    part = archive + ".part"
    for leftover in (part, part + ".plan"):
        if os.path.exists(leftover):
            os.remove(leftover)
    if kind:
        run([f"{build}/Benchmarks/PackFolder", kind, tree, part])
        os.rename(part + ".plan", archive + ".plan")
    else:
        run([word.format(archive=part) for word in command.split()], cwd=tree)
        if not os.path.exists(part):
            os.rename(part + ".7z", part)
    os.rename(part, archive)


def pack_all(build, tree, kinds, peers):
    archives = os.path.join(os.path.dirname(tree), "archives")
    os.makedirs(archives, exist_ok=True)
    for kind in kinds:
        pack(build, tree, f"{archives}/{kind}.zarvo", kind=kind)
    for peer in peers:
        pack(build, tree, f"{archives}/{PEERS[peer].archive}", command=PEERS[peer].pack)
    return archives


def make_rows(build, kinds, peers):
    rows = {}
    for kind in kinds:
        title, archive = KINDS[kind], f"{kind}.zarvo"
        rows[kind] = Row(f"**{title}**", archive, [f"{build}/Varnex", archive], archive + "_data")
        rows["floor-" + kind] = Row(f"floor of {title}", archive, [f"{build}/Benchmarks/Floor", archive, "out"], "out")
    for name in peers:
        peer = PEERS[name]
        rows[name] = Row(peer.title, peer.archive, peer.extract.format(archive=peer.archive).split(), "out")
    return rows


# ---- measuring ----


def place(archives, rows, folder):
    """Puts the archives and their plans on the measured file system, as links where possible."""
    names = {row.archive for row in rows.values()}
    for name in names | {name + ".plan" for name in names if os.path.exists(f"{archives}/{name}.plan")}:
        try:
            os.link(f"{archives}/{name}", f"{folder}/{name}")
        except OSError:
            shutil.copyfile(f"{archives}/{name}", f"{folder}/{name}")


def measure_in(parent, build, archives, tree, rows, rounds, is_memory):
    """Compares each extracted tree with the source; then returns each row's medians and, in memory, its system calls."""
    samples = {name: [] for name in rows}
    calls = {}
    with tempfile.TemporaryDirectory(prefix="varnex-bench-", dir=parent) as folder:
        place(archives, rows, folder)
        files = sum(len(names) for _, _, names in os.walk(tree))
        spent = None
        if not is_memory and os.statvfs(folder).f_favail > 2 * files * len(rows) * (rounds + 1):
            spent = f"{folder}/spent"
            os.mkdir(spent)
        for name, row in rows.items():
            verify(row, folder, tree, spent)
            if is_memory:
                calls[name] = count_calls(row, folder)
        for number in range(rounds):
            print(f"{parent}: round {number + 1} of {rounds}", file=sys.stderr, flush=True)
            for name, row in rows.items():
                samples[name].append(measure(build, row, folder, spent))
    return {name: median(taken) for name, taken in samples.items()}, calls


# ---- tables ----


def print_costs(rows, archives, medians, calls):
    head = ["", "archive, MB", "wall, s", "user, s", "system, s", "peak, MiB"] + (["system calls"] if calls else [])
    table(head, [[row.title, f"{os.path.getsize(f'{archives}/{row.archive}') / 1e6:.1f}", f"{cost.wall:.3f}",
                  f"{cost.user:.3f}", f"{cost.system:.3f}", f"{cost.peak / 1024:.1f}"] +
                 ([f"{calls[name]:,}"] if calls else [])
                 for name, row in rows.items() for cost in [medians[name]]])


def print_ratios(medians, kinds, peers):
    print("\nRatios of wall time / processor time to each:")
    table([""] + ["floor"] + [PEERS[peer].title for peer in peers],
          [[f"**{KINDS[kind]}**"] + [f"{medians[kind].wall / medians[other].wall:.2f} / "
                                     f"{cpu(medians[kind]) / cpu(medians[other]):.2f}"
                                     for other in ["floor-" + kind, *peers]]
           for kind in kinds])


def memory_bound(plan):
    """8 MiB, twice the largest block, and the directory: 64 bytes per node, and paths of more than 31 bytes."""
    block = directory = 0
    with open(plan, errors="surrogateescape") as file:
        for line in file:
            words = line.rstrip("\n").split(" ", 4)
            if words[0] == "block":
                block = max(block, int(words[2]))
            elif words[0] == "node":
                path = len(words[4].encode(errors="surrogateescape"))
                directory += 64 + (path + 1 if path > 31 else 0)
    return 8 * MIB + 2 * block + directory


def print_wanted(archives, medians, kinds):
    def line(kind, against, what, is_at, at_most, form="{:.2f}"):
        verdict = "yes" if is_at <= at_most else "**no**"
        return [KINDS[kind], against, what, form.format(is_at), form.format(at_most), verdict]

    lines = []
    for kind, peer, wall, processor in WANTED:
        if kind not in kinds:
            continue
        ours, theirs = medians[kind], medians[peer]
        lines.append(line(kind, PEERS[peer].title, "wall", ours.wall / theirs.wall, wall))
        if processor:
            lines.append(line(kind, PEERS[peer].title, "processor", cpu(ours) / cpu(theirs), processor))
    for kind in kinds:
        ours, floor = medians[kind], medians["floor-" + kind]
        lines.append(line(kind, "its floor", "wall", ours.wall / floor.wall, WANTED_WALL_TO_FLOOR))
        lines.append(line(kind, "8 MiB + 2 blocks + directory", "peak, MiB", ours.peak / 1024,
                          memory_bound(f"{archives}/{kind}.zarvo.plan") / MIB, "{:.1f}"))
    print("\nTargets:")
    table(["", "compared with", "measure", "result", "at most", "met"], lines)


def describe_machine():
    with open("/proc/cpuinfo") as file:
        model = re.search(r"model name\s*: (.*)", file.read())
    line = f"{model.group(1) if model else platform.machine()}, {os.cpu_count()} processors, Linux {platform.release()}"
    if shutil.which("dpkg-query"):
        packages = ["liblz4-1", "lzma-dev", "squashfs-tools", "erofs-utils", "7zip", "tar"]
        line += "; " + run(["dpkg-query", "-W", "-f", "${Package} ${Version}, ", *packages]).strip(", ")
    print(f"\n{line}")


def file_system_of(folder):
    return run(["findmnt", "-n", "-o", "FSTYPE", "-T", folder]).strip()


def print_comparison(options):
    is_default = options.folder is None
    tree = make_tree(os.path.abspath(options.folder or DEFAULT_FOLDER), is_default, options.scratch)
    kinds = options.kinds.split(",") if options.kinds else list(KINDS)
    peers = [peer for peer in PEERS
             if not options.kinds or any(kind in kinds and peer == against for kind, against, *_ in WANTED)]
    archives = pack_all(options.build, tree, kinds, peers)
    rows = make_rows(options.build, kinds, peers)
    sizes = [os.path.getsize(os.path.join(parent, name)) for parent, _, names in os.walk(tree) for name in names]
    print(f"{len(sizes):,} files, {sum(sizes) / 1e6:.0f} MB; medians of {options.rounds} rounds")
    describe_machine()
    places = [(options.memory, "a memory file system", True)]
    if options.disk:
        places.append((options.disk, f"the disk ({file_system_of(options.disk)})", False))
    for parent, title, is_memory in places:
        medians, calls = measure_in(parent, options.build, archives, tree, rows, options.rounds, is_memory)
        print(f"\n### On {title}")
        print_costs(rows, archives, medians, calls)
        print_ratios(medians, kinds, peers)
        if is_memory:
            print_wanted(archives, medians, kinds)
