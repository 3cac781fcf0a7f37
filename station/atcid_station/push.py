"""Putting a file into the phone's /data with AT+JVFILE=1 and checking it with AT+JVFILE=2.

Each byte travels as two characters, high nibble first, nibble n as the character 0x30 + n
(so 10-15 are ':;<=>?'), which is what the phone decodes; hexadecimal letters would not be.
"""

import hashlib
import re
import sys
import time

MAX_NAME = 23
_NAME = re.compile(r"[A-Za-z0-9._+@%=:-]+")
# Serial lines stay far below the terminal's 4096-byte line buffer and the phone's
# 1100-character read; an even count keeps every pair within one read.
SERIAL_LINE_CHARS = 1024
TCP_CHUNK_CHARS = 8192
# TCP has no prompt: the command must arrive on its own before the content.
TCP_COMMAND_PAUSE = 0.3

_NIBBLES = bytes(range(0x30, 0x40))
_PAIRS = [bytes((_NIBBLES[b >> 4], _NIBBLES[b & 15])) for b in range(256)]


def encode(data):
    return b"".join(_PAIRS[b] for b in data)


def decode(chars):
    """The phone's rule, for tests: ((c1 - 0x30) << 4 | (c2 & 0x0F)) & 0xFF per pair."""
    return bytes((((chars[i] - 0x30) << 4) | (chars[i + 1] & 0x0F)) & 0xFF
                 for i in range(0, len(chars) - 1, 2))


def check_name(name):
    """The names the phone takes: it stores them lower-cased and hands them to a shell."""
    if not 1 <= len(name) <= MAX_NAME:
        raise ValueError(f"the name must be 1 to {MAX_NAME} characters")
    if name in (".", "..") or not _NAME.fullmatch(name):
        raise ValueError("the name may hold only letters, digits and ._-+@%=:")


class Progress:
    """Bytes, rate and time left on one terminal line; silent when the output is no terminal."""

    def __init__(self, total, stream=None):
        self.stream = stream or sys.stdout
        self.enabled = self.stream.isatty()
        self.total = total
        self.started = time.monotonic()
        self.last = 0.0

    def update(self, done, final=False):
        if not self.enabled:
            return
        now = time.monotonic()
        if not final and now - self.last < 0.1:
            return
        self.last = now
        spent = max(now - self.started, 1e-6)
        rate = done / spent
        left = (self.total - done) / rate if rate > 0 else 0.0
        width = 30
        filled = width * done // self.total if self.total else width
        bar = "#" * filled + "-" * (width - filled)
        self.stream.write(f"\r[{bar}] {done}/{self.total} B  {rate / 1024:.1f} KiB/s  "
                          f"{left:.0f} s left ")
        if final:
            self.stream.write("\n")
        self.stream.flush()


def push(station, data, name, timeout=None, progress=None):
    """Sends `data` as /data/<name> and verifies it. Returns (send answer, verify answer)."""
    check_name(name)
    progress = progress or Progress(len(data))
    command = f"AT+JVFILE=1,{name},{len(data)}"
    link = station.link
    station.drain()
    started = time.monotonic()
    link.send(station.line_bytes(command))
    if link.kind == "tcp" and data:
        time.sleep(TCP_COMMAND_PAUSE)
    chars = encode(data)
    step = TCP_CHUNK_CHARS if link.kind == "tcp" else SERIAL_LINE_CHARS
    for at in range(0, len(chars), step):
        chunk = chars[at:at + step]
        link.send(chunk if link.kind == "tcp" else chunk + b"\n")
        progress.update(min(len(data), (at + len(chunk)) // 2))
    progress.update(len(data), final=True)
    wait = station.timeout if timeout is None else timeout
    sent = station.collect(command, started, wait + len(data) / 20000, station.idle)
    if not sent.ok:
        return sent, None
    digest = hashlib.md5(data).hexdigest()
    return sent, station.ask(f"AT+JVFILE=2,{name},{digest}", timeout=timeout)
