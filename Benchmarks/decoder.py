"""Compares decoders of LZMA: collects files from the tree, and prints what LzmaSpeed measures as a table."""

import os
import random
import re
import tempfile
import zlib

from measuring import progress, run
from packing import files_of, make_tree
from tables import describe_machine, met, table

MOST = 8 << 20  # LzmaSpeed takes no more of a file
FIRST, OURS, SEVEN_ZIP = "LzmaDec gcc -O2", "ours", "7zz -mmt=1"
WANTED_TO_FIRST = {"text": 0.70, "programs": 0.70, "mixed": 0.70, "high ratio": 0.90}
WANTED_TO_SEVEN_ZIP = 0.75
WANTED_FORMS = ["blocks of 128 KiB", "one stream"]


def is_text(data):
    return b"\0" not in data[:4096]


def shrinks_well(data):
    return len(zlib.compress(data, 1)) * 10 < len(data)


# Which of the tree's files go into which data. Files that shrink well are left out of the text.
CHOICES = {
    "text": lambda data: is_text(data) and not shrinks_well(data),
    "programs": lambda data: data.startswith(b"\x7fELF"),
    "mixed": lambda data: True,
    "high ratio": shrinks_well,
}


def collect(tree, folder):
    """Writes 8 MiB of each kind of data, or less if the tree holds less. Returns the file of each name."""
    paths = list(files_of(tree))
    random.Random(1).shuffle(paths)  # a part of the tree's order would be files of one package
    collected = {name: b"" for name in CHOICES}
    for path in paths:
        with open(path, "rb") as file:
            data = file.read(1 << 20)
        for name, suits in CHOICES.items():
            if len(collected[name]) < MOST and data and suits(data):
                collected[name] += data
    collected["noise"] = random.Random(2).randbytes(MOST)
    for name, data in collected.items():
        with open(f"{folder}/{name}", "wb") as out:
            out.write(data[:MOST])
    return [f"{folder}/{name}" for name in collected if collected[name]]


def parse(text):
    """What LzmaSpeed has printed of one file: how far it is packed, and milliseconds a megabyte by form and decoder."""
    forms = {}
    for line in text.splitlines()[1:]:
        if cost := re.match(r"  (.+?) +([0-9.]+) ms/MB", line):
            forms[form][cost.group(1)] = float(cost.group(2))
        else:
            form = line.strip()
            forms[form] = {}
    return re.search(r"packed to ([0-9.]+)", text).group(1), forms


def print_decoders(options):
    tree = make_tree(options)
    costs, targets = [], []
    with tempfile.TemporaryDirectory(prefix="varnex-bench-", dir=options.memory) as folder:
        for path in collect(tree, folder):
            name = os.path.basename(path)
            progress(f"decoding {name}")
            speed = [f"{options.build}/Benchmarks/LzmaSpeed", "--rounds", str(options.rounds + 1), path]  # one warms up
            packed, forms = parse(run(speed))
            for form, times in forms.items():
                costs.append((name, packed, form, times))
                if name in WANTED_TO_FIRST and form in WANTED_FORMS:
                    against = [(FIRST, WANTED_TO_FIRST[name]), (SEVEN_ZIP, WANTED_TO_SEVEN_ZIP)]
                    targets += [[name, form, other] + met(times[OURS] / times[other], at_most)
                                for other, at_most in against if other in times]
    decoders = list(dict.fromkeys(decoder for *_, times in costs for decoder in times))
    print(f"Milliseconds of processor time per megabyte of data / ratio to {FIRST}; medians of {options.rounds} rounds")
    describe_machine()
    table(["", "packed to", "form", *decoders],
          [[name, packed, form] + [f"{time:.2f} / {time / times[FIRST]:.2f}" if time else "" for time in
                                   map(times.get, decoders)]
           for name, packed, form, times in costs])
    print("\nTargets of our decoder:")
    table(["", "form", "compared with", "result", "at most", "met"], targets)
