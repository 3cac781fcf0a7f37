#!/usr/bin/env python3
"""The factory record under kills: a writer killed 1,000 times mid-record, a reader checking
every record it sees (bench/torn_record.cpp, with the daemon's own record functions).

Each kill lands at a random moment within 20 ms of the writer's first record. Printed: the
kills, the reads (and how many of them ran beside a writer), how many kills left a half-made
temporary record behind (proof that they landed mid-record), and the torn and failed reads,
which must be 0. The record lives in a device root under /tmp (a disk, so every flush is a
real one) unless --dir names another place. Exit status 0 only when no read was torn or failed.

    bench/torn_record.py [--build DIR] [--kills N] [--seed N] [--dir DIR]
"""
import argparse
import random
import subprocess
import sys
import tempfile
from pathlib import Path

REPO = Path(__file__).resolve().parents[1]


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--build", type=Path, default=REPO / "build", help="holds libatcid_lib.a")
    parser.add_argument("--kills", type=int, default=1000)
    parser.add_argument("--seed", type=int, default=None)
    parser.add_argument("--dir", type=Path, default=None)
    args = parser.parse_args()
    seed = args.seed if args.seed is not None else random.randrange(1 << 31)
    helper = args.build.resolve() / "torn_record"
    subprocess.run(["g++", "-std=c++20", "-O2", f"-I{REPO}", str(REPO / "bench/torn_record.cpp"),
                    str(args.build.resolve() / "libatcid_lib.a"), "-lz", "-pthread", "-o", str(helper)],
                   check=True)
    with tempfile.TemporaryDirectory(prefix="torn_record.", dir=args.dir) as root:
        (Path(root) / "persist").mkdir()
        print(f"seed {seed}; record in {root}/persist", flush=True)
        sys.exit(subprocess.run([str(helper), root, str(args.kills), str(seed)]).returncode)


if __name__ == "__main__":
    main()
