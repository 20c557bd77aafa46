"""Runs commands and measures their cost. Commands run in a folder that holds the archives, and write below it."""

import os
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
from collections import namedtuple

Sample = namedtuple("Sample", "wall user system peak")  # seconds, seconds, seconds, KiB
# A command of the tables. The output is the file or folder that it makes, or None if it only reads.
Row = namedtuple("Row", "title archive command output")


def progress(text):
    print(text, file=sys.stderr, flush=True)


def run(command, **options):
    done = subprocess.run(command, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, **options)
    if done.returncode != 0:
        sys.exit(f"{' '.join(map(str, command))} failed:\n{done.stdout.decode(errors='replace')[-2000:]}")
    return done.stdout.decode(errors="replace")


# ---- one row ----


def prepare(row, folder):
    if row.output is None:
        return None
    output = os.path.join(folder, row.output)
    if row.command[0] == "tar":
        os.mkdir(output)
    return output


def discard(output, spent):
    """Frees the space of what a command has made. If spent is a folder, the emptied files are moved there, not removed:
    ext4 searches recently deleted inodes for each new file, which would dominate the measurement."""
    if output is None:
        return
    if os.path.isfile(output):
        os.remove(output)
        return
    if spent is None:
        shutil.rmtree(output, ignore_errors=True)
        return
    for parent, _, names in os.walk(output):
        for name in names:
            path = os.path.join(parent, name)
            os.chmod(path, 0o600)
            os.truncate(path, 0)
    os.rename(output, os.path.join(spent, str(len(os.listdir(spent)))))


def parse_measured(text, command):
    """What Benchmarks/Measure prints of a command."""
    words = text.split()
    if len(words) != 5 or words[4] != "0":
        sys.exit(f"{' '.join(command)} failed: {text.strip()}")
    return Sample(*map(float, words[:4]))


def measure(build, row, folder, spent=None):
    output = prepare(row, folder)
    os.sync()
    sample = parse_measured(run([f"{build}/Benchmarks/Measure", *row.command], cwd=folder), row.command)
    discard(output, spent)
    return sample


def verify(row, folder, source, spent=None):
    """Compares what the row's command makes with the source, if it makes something."""
    output = prepare(row, folder)
    run(row.command, cwd=folder)
    if output is not None:
        run(["diff", "-rq", "--no-dereference", source, output])
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


# ---- all rows ----


def place(archives, names, folder):
    """Puts archives and their plans on the measured file system, as links where possible."""
    for name in names | {name + ".plan" for name in names if os.path.exists(f"{archives}/{name}.plan")}:
        try:
            os.link(f"{archives}/{name}", f"{folder}/{name}")
        except OSError:
            shutil.copyfile(f"{archives}/{name}", f"{folder}/{name}")


def sizes_of(archives, rows):
    return {name: os.path.getsize(f"{archives}/{row.archive}") for name, row in rows.items()}


def take_turns(rows, rounds, title, measure_row):
    """Measures all rows in turn, A B C ... A B C ...; returns the median of each."""
    samples = {name: [] for name in rows}
    for number in range(rounds):
        progress(f"{title}: round {number + 1} of {rounds}")
        for name, row in rows.items():
            samples[name].append(measure_row(row))
    return {name: median(taken) for name, taken in samples.items()}


def measure_in(parent, build, archives, source, rows, rounds, counts_calls=False):
    """Compares what each row makes with the source. Returns each row's medians and, if asked, its system calls."""
    calls = {}
    with tempfile.TemporaryDirectory(prefix="varnex-bench-", dir=parent) as folder:
        place(archives, {row.archive for row in rows.values()}, folder)
        spent = None
        files = sum(len(names) for _, _, names in os.walk(source))
        if file_system_of(folder) != "tmpfs" and os.statvfs(folder).f_favail > 2 * files * len(rows) * (rounds + 1):
            spent = f"{folder}/spent"
            os.mkdir(spent)
        for name, row in rows.items():
            verify(row, folder, source, spent)
            if counts_calls:
                calls[name] = count_calls(row, folder)
        medians = take_turns(rows, rounds, parent, lambda row: measure(build, row, folder, spent))
    return medians, calls


# ---- the machine ----


def file_system_of(folder):
    return run(["findmnt", "-n", "-o", "FSTYPE", "-T", folder]).strip()


def has_room(folder, size):
    with open("/proc/meminfo") as file:
        available = int(re.search(r"MemAvailable:\s*(\d+)", file.read()).group(1)) * 1024
    return min(available, shutil.disk_usage(folder).free) > size
