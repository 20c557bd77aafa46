"""Compares Varnex with other extractors: packs a folder, extracts the archives in turn, prints what each costs."""

from measuring import Row, file_system_of, measure_in, sizes_of
from packing import KINDS, MIB, PEERS, describe_tree, make_tree, pack_all, sizes_from_plan
from tables import Bound, Target, describe_machine, print_costs, print_ratios, print_targets

COMPARED = ["squashfs-lz4hc", "squashfs-xz", "erofs", "7z-128k", "7z-8m", "tar"]

# On the memory file system. Every row also has its floor.
WANTED_WALL_TO_FLOOR = 1.15
WANTED = [
    Target("lz4hc", "erofs", "wall", 0.90),
    Target("lz4hc", "tar", "wall", 1.00),
    Target("lz4hc", "squashfs-lz4hc", "wall", 0.75),
    Target("lz4hc", "squashfs-lz4hc", "processor", 0.50),
    Target("lzma", "7z-128k", "wall", 1.05),
    Target("streamed", "7z-8m", "wall", 1.05),
    Target("web", "7z-8m", "wall", 1.05),
    Target("stored", "tar", "wall", 1.00),
    Target("raw", "tar", "wall", 1.00),
]


def peer_rows(peers, threads):
    """The rows of other extractors."""
    return {name: Row(peer.title.format(threads=threads), peer.archive,
                      peer.extract.format(archive=peer.archive, threads=threads).split(), "out")
            for name, peer in PEERS.items() if name in peers}


def varnex_row(title, build, archive):
    return Row(title, archive, [f"{build}/Varnex", archive], archive + "_data")


def asked_peers(kinds, peers, targets):
    """All peers, or if only some kinds are asked for, those that targets compare them with."""
    return [peer for peer in peers
            if len(kinds) == len(KINDS) or any(target.against == peer and target.row in kinds for target in targets)]


def make_rows(build, kinds, peers):
    rows = {}
    for kind in kinds:
        title, archive = KINDS[kind], f"{kind}.zarvo"
        rows[kind] = varnex_row(f"**{title}**", build, archive)
        rows["floor-" + kind] = Row(f"floor of {title}", archive, [f"{build}/Benchmarks/Floor", archive, "out"], "out")
    return rows | peer_rows(peers, 1)


def make_bound(archives, kind):
    block, directory = sizes_from_plan(archives, kind)
    return Bound(kind, "8 MiB + 2 blocks + directory", 8 * MIB + 2 * block + directory)


def print_comparison(options):
    tree = make_tree(options)
    kinds = options.kinds
    peers = asked_peers(kinds, COMPARED, WANTED)
    archives = pack_all(options.build, tree, kinds, peers)
    rows = make_rows(options.build, kinds, peers)
    print(f"{describe_tree(tree)}; medians of {options.rounds} rounds")
    describe_machine()
    places = [(options.memory, "a memory file system", True)]
    if options.disk:
        places.append((options.disk, f"the disk ({file_system_of(options.disk)})", False))
    for parent, title, is_memory in places:
        medians, calls = measure_in(parent, options.build, archives, tree, rows, options.rounds, is_memory)
        print(f"\n#### On {title}")
        print_costs(rows, sizes_of(archives, rows), medians, calls)
        print_ratios(medians, ["floor", *(rows[peer].title for peer in peers)],
                     [(f"**{KINDS[kind]}**", kind, ["floor-" + kind, *peers]) for kind in kinds])
        if is_memory:
            floors = [Target(kind, "floor-" + kind, "wall", WANTED_WALL_TO_FLOOR) for kind in kinds]
            print_targets(rows, medians, WANTED + floors, [make_bound(archives, kind) for kind in kinds])
