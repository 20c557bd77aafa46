"""Prints what was measured, as Markdown tables."""

import os
import platform
import re
import shutil
from collections import namedtuple

from measuring import cpu, run
from packing import MIB

PACKAGES = ["liblz4-1", "lzma-dev", "squashfs-tools", "squashfuse", "erofs-utils", "7zip", "tar"]

# At most this ratio of the row's cost to another's; the measure is "wall" or "processor".
Target = namedtuple("Target", "row against measure at_most")
# At most these bytes of memory; the text says how they come about.
Bound = namedtuple("Bound", "row text size")


def table(head, lines):
    print("\n| " + " | ".join(head) + " |")
    print("| --- |" + " ---: |" * (len(head) - 1))
    for line in lines:
        print("| " + " | ".join(line) + " |")


def describe_machine():
    with open("/proc/cpuinfo") as file:
        model = re.search(r"model name\s*: (.*)", file.read())
    line = f"{model.group(1) if model else platform.machine()}, {os.cpu_count()} processors, Linux {platform.release()}"
    if shutil.which("dpkg-query"):
        line += "; " + run(["dpkg-query", "-W", "-f", "${Package} ${Version}, ", *PACKAGES]).strip(", ")
    print(f"\n{line}")


def print_costs(rows, sizes, medians, calls):
    """The sizes are those of the archives."""
    head = ["", "archive, MB", "wall, s", "user, s", "system, s", "peak, MiB"] + (["system calls"] if calls else [])
    table(head, [[row.title, f"{sizes[name] / 1e6:.1f}", f"{cost.wall:.3f}", f"{cost.user:.3f}", f"{cost.system:.3f}",
                  f"{cost.peak / 1024:.1f}"] + ([f"{calls[name]:,}"] if calls else [])
                 for name, row in rows.items() for cost in [medians[name]]])


def print_ratios(medians, others, lines):
    """A line is a title, the name of its row, and the names of the rows to compare it with, one per title in others."""
    print("\nRatios of wall time / processor time to each:")
    table(["", *others],
          [[title] + [f"{medians[name].wall / medians[other].wall:.2f} / {cpu(medians[name]) / cpu(medians[other]):.2f}"
                      for other in against]
           for title, name, against in lines])


def met(result, at_most, form="{:.2f}"):
    return [form.format(result), form.format(at_most), "yes" if result <= at_most else "**no**"]


def print_targets(rows, medians, targets, bounds):
    """Leaves out the targets whose rows were not measured."""
    def plain(name):
        return rows[name].title.strip("*")

    costs = {"wall": lambda cost: cost.wall, "processor": cpu}
    lines = [[plain(row), plain(against), measure] +
             met(costs[measure](medians[row]) / costs[measure](medians[against]), at_most)
             for row, against, measure, at_most in targets if row in rows and against in rows]
    lines += [[plain(row), text, "peak, MiB"] + met(medians[row].peak / 1024, size / MIB, "{:.1f}")
              for row, text, size in bounds if row in rows]
    print("\nTargets:")
    table(["", "compared with", "measure", "result", "at most", "met"], lines)
