"""Measures all: scripts/bench runs this once everything is built. docs/performance.md says what the rows mean."""

import argparse
import contextlib
import io
import os
import re
import shutil
import signal
import sys
import tempfile

from compare import print_comparison
from decoder import print_decoders
from flat import print_flatness
from measuring import progress, run
from packing import DEFAULT_FOLDER, KINDS
from zarvo_create import print_packers
from zarvo_extract import print_huge, print_small, print_table
from zarvo_mount import print_mounts

# What --zarvo measures, with the subcommand that each part needs.
ZARVO_PARTS = {
    "table": (print_table, "extract"),
    "huge": (print_huge, "extract"),
    "small": (print_small, "extract"),
    "create": (print_packers, "create"),
    "mount": (print_mounts, "mount"),
}


def roomiest_memory_folder():
    with open("/proc/mounts") as file:
        mounts = [line.split() for line in file]
    folders = [mount[1] for mount in mounts if mount[2] == "tmpfs" and os.access(mount[1], os.W_OK)]
    return max(folders, key=lambda folder: shutil.disk_usage(folder).free, default=None)


def write_docs(name, text):
    """Replaces the text between the two comments of that name in docs/performance.md."""
    path = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "docs", "performance.md")
    with open(path) as file:
        before, begin, rest = file.read().partition(f"<!-- {name}: begin -->\n")
    _, end, after = rest.partition(f"<!-- {name}: end -->")
    if not begin or not end:
        sys.exit(f"docs/performance.md has no place for {name}")
    with open(path, "w") as file:
        file.write(f"{before}<!-- {name}: begin -->\n{text.strip()}\n<!-- {name}: end -->{after}")


def zarvo_parts(options):
    """The asked parts, by their name in docs/performance.md."""
    subcommands = re.findall(r"^  (\w+) ", run([f"{options.build}/zarvo", "--help"]), re.MULTILINE)
    parts = {}
    for name in options.parts.split(","):
        if name not in ZARVO_PARTS:
            sys.exit(f"there is no part {name}: name some of {','.join(ZARVO_PARTS)}")
        print_part, subcommand = ZARVO_PARTS[name]
        if subcommand in subcommands:
            parts[f"bench --zarvo {name}"] = print_part
        else:
            progress(f"leaving out {name}: zarvo has no {subcommand}")
    return parts or sys.exit(1)


def choose_tables(options):
    """The functions that print the asked tables, by their name in docs/performance.md."""
    if options.zarvo:
        return zarvo_parts(options)
    if options.lzma:
        return {"bench --lzma": print_decoders}
    return {"bench --flat": print_flatness} if options.flat else {"bench": print_comparison}


def main():
    temporary = tempfile.gettempdir()
    parser = argparse.ArgumentParser(prog="scripts/bench",
                                     description="Measures Varnex and zarvo, and prints Markdown tables.")
    parser.add_argument("folder", nargs="?", help=f"what to pack (default: a part of {DEFAULT_FOLDER})")
    what = parser.add_mutually_exclusive_group()
    what.add_argument("--flat", action="store_true",
                      help="instead of comparing Varnex, measure its cost per file and per byte as their number grows")
    what.add_argument("--zarvo", action="store_true", help="instead of comparing Varnex, compare zarvo")
    what.add_argument("--lzma", action="store_true", help="instead of comparing Varnex, compare decoders of LZMA")
    parser.add_argument("--parts", default=",".join(ZARVO_PARTS),
                        help="with --zarvo, only these parts (default: %(default)s)")
    parser.add_argument("--write-docs", action="store_true", help="also put the tables into docs/performance.md")
    parser.add_argument("--kinds", default=",".join(KINDS),
                        help="only these archives, and those they are compared with (default: %(default)s)")
    parser.add_argument("--rounds", type=int, help="how often each command runs (default: 7, and 4 with --zarvo)")
    parser.add_argument("--scratch", default=f"{temporary}/varnex-bench",
                        help="where packed archives are kept (default: %(default)s)")
    parser.add_argument("--memory", default=roomiest_memory_folder(),
                        help="a folder on a memory file system (default: the one with most room, %(default)s)")
    parser.add_argument("--disk", default=temporary, help="a folder on a disk, or '' not to measure it")
    parser.add_argument("--build", help=argparse.SUPPRESS)
    options = parser.parse_args()
    options.kinds = options.kinds.split(",")
    options.rounds = options.rounds or (4 if options.zarvo else 7)
    if not options.memory:
        sys.exit("there is no writable memory file system: name one with --memory")
    os.makedirs(options.scratch, exist_ok=True)
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(1))  # so that folders and mounts are removed
    for name, print_tables in choose_tables(options).items():
        text = io.StringIO()
        with contextlib.redirect_stdout(text):
            print_tables(options)
        print(text.getvalue(), end="", flush=True)
        if options.write_docs:
            write_docs(name, text.getvalue())


main()
