"""Tests, or extracts, any number of archives with Dask, and prints what failed.

    python3 TestManyArchives.py [--scheduler ADDRESS] [--extract FOLDER] URL...

A URL is whatever fsspec takes. Without a scheduler's address, two worker processes run on this machine. A worker that
dies is replaced, and its archives go to others.
"""

import argparse
import os

import fsspec
from distributed import Client, as_completed


def work(url, folder):
    archive = fsspec.filesystem("zarvo", fo=url).archive
    if folder is not None:
        archive.extract(os.path.join(folder, os.path.basename(url) + "_data"), threads=1)
    elif damaged := archive.test(threads=1).damaged:
        raise ValueError(f"{len(damaged)} damaged files, the first is {damaged[0].path}")


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--scheduler")
    parser.add_argument("--extract", metavar="FOLDER", type=os.path.abspath)
    parser.add_argument("urls", metavar="URL", nargs="+")
    arguments = parser.parse_args()
    if arguments.extract and len({os.path.basename(url) for url in arguments.urls}) < len(arguments.urls):
        parser.error("archives of the same name would share a folder")
    local = {"n_workers": 2, "threads_per_worker": 1}
    with Client(arguments.scheduler) if arguments.scheduler else Client(**local) as client:
        runs = {client.submit(work, url, arguments.extract, retries=2): url for url in arguments.urls}
        failed = {runs[run]: run.exception() for run in as_completed(runs) if run.status != "finished"}
    for url, error in failed.items():
        print(f"{url}\t{type(error).__name__}\t{error}")
    print(f"{len(runs)} archives, {len(failed)} failed")
    return 1 if failed else 0


if __name__ == "__main__":
    raise SystemExit(main())
