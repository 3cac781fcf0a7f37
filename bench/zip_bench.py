#!/usr/bin/env python3
"""Open a large zip and extract one entry: atcid-unzip against `unzip -p` and Python's zipfile.

Every tool reads the same archive in the same run; the script prints medians and ratios.
The reader keeps the 16-bit entry count of the end record, so of an archive with more than
65,535 entries it indexes the first 65,535; the extracted entry is chosen among those.

    bench/zip_bench.py [--unzip PATH] [--runs N]
"""
import argparse
import os
import statistics
import subprocess
import sys
import tempfile
import time
import zipfile
from pathlib import Path

REPO = Path(__file__).resolve().parents[1]
GNU_TIME = "/usr/bin/time"


def build(path: Path, count: int, reverse: bool = False):
    order = range(count - 1, -1, -1) if reverse else range(count)
    with zipfile.ZipFile(path, "w", zipfile.ZIP_DEFLATED) as zf:
        for i in order:
            zf.writestr(f"apps/{i:06d}/package.txt", f"entry {i}\n" * (1 + i % 50))
    return f"apps/{count // 2:06d}/package.txt"


def timed_child(argv):
    """Wall seconds of one child, output discarded."""
    start = time.perf_counter()
    pid = os.posix_spawn(argv[0], argv, os.environ,
                         file_actions=[(os.POSIX_SPAWN_OPEN, 1, os.devnull, os.O_WRONLY, 0)])
    _, status = os.waitpid(pid, 0)
    elapsed = time.perf_counter() - start
    if os.waitstatus_to_exitcode(status) != 0:
        sys.exit(f"{argv} failed")
    return elapsed


def peak_rss_mib(argv):
    """Peak RSS of one run, through GNU time (a spawned child would inherit this process's peak)."""
    if not Path(GNU_TIME).exists():
        return None
    run = subprocess.run([GNU_TIME, "-f", "%M", *argv], stdout=subprocess.DEVNULL, stderr=subprocess.PIPE,
                         check=True)
    return int(run.stderr.split()[-1]) / 1024


def zipfile_once(path, name):
    start = time.perf_counter()
    with zipfile.ZipFile(path) as zf:
        zf.read(name)
    return time.perf_counter() - start


def measure(label, fn, runs, argv=None):
    secs = statistics.median(fn() for _ in range(runs))
    rss = peak_rss_mib(argv) if argv else None
    print(f"  {label:34s} {secs * 1000:9.2f} ms" + (f"   peak RSS {rss:6.1f} MiB" if rss else ""))
    return secs


def bench(archive: Path, name: str, tool: str, runs: int):
    print(f"{archive.name}: {archive.stat().st_size / 1e6:.1f} MB, extracting {name}")
    expected = zipfile.ZipFile(archive).read(name)
    out = archive.with_suffix(".out")
    ours_argv = [tool, str(archive), name, str(out)]
    subprocess.run(ours_argv, capture_output=True, check=True)
    assert out.read_bytes() == expected, "atcid-unzip extracted other bytes than zipfile"
    unzip_argv = ["/usr/bin/unzip", "-p", str(archive), name]
    ours = measure("atcid-unzip (process)", lambda: timed_child(ours_argv), runs, ours_argv)
    unzip = measure("unzip -p (process)", lambda: timed_child(unzip_argv), runs, unzip_argv)
    empty = measure("/bin/true (process start only)", lambda: timed_child(["/bin/true"]), runs)
    pyzip = measure("zipfile open+read (in process)", lambda: zipfile_once(archive, name), runs)
    print(f"  ratio atcid-unzip / unzip -p      {ours / unzip:6.3f}")
    print(f"  ratio atcid-unzip / zipfile       {ours / pyzip:6.3f}")
    print(f"  same, less process start:  {(ours - empty) / (unzip - empty):6.3f} / {(ours - empty) / pyzip:6.3f}")


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--unzip", default=os.environ.get("ATCID_UNZIP") or str(REPO / "build/minzip/atcid-unzip"))
    parser.add_argument("--runs", type=int, default=7)
    parser.add_argument("--reverse", action="store_true",
                        help="also time 65,535 entries stored in reverse name order (the sorted insert's worst case)")
    args = parser.parse_args()
    with tempfile.TemporaryDirectory() as tmp:
        cases = [("100k.zip", 100_000, False), ("65535.zip", 65_535, False)]
        if args.reverse:
            cases.append(("65535-reverse.zip", 65_535, True))
        for file_name, count, reverse in cases:
            archive = Path(tmp) / file_name
            name = build(archive, count, reverse)
            bench(archive, name, args.unzip, args.runs)


if __name__ == "__main__":
    main()
