"""Makes the tree that is measured, and the archives of it. Both are kept between runs."""

import hashlib
import os
import shutil
import sys
from collections import namedtuple

from measuring import progress, run

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
WITH_COMPRESSED_DIRECTORY = {"lz4hc", "lzma", "streamed"}

# The settings of PackFolder's encoder for 7-Zip: level 4 is the fast mode with 32 fast bytes. There is no filter for
# machine code. Blocks are as large as ours: solid blocks of LZMA, which 7-Zip extracts in one thread, or the blocks of
# one LZMA2 stream, which it packs and extracts in as many threads as it is given. So are dictionaries: as large as a
# block, but at most the 4 MiB of that level.
SEVEN_ZIP = "7zz a -bd -mf=off -mmt=1 -ms={size} -m0=LZMA:a=0:fb=32:mf=hc4:d={dictionary} {archive} ."
SEVEN_ZIP_2 = "7zz a -bd -mf=off -mmt=2 -ms=on -m0=LZMA2:a=0:fb=32:mf=hc4:d={dictionary}:c={size} {archive} ."
SEVEN_ZIP_EXTRACT = "7zz x -mmt={threads} -oout {archive}"


def seven_zip(command, size, dictionary):
    return command.replace("{size}", size).replace("{dictionary}", dictionary)


SQUASHFS = "mksquashfs . {archive} -quiet -no-progress -noappend -processors 2 -b 131072 -comp "
SQUASHFS_EXTRACT = "unsquashfs -no-progress -p {threads} -d out {archive}"

# Other programs: the name in the tables, the archive, the command that packs the current folder, and the command that
# extracts into the folder "out".
Peer = namedtuple("Peer", "title archive pack extract")
PEERS = {
    "squashfs-lz4hc": Peer("`unsquashfs -p {threads}`, lz4hc", "lz4hc.squashfs", SQUASHFS + "lz4 -Xhc",
                           SQUASHFS_EXTRACT),
    "squashfs-xz": Peer("`unsquashfs -p {threads}`, xz", "xz.squashfs", SQUASHFS + "xz", SQUASHFS_EXTRACT),
    "erofs": Peer("`fsck.erofs --extract`, lz4hc", "lz4hc.erofs", "mkfs.erofs -zlz4hc,9 -C131072 {archive} .",
                  "fsck.erofs --extract=out {archive}"),
    "7z-128k": Peer("`7zz x -mmt={threads}`, blocks of 128 KiB", "128k.7z", seven_zip(SEVEN_ZIP, "128k", "128k"),
                    SEVEN_ZIP_EXTRACT),
    "7z-8m": Peer("`7zz x -mmt={threads}`, blocks of 8 MiB", "8m.7z", seven_zip(SEVEN_ZIP, "8m", "4m"),
                  SEVEN_ZIP_EXTRACT),
    "7z2-128k": Peer("`7zz x -mmt={threads}`, LZMA2 blocks of 128 KiB", "128k-lzma2.7z",
                     seven_zip(SEVEN_ZIP_2, "128k", "128k"), SEVEN_ZIP_EXTRACT),
    "7z2-8m": Peer("`7zz x -mmt={threads}`, LZMA2 blocks of 8 MiB", "8m-lzma2.7z", seven_zip(SEVEN_ZIP_2, "8m", "4m"),
                   SEVEN_ZIP_EXTRACT),
    "tar": Peer("`tar xf`", "plain.tar", "tar cf {archive} .", "tar xf {archive} -C out"),
}

# ---- trees ----


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


def make_once(folder, fill):
    """Makes a folder by calling fill with its name, unless an earlier run has made it. Returns the name."""
    if not os.path.exists(folder):
        shutil.rmtree(folder + ".part", ignore_errors=True)
        os.makedirs(folder + ".part")
        fill(folder + ".part")
        os.rename(folder + ".part", folder)
    return folder


def make_tree(options):
    """Copies the files once, so that all packers see the same tree. Returns its folder, which has no empty folders."""
    folder = os.path.abspath(options.folder or DEFAULT_FOLDER)
    listing = [f"{os.path.getsize(path)} {path}" for path in choose_files(folder, options.folder is None)]
    if not listing:
        sys.exit(f"{folder} holds no file")

    def fill(tree):
        for line in listing:
            path = line.split(" ", 1)[1]
            copy = os.path.join(tree, os.path.relpath(path, folder))
            os.makedirs(os.path.dirname(copy), exist_ok=True)
            shutil.copyfile(path, copy)

    name = hashlib.sha256("\n".join(listing).encode(errors="surrogateescape")).hexdigest()[:12]
    return make_once(os.path.join(options.scratch, name, "tree"), fill)


def files_of(tree):
    """The paths of all files, in the order of a sorted walk."""
    for parent, folders, names in os.walk(tree):
        folders.sort()
        for name in sorted(names):
            yield os.path.join(parent, name)


def describe_tree(tree):
    sizes = [os.path.getsize(path) for path in files_of(tree)]
    return f"{len(sizes):,} files, {sum(sizes) / 1e6:.0f} MB"


def write_data(tree, path, size):
    """Writes a file of that size: the tree's files one after another, repeated."""
    with open(path, "wb") as out:
        while True:
            for name in files_of(tree):
                with open(name, "rb") as source:
                    out.write(source.read(size - out.tell()))
                if out.tell() == size:
                    return


# ---- archives ----


def pack(build, tree, archive, command=None, kind=None):
    """Makes an archive unless an earlier run has made it."""
    if os.path.exists(archive):
        return
    progress(f"packing {os.path.basename(archive)}")
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
    """Makes the archives of these kinds, and of these other programs. Returns their folder."""
    archives = os.path.join(os.path.dirname(tree), "archives")
    os.makedirs(archives, exist_ok=True)
    for kind in kinds:
        pack(build, tree, f"{archives}/{kind}.zarvo", kind=kind)
    for peer in peers:
        pack(build, tree, f"{archives}/{PEERS[peer].archive}", command=PEERS[peer].pack)
    return archives


def sizes_from_plan(archives, kind):
    """The largest block, and the directory: 64 bytes per node, and paths of more than 31 bytes.

    A directory that is compressed is also held as it is stored, decompressed, when it is read.
    """
    block = directory = stored = 0
    with open(f"{archives}/{kind}.zarvo.plan", errors="surrogateescape") as file:
        for line in file:
            words = line.rstrip("\n").split(" ", 4)
            if words[0] == "block":
                block = max(block, int(words[2]))
            elif words[0] == "node":
                path = len(words[4].encode(errors="surrogateescape"))
                directory += 64 + (path + 1 if path > 31 else 0)
                stored += 21 + path
    return block, directory + (stored if kind in WITH_COMPRESSED_DIRECTORY else 0)
