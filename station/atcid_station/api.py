"""The station's Python API: one phone, reached through its port only, so the same code drives
a phone on the line and an emulated one.

    with atcid_station.connect("tcp://127.0.0.1:6888") as phone:
        answer = phone.command("AT+JVMODEL=0")
        assert answer.ok and answer.value == "QM0305"

Every failure is a StationError: Unreachable (the port cannot be opened), ConnectionLost (it
closed or failed while in use), TimedOut (no answer in time).
"""

import time
from dataclasses import dataclass
from pathlib import Path

from . import junit
from . import push as push_mod
from . import sequence
from .errors import TimedOut
from .link import DEFAULT_BAUD, open_link
from .station import DEFAULT_IDLE, DEFAULT_TIMEOUT, Station


def connect(target, *, timeout=DEFAULT_TIMEOUT, idle=DEFAULT_IDLE, baud=DEFAULT_BAUD,
            connect_timeout=10.0):
    """Opens `target`: `tcp://HOST[:PORT]` (port 6888 by default) or a serial device. `timeout`
    is how long a command waits for its answer; `idle` the quiet time that ends a body-only or
    self-answering reply on a serial port."""
    link = open_link(target, baud, connect_timeout)
    return Phone(Station(link, idle=idle, timeout=timeout), target)


@dataclass
class Pushed:
    """A file push: the answer to the transfer and, when the phone took the file, to its MD5
    check. `ok` when the file is stored and verified."""
    sent: object
    verified: object
    size: int

    @property
    def ok(self):
        return self.verified is not None and self.verified.ok


@dataclass
class SequenceRun:
    steps: list
    outcomes: list

    @property
    def passed(self):
        return len(self.outcomes) == len(self.steps) and all(o.passed for o in self.outcomes)

    @property
    def lost(self):
        return any(o.lost for o in self.outcomes)


class Phone:
    """A connected phone. `root` is the emulated phone's root directory when the pytest plugin
    started one for the test, None for a phone reached by its target."""

    root = None

    def __init__(self, station, target):
        self.station = station
        self.target = target

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.close()

    def close(self):
        self.station.close()

    def command(self, line, timeout=None, idle=None):
        """Sends one command line and returns its Answer. Raises TimedOut when no complete
        answer came within `timeout` seconds (the tool's default when None)."""
        answer = self.station.ask(line, timeout=timeout, idle=idle)
        if answer.timed_out:
            raise TimedOut(f"{self.target}: no answer to {line} after {answer.elapsed:.1f} s",
                           answer)
        return answer

    def unsolicited(self, timeout=None):
        """Yields stream lines (battery, g-sensor, GPS) as they arrive between answers; ends
        once no line came for `timeout` seconds, or when the phone closes the port. Lines that
        arrived inside an answer are in that answer's `unsolicited`."""
        link = self.station.link
        while True:
            lines = self.station.drain()
            yield from lines
            if lines:
                continue
            with link.cond:
                if link.closed:
                    return
                quiet_since = time.monotonic()
                while b"\n" not in link.buffer and not link.closed:
                    left = None if timeout is None else timeout - (time.monotonic() - quiet_since)
                    if left is not None and left <= 0:
                        return
                    link.cond.wait(left)

    def push(self, path, name, progress=None, timeout=None):
        """Stores the local file `path` as /data/<name> (lower-cased by the phone) and has the
        phone check its MD5. `progress(done, total)` is called with bytes sent."""
        data = Path(path).read_bytes()
        meter = _Meter(progress, len(data))
        sent, verified = push_mod.push(self.station, data, name, timeout=timeout, progress=meter)
        return Pushed(sent, verified, len(data))

    def run(self, sequence_path, junit_path=None, report=None):
        """Runs a sequence file (see `sequence`); `report(outcome)` gets each step's Outcome as
        it is made (`print` shows one line per step). With
        `junit_path` a JUnit report with one suite named by the file is written."""
        steps = sequence.parse(Path(sequence_path).read_text(), where=str(sequence_path))
        outcomes = sequence.run(self, steps, report=report or (lambda text: None))
        if junit_path:
            junit.write(junit_path, [junit.suite(Path(sequence_path).stem, steps, outcomes)])
        return SequenceRun(steps, outcomes)


class _Meter:
    """Adapts a `progress(done, total)` callback to the push's progress meter: one call per
    chunk sent, the last with done == total."""

    def __init__(self, callback, total):
        self.callback = callback
        self.total = total
        self.last = -1

    def update(self, done, final=False):
        if self.callback is None or (final and done == self.last):
            return
        self.last = done
        self.callback(done, self.total)
