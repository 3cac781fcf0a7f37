#!/usr/bin/python3
"""How a fleet of emulated phones scales: for each N, the launcher starts N phones
(`emulator/atcid-emu --count N`) and this script measures

  - the time from starting the launcher until every phone serves (the launcher says so), and
    how much of it went into making the N roots (until the launcher lists the phones),
  - the memory per phone: the proportional set size (PSS, /proc/PID/smaps_rollup) of each
    phone's processes (its daemon and whatever the daemon started), and the launcher's own,
  - the wall time of a 20-step sequence run multi-up over TCP on all N phones, against the
    same sequence on one phone of the same fleet (the baseline of the ratio).

    bench/fleet.py [--bin build/atcid] [--counts 1,8,32,64]

Each TCP answer carries two 100 ms pauses, so a step takes about 200 ms on any phone and N
phones in parallel should take about as long as one. Prints a Markdown table.
"""

import argparse
import io
import re
import signal
import socket
import subprocess
import sys
import tempfile
import threading
import time
from pathlib import Path

SOURCE = Path(__file__).resolve().parents[1]
sys.path.insert(0, str(SOURCE / "station"))
from atcid_station import multiup, sequence  # noqa: E402

PATIENCE = 300.0
# Twenty steps that answer OK on a fresh emulated phone without starting its shell: files of
# the root, properties, the factory record and the simulated modem.
STEPS = """\
AT+JVMODEL=0
AT+JVRAM=0
AT+JVCPUID=1
AT+EGMR=0,7
AT+EGMR=0,5
AT+JVFQ=0
AT+EADC=2
AT+EADC=3
AT+JVDLJ=1
AT+JVLCD=0
AT+JVRT=0
AT+JVRDNV=0
AT+JVMMIUI=0
AT+JVSDCALI=0
AT+JVTDNV=0
AT+JVBBTYPE=0
AT+JVTWST=0
AT+JVCARD=1
AT+JVMODEL=0
AT+JVRAM=0
"""


def free_ports(count):
    while True:
        with socket.socket() as s:
            s.bind(("127.0.0.1", 0))
            base = s.getsockname()[1]
        try:
            for port in range(base, base + count):
                with socket.socket() as s:
                    s.bind(("127.0.0.1", port))
            return base
        except OSError:
            continue


def pss_kib(pid):
    try:
        with open(f"/proc/{pid}/smaps_rollup") as rollup:
            for line in rollup:
                if line.startswith("Pss:"):
                    return int(line.split()[1])
    except (FileNotFoundError, ProcessLookupError):
        pass
    return 0


def children():
    """{parent pid: [child pids]} of every process now."""
    tree = {}
    for entry in Path("/proc").iterdir():
        if not entry.name.isdigit():
            continue
        try:
            stat = (entry / "stat").read_text()
        except OSError:
            continue
        parent = int(stat[stat.rindex(")") + 2:].split()[1])
        tree.setdefault(parent, []).append(int(entry.name))
    return tree


def subtree(pid, tree):
    pids = [pid]
    for child in tree.get(pid, []):
        pids += subtree(child, tree)
    return pids


class Launcher:
    def __init__(self, binary, root, count, port):
        self.started = time.monotonic()
        self.proc = subprocess.Popen(
            [sys.executable, str(SOURCE / "emulator/atcid-emu"), "--bin", str(binary),
             "--count", str(count), "--root", str(root), "--port", str(port)],
            stdout=subprocess.PIPE, text=True)
        self.serving = threading.Event()
        self.serving_after = self.roots_after = None
        threading.Thread(target=self._read, daemon=True).start()

    def _read(self):
        for line in self.proc.stdout:
            if self.roots_after is None and "phone-1 " in line:
                self.roots_after = time.monotonic() - self.started
            if re.search(r"all \d+ phones serving", line):
                self.serving_after = time.monotonic() - self.started
                self.serving.set()

    def stop(self):
        self.proc.send_signal(signal.SIGINT)
        return self.proc.wait(timeout=PATIENCE)


def timed_run(targets, steps):
    started = time.monotonic()
    runs = multiup.run_all(targets, steps, {"timeout": 60.0}, out=io.StringIO())
    elapsed = time.monotonic() - started
    failed = [r.target for r in runs if r.verdict(len(steps)) != "passed"]
    if failed:
        raise SystemExit(f"bench/fleet.py: the sequence failed on {', '.join(failed)}")
    return elapsed


def measure(binary, count, work):
    port = free_ports(count)
    launcher = Launcher(binary, work / f"fleet-{count}", count, port)
    try:
        if not launcher.serving.wait(PATIENCE):
            raise SystemExit(f"bench/fleet.py: {count} phones did not serve in {PATIENCE:.0f} s")
        tree = children()
        daemons = tree.get(launcher.proc.pid, [])
        if len(daemons) != count:
            raise SystemExit(f"bench/fleet.py: {len(daemons)} daemons for {count} phones")
        per_phone = [sum(pss_kib(p) for p in subtree(d, tree)) for d in daemons]
        launcher_kib = pss_kib(launcher.proc.pid)
        steps = sequence.parse(STEPS)
        targets = [f"tcp://127.0.0.1:{port + i}" for i in range(count)]
        one = timed_run(targets[:1], steps)
        many = timed_run(targets, steps)
    finally:
        launcher.stop()
    return {"count": count, "serve": launcher.serving_after, "roots": launcher.roots_after,
            "pss": sum(per_phone) / len(per_phone), "pss_max": max(per_phone),
            "launcher": launcher_kib, "one": one, "many": many}


def main():
    parser = argparse.ArgumentParser(description=__doc__,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--bin", default=str(SOURCE / "build/atcid"))
    parser.add_argument("--counts", default="1,8,32,64")
    args = parser.parse_args()
    counts = [int(c) for c in args.counts.split(",")]
    print("| phones | all serving after (roots made after) | PSS per phone (mean, max) | "
          "launcher PSS | 20 steps, one phone | 20 steps, all multi-up | ratio |")
    print("|---:|---:|---:|---:|---:|---:|---:|")
    with tempfile.TemporaryDirectory(prefix="atcid-fleet-bench-") as work:
        for count in counts:
            r = measure(args.bin, count, Path(work))
            print(f"| {r['count']} | {r['serve']:.2f} s ({r['roots']:.2f} s) | "
                  f"{r['pss']:.0f} KiB, {r['pss_max']} KiB | {r['launcher'] / 1024:.1f} MiB | "
                  f"{r['one']:.2f} s | {r['many']:.2f} s | {r['many'] / r['one']:.2f} |",
                  flush=True)

if __name__ == "__main__":
    main()
