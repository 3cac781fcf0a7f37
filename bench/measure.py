"""What the benches share: one child's wall time, CPU time and peak memory, and medians with
their spread over rounds.

On a machine shared with other work, the wall time of a short child is mostly its wait for a
core; its CPU time (user + system, from wait4) is not, so the benches print both.
"""
import os
import statistics
import subprocess
import sys
import time
from pathlib import Path

GNU_TIME = "/usr/bin/time"


def timed(argv, env=None):
    """(wall seconds, CPU seconds) of one child, its output discarded; exits on failure."""
    argv = [str(a) for a in argv]
    start = time.perf_counter()
    pid = os.posix_spawn(argv[0], argv, env if env is not None else os.environ,
                         file_actions=[(os.POSIX_SPAWN_OPEN, 1, os.devnull, os.O_WRONLY, 0)])
    _, status, usage = os.wait4(pid, 0)
    elapsed = time.perf_counter() - start
    if os.waitstatus_to_exitcode(status) != 0:
        sys.exit(f"{' '.join(map(str, argv))} failed")
    return elapsed, usage.ru_utime + usage.ru_stime


def peak_kib(argv, env=None):
    """Peak resident memory of one run in KiB, or None without GNU time. Measured by GNU time,
    a small process: a child of this one would start from this interpreter's own peak."""
    if not Path(GNU_TIME).exists():
        return None
    run = subprocess.run([GNU_TIME, "-f", "%M", *map(str, argv)], stdout=subprocess.DEVNULL,
                         stderr=subprocess.PIPE, env=env, check=True)
    return int(run.stderr.split()[-1])


def spread(values, fmt="{:.3f}"):
    """'median (min-max)' of a list of numbers."""
    return (fmt.format(statistics.median(values)) + " (" + fmt.format(min(values)) + "-"
            + fmt.format(max(values)) + ")")


def ratios(ours, base):
    """Per-round ratios ours / base: both sides of one round met the same load."""
    return [a / b for a, b in zip(ours, base)]
