#!/usr/bin/env python3
"""Open a large zip and extract one entry: atcid-unzip against `unzip -p`, in one run.

Archives: 65,535 entries with names in order, the same entries with names in reverse order,
and 100,000 entries (the reader keeps the 16-bit entry count of the end record, so it indexes
the first 65,535 of those, and the extracted entry is chosen among them). A one-entry archive
gives each tool's cost of starting and ending a process.

Every round runs each tool once on each archive, the tools in turns, so a change of load on a
shared machine hits both alike. Printed per archive: medians and spread (min-max) of wall and
CPU time (user + system), peak resident memory, the median of the per-round ratios
atcid-unzip / unzip -p, and the same ratio less each tool's own start (its one-entry time).
Last, the reverse-order archive against the in-order one, for atcid-unzip.

A third side, the floor (bench/zip_floor.cpp, compiled here and linked as atcid-unzip is),
maps the archive as the reader does and reads one byte of every page, nothing else: what
reading every local header through the mapping costs before any parsing. Its ratio to
`unzip -p` is the best the reader can reach while it keeps the mapping and those checks.

    bench/zip_bench.py [--unzip PATH] [--runs N]
"""
import argparse
import os
import statistics
import subprocess
import sys
import tempfile
import zipfile
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parent))
from measure import peak_kib, ratios, spread, timed  # noqa: E402

REPO = Path(__file__).resolve().parents[1]
UNZIP = "/usr/bin/unzip"


def build(path: Path, count: int, reverse: bool = False):
    order = range(count - 1, -1, -1) if reverse else range(count)
    with zipfile.ZipFile(path, "w", zipfile.ZIP_DEFLATED) as zf:
        for i in order:
            zf.writestr(f"apps/{i:06d}/package.txt", f"entry {i}\n" * (1 + i % 50))
    return f"apps/{min(count, 65_535) // 2:06d}/package.txt"


def compile_floor(out: Path) -> Path:
    source = REPO / "bench/zip_floor.cpp"
    for link in (["-static"], []):  # static as atcid-unzip is, where the static C library exists
        if subprocess.run(["g++", "-O2", *link, str(source), "-o", str(out)]).returncode == 0:
            return out
    sys.exit("cannot compile bench/zip_floor.cpp")


class Case:
    def __init__(self, label, archive, name, tool, floor):
        self.label, self.archive, self.name = label, archive, name
        expected = zipfile.ZipFile(archive).read(name)
        out = archive.with_suffix(".out")
        timed([tool, archive, name, out])
        if out.read_bytes() != expected:
            sys.exit(f"{archive.name}: atcid-unzip extracted other bytes than zipfile")
        # Both write the entry to /dev/null: one to a file it names, the other to its output.
        self.sides = {"atcid-unzip": [tool, archive, name, os.devnull],
                      "unzip -p": [UNZIP, "-p", archive, name],
                      "floor": [floor, archive, name, os.devnull]}
        self.runs = {side: [] for side in self.sides}

    def run_once(self, flip):
        for side in (reversed(self.sides) if flip else self.sides):
            self.runs[side].append(timed(self.sides[side]))

    def cpu(self, side):
        return [cpu for _, cpu in self.runs[side]]

    def wall(self, side):
        return [wall for wall, _ in self.runs[side]]


def report(case, start):
    print(f"{case.label}: {case.archive.stat().st_size / 1e6:.1f} MB, extracting {case.name}")
    rss = {}
    for side, argv in case.sides.items():
        rss[side] = statistics.median(peak_kib(argv) or 0 for _ in range(3))
        print(f"  {side:12s} wall {spread([w * 1e3 for w in case.wall(side)], '{:.2f}')} ms"
              f"   CPU {spread([c * 1e3 for c in case.cpu(side)], '{:.2f}')} ms"
              f"   peak RSS {rss[side] / 1024:.2f} MiB")
    ours, base = "atcid-unzip", "unzip -p"
    for top, bottom in ((ours, base), ("floor", base), (ours, "floor")):
        memory = f"   peak memory {rss[top] / rss[bottom]:.3f}" if rss[bottom] else ""
        print(f"  ratio {top} / {bottom:12s} CPU {spread(ratios(case.cpu(top), case.cpu(bottom)))}"
              f"   wall {spread(ratios(case.wall(top), case.wall(bottom)))}{memory}")
    if start is not None:
        less = [(a - sa) / (b - sb) for a, b, sa, sb in
                zip(case.cpu(ours), case.cpu(base), start.cpu(ours), start.cpu(base))]
        print(f"  same, less each one's start    CPU {spread(less)}")


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--unzip", default=os.environ.get("ATCID_UNZIP") or str(REPO / "build/minzip/atcid-unzip"))
    parser.add_argument("--runs", type=int, default=21)
    args = parser.parse_args()
    with tempfile.TemporaryDirectory() as tmp:
        floor = compile_floor(Path(tmp) / "zip_floor")
        cases = []
        for label, file_name, count, reverse in (
                ("one entry (process start)", "one.zip", 1, False),
                ("65,535 entries in order", "65535.zip", 65_535, False),
                ("65,535 entries in reverse order", "65535-reverse.zip", 65_535, True),
                ("100,000 entries", "100k.zip", 100_000, False)):
            archive = Path(tmp) / file_name
            cases.append(Case(label, archive, build(archive, count, reverse), args.unzip, floor))
        for i in range(args.runs):
            for case in cases:
                case.run_once(flip=i % 2 == 1)
        start, in_order, reverse = cases[0], cases[1], cases[2]
        print(f"{args.runs} rounds; medians with (min-max); ratios are medians of per-round ratios")
        report(start, None)
        for case in cases[1:]:
            report(case, start)
        print("atcid-unzip, reverse order / in order: CPU "
              f"{spread(ratios(reverse.cpu('atcid-unzip'), in_order.cpu('atcid-unzip')))}   wall "
              f"{spread(ratios(reverse.wall('atcid-unzip'), in_order.wall('atcid-unzip')))}")


if __name__ == "__main__":
    main()
