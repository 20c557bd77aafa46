"""Reads a file at random places: random_reads.py FILE COUNT. The places are the same in each run."""

import os
import random
import sys

SIZE = 4096

places = random.Random(1)
file = os.open(sys.argv[1], os.O_RDONLY)
pages = os.fstat(file).st_size // SIZE
for _ in range(int(sys.argv[2])):
    if len(os.pread(file, SIZE, places.randrange(pages) * SIZE)) != SIZE:
        sys.exit("a read was short")
