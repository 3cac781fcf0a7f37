#!/usr/bin/env python3
"""The card clearing of AT+JVDF (clear_sdcard) against `rm -rf`, and both against the floor.

Every round builds three copies of one card: 1,000 directories of 100 files and a keep list
that keeps five entries. One copy is cleared by clear_sdcard (the daemon's code, linked into
bench/clear_sdcard_bench.cpp), one is removed by `rm -rf`, and from the third the floor
program removes exactly what clear_sdcard removes, knowing every name in advance: no
directory is read, nothing is done but the removals, so it shows what the file system itself
costs. The three run in turns, in an order that changes every round.

Printed: per round, each side's wall and CPU time and peak resident memory; then medians and
spread (min-max) of the per-round ratios. clear_sdcard's peak memory is a whole process's, its
helper linked with the C++ runtime built in (as atcid-unzip is); the growth of its resident
memory during the walk itself is printed too.

The copies are made in /dev/shm (memory) unless --dir names another place: on a disk the
times are mostly the journal's and the disk's, and swing by several times between rounds.

    bench/clear_sdcard_bench.py [--build DIR] [--rounds N] [--dir DIR]
"""
import argparse
import os
import shutil
import subprocess
import sys
import tempfile
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parent))
from measure import GNU_TIME, ratios, spread, timed  # noqa: E402

REPO = Path(__file__).resolve().parents[1]
KEPT = [".clear_sdcard.cfg", "dir_0500", "dir_0500/file_042.dat", "dir_0500/sub", "top.txt"]


def compile_helper(build: Path) -> Path:
    helper = build / "clear_sdcard_bench"
    subprocess.run(["g++", "-std=c++20", "-O2", f"-I{REPO}", str(REPO / "bench/clear_sdcard_bench.cpp"),
                    str(build / "libatcid_lib.a"), "-lz", "-pthread", "-static-libstdc++", "-static-libgcc",
                    "-o", str(helper)], check=True)
    return helper


def left_on(card: Path):
    return sorted(str(p.relative_to(card)) for p in card.rglob("*")) if card.exists() else None


def measured(argv, rss_file: Path):
    """(wall, CPU, peak KiB) of argv run under GNU time (its own small cost is in every side)."""
    wall, cpu = timed([GNU_TIME, "-f", "%M", "-o", rss_file, *argv])
    return wall, cpu, int(rss_file.read_text().split()[-1])


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--build", type=Path, default=REPO / "build", help="holds libatcid_lib.a")
    parser.add_argument("--rounds", type=int, default=7)
    parser.add_argument("--dir", type=Path, default=Path("/dev/shm") if os.access("/dev/shm", os.W_OK) else None)
    args = parser.parse_args()
    if not Path(GNU_TIME).exists():
        sys.exit(f"{GNU_TIME} (GNU time) is needed for the peak memory")
    helper = compile_helper(args.build.resolve())
    work = Path(tempfile.mkdtemp(prefix="clear_sdcard_bench.", dir=args.dir))
    sides = ("clear_sdcard", "rm -rf", "floor")
    runs = {side: [] for side in sides}
    growth = []
    try:
        print(f"cards in {work}; {args.rounds} rounds")
        for r in range(args.rounds):
            roots = {side: work / f"round{r}-{i}" for i, side in enumerate(sides)}
            for root in roots.values():
                root.mkdir()
                subprocess.run([helper, "build", root], check=True)
            if args.dir is not None and not str(args.dir).startswith("/dev/shm"):
                os.sync()  # the build's writes go out before anything is timed
            report = work / "walk"
            argv = {"clear_sdcard": [helper, "clear", roots["clear_sdcard"], report],
                    "rm -rf": ["/bin/rm", "-rf", roots["rm -rf"] / "storage/sdcard0"],
                    "floor": [helper, "unlink", roots["floor"]]}
            order = sides[r % 3:] + sides[:r % 3]
            line = []
            for side in order:
                wall, cpu, kib = measured(argv[side], work / "rss")
                runs[side].append((wall, cpu, kib))
                line.append(f"{side} {wall:.3f} s CPU {cpu:.3f} s {kib} KiB")
            print(f"round {r + 1}: " + " | ".join(line))
            before, peak = map(int, report.read_text().split())
            growth.append(peak - before)
            for side in ("clear_sdcard", "floor"):
                if left_on(roots[side] / "storage/sdcard0") != KEPT:
                    sys.exit(f"{side} left {left_on(roots[side] / 'storage/sdcard0')}")
            if left_on(roots["rm -rf"] / "storage/sdcard0") is not None:
                sys.exit("rm -rf left the card")
            for root in roots.values():
                shutil.rmtree(root)
    finally:
        shutil.rmtree(work, ignore_errors=True)

    def of(side, k):
        return [run[k] for run in runs[side]]

    print("medians with (min-max); ratios are medians of per-round ratios")
    for side in sides:
        print(f"  {side:13s} wall {spread(of(side, 0))} s   CPU {spread(of(side, 1))} s"
              f"   peak RSS {spread(of(side, 2), '{:.0f}')} KiB")
    for a, b in (("clear_sdcard", "rm -rf"), ("floor", "rm -rf"), ("clear_sdcard", "floor")):
        print(f"  ratio {a} / {b}: CPU {spread(ratios(of(a, 1), of(b, 1)))}"
              f"   wall {spread(ratios(of(a, 0), of(b, 0)))}"
              + (f"   peak memory {spread(ratios(of(a, 2), of(b, 2)))}" if b == "rm -rf" else ""))
    if growth:
        print(f"  clear_sdcard's peak resident memory rose by {spread(growth, '{:.0f}')} KiB during the walk")


if __name__ == "__main__":
    main()
