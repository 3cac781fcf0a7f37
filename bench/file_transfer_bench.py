#!/usr/bin/env python3
"""AT+JVFILE through the real daemon on an emulated USB port, against plain tools.

1. Receive: a few MiB sent with AT+JVFILE=1 over a pseudo-terminal pair, against the same
   characters copied raw through a pseudo-terminal pair with the daemon's terminal settings by
   a plain reader (`head -c`) writing a file. Ratio = daemon time / raw time (1.0: as fast).
2. Verify: AT+JVFILE=2 on a 100 MB file, against `md5sum` of the same file (page cache warm
   for both). Ratio = daemon time / md5sum time.

Medians of --runs runs with their spread, and each run's ratio, all measured in this run.

    bench/file_transfer_bench.py [--atcid PATH] [--mib N] [--verify-mb N] [--runs N]
"""
import argparse
import hashlib
import os
import random
import select
import statistics
import subprocess
import sys
import tempfile
import termios
import threading
import time
from pathlib import Path

REPO = Path(__file__).resolve().parents[1]
sys.path.insert(0, str(REPO / "emulator"))
import emulator  # noqa: E402
sys.path.insert(0, str(REPO / "bench"))
import measure  # noqa: E402

LINE_CHARS = 1000  # an even count per line, well under the terminal's 4096-byte buffer


def encoded_lines(content):
    text = bytes(b for byte in content for b in (0x30 + (byte >> 4), 0x30 + (byte & 15)))
    return b"".join(text[i:i + LINE_CHARS] + b"\n" for i in range(0, len(text), LINE_CHARS))


def daemon_terminal(fd):
    """The settings the daemon gives its port: canonical lines, no echo, no output mapping."""
    attrs = termios.tcgetattr(fd)
    attrs[1] &= ~(termios.OPOST | termios.OLCUC | termios.OCRNL | termios.ONOCR | termios.ONLRET)
    attrs[3] = termios.ICANON
    termios.tcsetattr(fd, termios.TCSANOW, attrs)


def write_all(fd, data):
    view = memoryview(data)
    while view:
        view = view[os.write(fd, view):]


def read_until(fd, marker, timeout=600):
    data = b""
    deadline = time.monotonic() + timeout
    while marker not in data:
        left = deadline - time.monotonic()
        if left <= 0 or not select.select([fd], [], [], left)[0]:
            sys.exit(f"no {marker!r} from the daemon; got {data[-200:]!r}")
        data += os.read(fd, 65536)
    return data


class UsbDaemon:
    def __init__(self, binary, root):
        self.root = root
        emulator.prepare_mode(root, "usb")
        self.master, slave = os.openpty()
        emulator.link_port(root, "ttyGS0", os.ttyname(slave))
        os.close(slave)
        self.log = root / ".emu/atcid.log"
        self.log.parent.mkdir(parents=True, exist_ok=True)
        with open(self.log, "ab") as log:
            self.proc = emulator.start_daemon(binary, root, log=log)
        if not emulator.wait_for_log(self.log, "Wait for select data from USB", self.proc, 30):
            sys.exit("daemon not ready")

    def command(self, line):
        write_all(self.master, line + b"\n")
        return read_until(self.master, b"OK\r\n")

    def receive(self, name, content, lines):
        line = b"AT+JVFILE=1,%s,%d" % (name, len(content))
        marker = b"file_name=" + name
        before = self.log.read_bytes().count(marker)
        write_all(self.master, line + b"\n")
        # The station lets the command arrive alone.
        while self.log.read_bytes().count(marker) == before:
            time.sleep(0.005)
        start = time.perf_counter()
        writer = threading.Thread(target=write_all, args=(self.master, lines))
        writer.start()
        answer = read_until(self.master, b"OK\r\n")
        elapsed = time.perf_counter() - start
        writer.join()
        if (self.root / "data" / name.decode().lower()).read_bytes() != content:
            sys.exit("the stored file differs from the content sent")
        return elapsed, answer

    def stop(self):
        self.proc.kill()
        self.proc.wait()
        os.close(self.master)


def raw_copy(lines, out):
    """The same characters through a fresh pseudo-terminal pair to `head -c` writing a file."""
    master, slave = os.openpty()
    daemon_terminal(slave)
    with open(out, "wb") as sink:
        start = time.perf_counter()
        head = subprocess.Popen(["head", "-c", str(len(lines))], stdin=slave, stdout=sink)
        write_all(master, lines)
        head.wait()
        elapsed = time.perf_counter() - start
    os.close(master)
    os.close(slave)
    if Path(out).stat().st_size != len(lines):
        sys.exit("raw copy lost characters")
    return elapsed


def compare(labels, ours_fn, base_fn, runs):
    """Runs both in turn, so a load change on a shared machine hits both alike; prints the
    medians with their spread and every run's ratio daemon / base (above 1: the daemon is
    slower)."""
    ours, base = [], []
    for _ in range(runs):
        ours.append(ours_fn())
        base.append(base_fn())
    for label, times in zip(labels, (ours, base)):
        print(f"  {label:44s} {measure.spread([t * 1000 for t in times], '{:.1f}')} ms")
    per_run = measure.ratios(ours, base)
    print(f"  ratio daemon / {labels[1].split(' ')[0]}: {measure.spread(per_run)}; every run: "
          + " ".join(f"{r:.2f}" for r in per_run))


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--atcid", default=os.environ.get("ATCID_BIN") or str(REPO / "build/atcid"))
    parser.add_argument("--mib", type=int, default=4)
    parser.add_argument("--verify-mb", type=int, default=100)
    parser.add_argument("--runs", type=int, default=7)
    args = parser.parse_args()
    # Both sides write to memory: the disk's journal, shared with whatever else the machine
    # does, would measure the disk instead of the transfer.
    shm = "/dev/shm" if os.path.isdir("/dev/shm") else None
    with tempfile.TemporaryDirectory(dir=shm) as tmp:
        root = emulator.make_root(Path(tmp) / "root")
        daemon = UsbDaemon(args.atcid, root)
        try:
            content = random.Random(1).randbytes(args.mib << 20)
            lines = encoded_lines(content)
            print(f"receive: {args.mib} MiB as {len(lines)} characters in lines of {LINE_CHARS}")
            compare(("AT+JVFILE=1 through the daemon", "raw copy through a pty pair (head -c)"),
                    lambda: daemon.receive(b"BENCH.BIN", content, lines)[0],
                    lambda: raw_copy(lines, Path(tmp) / "raw.out"), args.runs)

            big = root / "data/big.bin"
            with open(big, "wb") as f:
                rng = random.Random(2)
                for _ in range(args.verify_mb):
                    f.write(rng.randbytes(1_000_000))
            digest = hashlib.md5(big.read_bytes()).hexdigest().encode()
            print(f"verify: {args.verify_mb} MB")
            check = b"AT+JVFILE=2,BIG.BIN," + digest

            def verify_once():
                start = time.perf_counter()
                answer = daemon.command(check)
                elapsed = time.perf_counter() - start
                if b'"' + digest + b'"' not in answer:
                    sys.exit(f"unexpected answer {answer!r}")
                return elapsed

            def md5sum_once():
                start = time.perf_counter()
                subprocess.run(["md5sum", str(big)], stdout=subprocess.DEVNULL, check=True)
                return time.perf_counter() - start

            md5sum_once()  # warm the page cache for both
            compare(("AT+JVFILE=2 through the daemon", "md5sum"), verify_once, md5sum_once,
                    args.runs)
        finally:
            daemon.stop()


if __name__ == "__main__":
    main()
