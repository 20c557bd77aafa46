"""Measures whether the cost per file and per byte stays the same as one archive holds more of them."""

import shutil
import tempfile

from compare import varnex_row
from measuring import count_calls, cpu, has_room, measure, median, progress, run
from packing import make_tree, write_data
from tables import table

FILE_COUNTS = [1_000, 10_000, 100_000, 1_000_000]
FILES_WITH_COUNTED_CALLS = 10_000  # strace slows calls down a lot
BYTE_COUNTS = [10_000_000, 100_000_000, 1_000_000_000, 4 << 30]
ARCHIVE = "flat.zarvo"


def measure_archive(options, kind, source, counts_calls=False):
    """Packs the source on the disk. Returns the median cost of extracting it in memory, and the system calls."""
    row = varnex_row("", options.build, ARCHIVE)
    with tempfile.TemporaryDirectory(prefix="varnex-flat-", dir=options.memory) as folder:
        with tempfile.TemporaryDirectory(dir=options.scratch) as packed:
            run([f"{options.build}/Benchmarks/PackFolder", kind, str(source), f"{packed}/{ARCHIVE}"])
            shutil.copyfile(f"{packed}/{ARCHIVE}", f"{folder}/{ARCHIVE}")
        calls = count_calls(row, folder) if counts_calls else None
        return median([measure(options.build, row, folder) for _ in range(options.rounds)]), calls


def print_flatness(options):
    lines = []
    for count in FILE_COUNTS:
        progress(f"{count:,} empty files")
        cost, calls = measure_archive(options, "stored", count, count <= FILES_WITH_COUNTED_CALLS)
        lines.append([f"{count:,}", f"{cost.wall:.3f}", f"{cost.wall / count * 1e6:.2f}",
                      f"{cpu(cost) / count * 1e6:.2f}", f"{cost.peak / 1024:.1f}",
                      f"{calls / count:.2f}" if calls else ""])
    print(f"Empty files in folders of 1,000, on a memory file system, medians of {options.rounds} rounds:")
    table(["files", "wall, s", "wall per file, µs", "processor per file, µs", "peak, MiB", "system calls per file"], lines)

    tree = make_tree(options)
    lines = []
    for size in BYTE_COUNTS:
        if not has_room(options.memory, 2.1 * size):  # the archive and the extracted file
            progress(f"no room for {size:,} bytes")
            continue
        with tempfile.TemporaryDirectory(dir=options.scratch) as source:
            write_data(tree, f"{source}/data", size)
            costs = []
            for kind in ("stored", "lz4hc"):
                progress(f"{size:,} bytes, {kind}")
                costs.append(measure_archive(options, kind, source)[0])
        lines.append([f"{size:,}"] + [text for cost in costs for text in
                                      (f"{cost.wall:.3f}", f"{cost.wall / size * 1e9:.3f}",
                                       f"{cpu(cost) / size * 1e9:.3f}", f"{cost.peak / 1024:.1f}")])
    print("\nOne file, in blocks of 128 KiB:")
    costs = ["wall, s", "wall per byte, ns", "processor per byte, ns", "peak, MiB"]
    table(["bytes"] + ["stored: " + cost for cost in costs] + ["LZ4HC: " + cost for cost in costs], lines)
