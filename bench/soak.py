#!/usr/bin/python3
"""Soak: many commands over a pseudo-terminal and many station connections over TCP, checking
that the daemon's resident memory and open descriptors stay where they were after warm-up.

On the pseudo-terminal one daemon serves every command; its figures after the warm-up commands
are compared with its figures at the end. Over TCP each station connection is served by its own
daemon process (a station's hang-up ends the daemon and init starts it again): this script plays
init, and compares the last process's figures with the first one's.

    bench/soak.py [--bin build/atcid] [--commands 100000] [--warmup 1000] [--connections 1000]
"""

import argparse
import os
import select
import shutil
import socket
import subprocess
import sys
import tempfile
import time
from pathlib import Path

SOURCE = Path(__file__).resolve().parents[1]
sys.path.insert(0, str(SOURCE / "emulator"))
import emulator  # noqa: E402

PATIENCE = 30.0
RESULT_ENDINGS = (b"OK\r\n", b"ERROR\r\n", b"Not Implement\r\n", b"UNKNOWN\r\n")
# Read-only commands over the dispatcher's paths: the reader's own answers, a row without
# behaviour, and handlers that read files and properties of the root.
PTY_COMMANDS = (b"ATI", b"AT+JVLIFE=1", b"AT+JVMODEL=0", b"AT+JVRAM=0", b"AT+JVBBTYPE=0",
                b"AT+JVTWST=0", b"AT+JVCARD=1", b"AT+JVFQ=0", b"at+nothere=1")
# Every this many commands one goes through the phone's shell (a child process each time).
SHELL_EVERY = 100
SHELL_COMMAND = b"ATD112;"
TCP_COMMANDS = (b"ATI", b"ATD112;", b"AT+NOTHERE=1")
# Memory a long run may differ by without it being a leak: allocator and page noise.
RSS_SLACK_KIB = 256


class SoakError(Exception):
    pass


class Skip(Exception):
    """The soak cannot run as designed on this daemon; the message says why."""


def figures(pid):
    """(resident KiB, open descriptors) of a running process."""
    rss = None
    with open(f"/proc/{pid}/status") as status:
        for line in status:
            if line.startswith("VmRSS:"):
                rss = int(line.split()[1])
    return rss, len(os.listdir(f"/proc/{pid}/fd"))


def rss_is_the_daemons(binary):
    """False where resident memory says nothing of the daemon's own: a build with
    AddressSanitizer (quarantine and shadow), or a script that starts it under an emulator
    (qemu-user's translation cache grows as new code runs)."""
    program = Path(binary).read_bytes()
    return not program.startswith(b"#!") and b"__asan_init" not in program


class PtyStation:
    def __init__(self, binary, root):
        emulator.prepare_mode(root, "usb")
        self.bridge = emulator.PtyBridge()
        emulator.link_port(root, "ttyGS0", self.bridge.device_path)
        self.fd = os.open(self.bridge.station_path, os.O_RDWR | os.O_NOCTTY)
        log = root / ".emu" / "atcid.log"
        with open(log, "ab") as out:
            self.proc = emulator.start_daemon(binary, root, log=out)
        if not emulator.wait_for_log(log, "Wait for select data from USB", self.proc, PATIENCE):
            self.close()
            raise SoakError("daemon not ready on the pseudo-terminal")

    def read(self, size=None, quiet=0.3):
        """Exactly `size` bytes; without a size, what came until a quiet spell after an answer."""
        data = b""
        deadline = time.monotonic() + PATIENCE
        while time.monotonic() < deadline and (size is None or len(data) < size):
            wait = quiet if size is None and data.endswith(RESULT_ENDINGS) else \
                deadline - time.monotonic()
            ready, _, _ = select.select([self.fd], [], [], max(0.0, wait))
            if not ready:
                if size is None and data.endswith(RESULT_ENDINGS):
                    break
                continue
            data += os.read(self.fd, 65536)
        return data

    def command(self, line, size=None):
        os.write(self.fd, line + b"\n")
        return self.read(size)

    def close(self):
        if self.proc.poll() is None:
            self.proc.kill()
            self.proc.wait()
        os.close(self.fd)
        self.bridge.close()


def pty_soak(binary, root, commands, warmup, progress=None):
    """Runs `commands` commands on one daemon; returns its figures after `warmup` and at the end.
    Every answer must equal the first answer to the same line, byte for byte."""
    station = PtyStation(binary, root)
    try:
        answers = {}
        after_warmup = None
        for i in range(commands):
            line = SHELL_COMMAND if i % SHELL_EVERY == SHELL_EVERY - 1 else \
                PTY_COMMANDS[i % len(PTY_COMMANDS)]
            expected = answers.get(line)
            got = station.command(line, len(expected) if expected else None)
            if expected is None:
                if not got.endswith(RESULT_ENDINGS):
                    raise SoakError(f"no answer to {line!r}: {got!r}")
                answers[line] = got
            elif got != expected:
                raise SoakError(f"command {i + 1} {line!r}: {got!r} instead of {expected!r}")
            if station.proc.poll() is not None:
                raise SoakError(f"daemon ended with {station.proc.returncode} at command {i + 1}")
            if i + 1 == warmup:
                after_warmup = figures(station.proc.pid)
            if progress and (i + 1) % progress == 0:
                print(f"  {i + 1} commands, rss {figures(station.proc.pid)[0]} KiB", flush=True)
        return after_warmup, figures(station.proc.pid)
    finally:
        station.close()


