"""Measures Varnex: scripts/bench runs this once everything is built. docs/performance.md says what the rows mean."""

import argparse
import contextlib
import io
import os
import shutil
import sys
import tempfile

from compare import print_comparison
from flat import print_flatness
from packing import DEFAULT_FOLDER, KINDS


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


def main():
    temporary = tempfile.gettempdir()
    parser = argparse.ArgumentParser(prog="scripts/bench", description="Measures Varnex and prints Markdown tables.")
    parser.add_argument("folder", nargs="?", help=f"what to pack (default: a part of {DEFAULT_FOLDER})")
    parser.add_argument("--flat", action="store_true",
                        help="instead of comparing, measure the cost per file and per byte as their number grows")
    parser.add_argument("--write-docs", action="store_true", help="also put the tables into docs/performance.md")
    parser.add_argument("--kinds", default=",".join(KINDS),
                        help="only these archives, and those they are compared with (default: %(default)s)")
    parser.add_argument("--rounds", type=int, default=7)
    parser.add_argument("--scratch", default=f"{temporary}/varnex-bench", help="where packed archives are kept (default: %(default)s)")
    parser.add_argument("--memory", default=roomiest_memory_folder(),
                        help="a folder on a memory file system (default: the one with most room, %(default)s)")
    parser.add_argument("--disk", default=temporary, help="a folder on a disk, or '' not to measure it")
    parser.add_argument("--build", help=argparse.SUPPRESS)
    options = parser.parse_args()
    options.kinds = options.kinds.split(",")
    if not options.memory:
        sys.exit("there is no writable memory file system: name one with --memory")
    os.makedirs(options.scratch, exist_ok=True)
    text = io.StringIO()
    with contextlib.redirect_stdout(text):
        if options.flat:
            print_flatness(options)
        else:
            print_comparison(options)
    print(text.getvalue(), end="")
    if options.write_docs:
        write_docs("bench --flat" if options.flat else "bench", text.getvalue())


main()
