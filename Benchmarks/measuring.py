"""Runs commands and measures their cost. Extractors run in a folder that holds the archives, and write below it."""

import os
import shutil
import statistics
import subprocess
import sys
from collections import namedtuple

Sample = namedtuple("Sample", "wall user system peak")  # seconds, seconds, seconds, KiB
Row = namedtuple("Row", "title archive command output")


def run(command, **options):
    done = subprocess.run(command, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, **options)
    if done.returncode != 0:
        sys.exit(f"{' '.join(map(str, command))} failed:\n{done.stdout.decode(errors='replace')[-2000:]}")
    return done.stdout.decode(errors="replace")


def prepare(row, folder):
    output = os.path.join(folder, row.output)
    if row.command[0] == "tar":
        os.mkdir(output)
    return output


def discard(output, spent):
    """Frees the space of what a command has made. If spent is a folder, the emptied files are moved there, not removed:
    ext4 searches recently deleted inodes for each new file, which would dominate the measurement."""
    if spent is None:
        shutil.rmtree(output, ignore_errors=True)
        return
    for parent, _, names in os.walk(output):
        for name in names:
            path = os.path.join(parent, name)
            os.chmod(path, 0o600)
            os.truncate(path, 0)
    os.rename(output, os.path.join(spent, str(len(os.listdir(spent)))))


def measure(build, row, folder, spent=None):
    output = prepare(row, folder)
    os.sync()
    words = run([f"{build}/Benchmarks/Measure", *row.command], cwd=folder).split()
    if words[4] != "0":
        sys.exit(f"{' '.join(row.command)} ended with status {words[4]}")
    discard(output, spent)
    return Sample(*map(float, words[:4]))


def verify(row, folder, tree, spent):
    output = prepare(row, folder)
    run(row.command, cwd=folder)
    run(["diff", "-rq", "--no-dereference", tree, output])
    discard(output, spent)


def count_calls(row, folder):
    output = prepare(row, folder)
    run(["strace", "-c", "-f", "-o", "calls", *row.command], cwd=folder)
    discard(output, None)
    with open(f"{folder}/calls") as file:
        total = file.read().splitlines()[-1].split()
    return int(total[3])


def median(samples):
    return Sample(*map(statistics.median, zip(*samples)))


def cpu(cost):
    return cost.user + cost.system


def table(head, lines):
    print("\n| " + " | ".join(head) + " |")
    print("| --- |" + " ---: |" * (len(head) - 1))
    for line in lines:
        print("| " + " | ".join(line) + " |")