def tcp_exchange(sock, line):
    """One command on the socket; the commands used here get the reader's one-piece answer."""
    sock.sendall(line)
    data = b""
    while not (data.startswith(line + b"\r\n") and data.endswith(RESULT_ENDINGS)):
        chunk = sock.recv(65536)
        if not chunk:
            raise SoakError(f"connection closed during {line!r} after {data!r}")
        data += chunk
    return data


def connect(port, proc):
    deadline = time.monotonic() + PATIENCE
    while True:
        try:
            return socket.create_connection(("127.0.0.1", port), timeout=PATIENCE)
        except ConnectionRefusedError:
            if proc.poll() is not None or time.monotonic() > deadline:
                raise SoakError("daemon never accepted a connection")
            time.sleep(0.005)


def ended(proc, timeout):
    try:
        return proc.wait(timeout=timeout)
    except subprocess.TimeoutExpired:
        return None


def tcp_soak(binary, root, connections, progress=None):
    """Serves `connections` station connections, one daemon process each, started again after
    each hang-up as init does. Returns the first and the last process's figures, taken with the
    station still connected after its commands."""
    emulator.prepare_mode(root, "tcp")
    with socket.socket() as s:
        s.bind(("127.0.0.1", 0))
        port = s.getsockname()[1]
    first = last = None
    expected = {}
    with open(root / ".emu" / "atcid.log", "ab") as log:
        for n in range(connections):
            proc = emulator.start_daemon(binary, root, port=port, log=log)
            try:
                with connect(port, proc) as sock:
                    for line in TCP_COMMANDS:
                        got = tcp_exchange(sock, line)
                        if expected.setdefault(line, got) != got:
                            raise SoakError(f"connection {n + 1} {line!r}: {got!r}")
                    last = figures(proc.pid)
                    first = first or last
                # The hang-up ends the daemon; a daemon that keeps running cannot serve the next
                # station, so the rest of the soak has nothing to measure.
                status = ended(proc, PATIENCE if n else 5.0)
                if status is None and n == 0:
                    raise Skip("the daemon does not end when the station hangs up, so no second "
                               "station can connect")
                if status != 0:
                    raise SoakError(f"daemon of connection {n + 1} ended with {status}")
            finally:
                if proc.poll() is None:
                    proc.kill()
                    proc.wait()
            if progress and (n + 1) % progress == 0:
                print(f"  {n + 1} connections, rss {last[0]} KiB", flush=True)
    return first, last


def compare(what, before, after, binary):
    """Problems found between two (rss, fds) figures; empty when they hold."""
    problems = []
    if after[1] != before[1]:
        problems.append(f"{what}: {before[1]} open descriptors became {after[1]}")
    if rss_is_the_daemons(binary) and after[0] - before[0] > RSS_SLACK_KIB:
        problems.append(f"{what}: resident memory grew from {before[0]} to {after[0]} KiB")
    return problems


def main():
    parser = argparse.ArgumentParser(description=__doc__,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--bin", default=str(SOURCE / "build" / "atcid"))
    parser.add_argument("--commands", type=int, default=100000)
    parser.add_argument("--warmup", type=int, default=1000)
    parser.add_argument("--connections", type=int, default=1000)
    args = parser.parse_args()

    problems = []
    scratch = Path(tempfile.mkdtemp(prefix="atcid-soak-"))
    try:
        started = time.monotonic()
        before, after = pty_soak(args.bin, emulator.make_root(scratch / "pty"), args.commands,
                                 args.warmup, progress=max(1, args.commands // 10))
        print(f"pty: {args.commands} commands in {time.monotonic() - started:.1f} s; after "
              f"{args.warmup}: rss {before[0]} KiB, {before[1]} fds; at the end: rss {after[0]} "
              f"KiB, {after[1]} fds")
        problems += compare("pty", before, after, args.bin)

        started = time.monotonic()
        try:
            first, last = tcp_soak(args.bin, emulator.make_root(scratch / "tcp"),
                                   args.connections, progress=max(1, args.connections // 10))
            print(f"tcp: {args.connections} connections in {time.monotonic() - started:.1f} s; "
                  f"first daemon: rss {first[0]} KiB, {first[1]} fds; last daemon: rss "
                  f"{last[0]} KiB, {last[1]} fds")
            problems += compare("tcp", first, last, args.bin)
        except Skip as skip:
            print(f"tcp: skipped: {skip}")
    except SoakError as error:
        problems.append(str(error))
    finally:
        shutil.rmtree(scratch, ignore_errors=True)
    for problem in problems:
        print(f"FAIL {problem}")
    print("soak: " + ("failed" if problems else "passed"))
    return 1 if problems else 0


if __name__ == "__main__":
    sys.exit(main())
