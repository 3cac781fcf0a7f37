"""Asking the phone: send one command line, wait for its answer, keep what arrived unasked."""

import time

from .framing import Answer, decoder_for, split_lines, text
from .errors import ConnectionLost
from .link import open_link

DEFAULT_TIMEOUT = 30.0
DEFAULT_IDLE = 0.5


class Station:
    """One connection to a phone. `on_unsolicited(raw, lines)` gets what arrived between
    answers (stream lines) when it is drained; lines met inside an answer's time stay in
    that answer's `unsolicited`."""

    def __init__(self, link, idle=DEFAULT_IDLE, timeout=DEFAULT_TIMEOUT, on_unsolicited=None):
        self.link = link
        self.idle = idle
        self.timeout = timeout
        self.decode = decoder_for(link.kind)
        self.on_unsolicited = on_unsolicited or (lambda raw, lines: None)

    @classmethod
    def connect(cls, target, baud, connect_timeout=10.0, **kw):
        return cls(open_link(target, baud, connect_timeout), **kw)

    def close(self):
        self.link.close()

    def line_bytes(self, command):
        # TCP carries the line without an end; a serial line ends with a line feed.
        data = command.encode("latin-1")
        return data if self.link.kind == "tcp" else data + b"\n"

    def ask(self, command, timeout=None, idle=None):
        timeout = self.timeout if timeout is None else timeout
        idle = self.idle if idle is None else idle
        self.drain()
        started = time.monotonic()
        self.link.send(self.line_bytes(command))
        return self.collect(command, started, timeout, idle)

    def collect(self, command, started, timeout, idle):
        """Waits for the answer to a command already sent."""
        deadline = started + timeout
        link = self.link
        with link.cond:
            while True:
                now = time.monotonic()
                quiet = bool(link.buffer) and now - link.arrived >= idle
                decoded = self.decode(link.buffer, command, quiet or link.closed)
                if decoded is not None:
                    raw = link.take(decoded.consumed)
                    break
                if link.closed:
                    raise ConnectionLost(f"{link.name}: the phone closed the connection "
                                         f"{now - started:.1f} s after {command}")
                if now >= deadline:
                    raw = link.take(len(link.buffer))
                    return Answer(command, body=text(raw), raw=raw, elapsed=now - started,
                                  timed_out=True)
                wake = deadline if not link.buffer else min(deadline, link.arrived + idle)
                link.cond.wait(max(0.005, wake - now))
        return Answer(command, echo=text(decoded.echo), body=text(decoded.body),
                      result=decoded.result, raw=raw, elapsed=link.arrived - started,
                      unsolicited=decoded.unsolicited)

    def drain(self):
        """Hands complete lines that arrived between answers to `on_unsolicited`."""
        with self.link.cond:
            buffer = self.link.buffer
            end = buffer.rfind(b"\n") + 1
            if end == 0 or b"\0" in buffer[:end]:
                return []
            raw = self.link.take(end)
        lines = split_lines(raw)
        self.on_unsolicited(raw, lines)
        return lines
