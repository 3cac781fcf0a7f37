#!/usr/bin/env python3
"""Open a large zip and extract one entry: atcid-unzip against `unzip -p` and Python's zipfile.

Every tool reads the same archive in the same run, one run of each per round; the script prints
medians and ratios of wall time and of CPU time (user + system). On a machine shared with other
work the wall time mostly measures the wait for a core: compare the CPU ratio there.
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
    """Wall and CPU (user + system) seconds of one child, output discarded."""
    start = time.perf_counter()
    pid = os.posix_spawn(argv[0], argv, os.environ,
                         file_actions=[(os.POSIX_SPAWN_OPEN, 1, os.devnull, os.O_WRONLY, 0)])
    _, status, usage = os.wait4(pid, 0)
    elapsed = time.perf_counter() - start
    if os.waitstatus_to_exitcode(status) != 0:
        sys.exit(f"{argv} failed")
    return elapsed, usage.ru_utime + usage.ru_stime


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


def report(label, secs, cpu=None, argv=None):
    rss = peak_rss_mib(argv) if argv else None
    print(f"  {label:34s} {secs * 1000:9.2f} ms" + (f"  CPU {cpu * 1000:6.2f} ms" if cpu is not None else "")
          + (f"   peak RSS {rss:6.1f} MiB" if rss else ""))


def bench(archive: Path, name: str, tool: str, runs: int):
    print(f"{archive.name}: {archive.stat().st_size / 1e6:.1f} MB, extracting {name}")
    expected = zipfile.ZipFile(archive).read(name)
    out = archive.with_suffix(".out")
    ours_argv = [tool, str(archive), name, str(out)]
    subprocess.run(ours_argv, capture_output=True, check=True)
    assert out.read_bytes() == expected, "atcid-unzip extracted other bytes than zipfile"
    unzip_argv = ["/usr/bin/unzip", "-p", str(archive), name]
    # One run of each per round: a machine whose load changes during the bench slows all alike.
    # On a loaded machine the wall time also holds the waits for a core; the CPU time does not.
    runs_of = {"ours": [], "unzip": [], "empty": []}
    pyzip_runs = []
    for _ in range(runs):
        runs_of["ours"].append(timed_child(ours_argv))
        runs_of["unzip"].append(timed_child(unzip_argv))
        runs_of["empty"].append(timed_child(["/bin/true"]))
        pyzip_runs.append(zipfile_once(archive, name))
    wall = {k: statistics.median(r[0] for r in v) for k, v in runs_of.items()}
    cpu = {k: statistics.median(r[1] for r in v) for k, v in runs_of.items()}
    pyzip = statistics.median(pyzip_runs)
    report("atcid-unzip (process)", wall["ours"], cpu["ours"], ours_argv)
    report("unzip -p (process)", wall["unzip"], cpu["unzip"], unzip_argv)
    report("/bin/true (process start only)", wall["empty"], cpu["empty"])
    report("zipfile open+read (in process)", pyzip)
    ours, unzip, empty = wall["ours"], wall["unzip"], wall["empty"]
    print(f"  ratio atcid-unzip / unzip -p      {ours / unzip:6.3f}   CPU time {cpu['ours'] / cpu['unzip']:6.3f}")
    print(f"  ratio atcid-unzip / zipfile       {ours / pyzip:6.3f}")
    print(f"  same, less process start:  {(ours - empty) / (unzip - empty):6.3f} / {(ours - empty) / pyzip:6.3f}")


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--unzip", default=os.environ.get("ATCID_UNZIP") or str(REPO / "build/minzip/atcid-unzip"))
    parser.add_argument("--runs", type=int, default=21)
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
