"""Where an answer begins and ends in the bytes a phone sends, for both framings.

Serial: one write per answer, `ECHO\\r\\n` `\\n` `BODY` `\\n` `\\r\\nWORD\\r\\n`; a name the phone
does not know is answered `ECHO\\r\\nERROR\\r\\n`. TCP: three blocks of exactly 2048 bytes, each
`TEXT\\n` padded with NUL bytes (echo, body, result word), 100 ms apart; the unknown-name answer
is one unpadded send. On both, stream lines (battery, g-sensor, GPS) and the texts of commands
that answer for themselves arrive unframed, between answers or between blocks, never inside.

A decoder looks at the bytes received so far and says either "not yet" (None) or how many
bytes make up the answer and what it holds. `idle` tells it that nothing has arrived for the
configured idle time, which is the only way to see the end of a body-only or self-answering
reply on a serial port.
"""

import re
from dataclasses import dataclass, field

BLOCK = 2048
RESULT_WORDS = ("OK", "ERROR", "Not Implement", "UNKNOWN")
_WORD_LINE = re.compile(rb"\n\r\n(OK|ERROR|Not Implement|UNKNOWN|)\r\n")


@dataclass
class Answer:
    command: str
    echo: str = ""
    body: str = ""
    result: str | None = None  # a word of RESULT_WORDS, "" for a body-only answer, None if none
    raw: bytes = b""
    elapsed: float = 0.0
    unsolicited: list = field(default_factory=list)
    timed_out: bool = False

    @property
    def lines(self):
        """The body's lines without the blank framing lines around them."""
        return [line for line in self.body.replace("\r\n", "\n").split("\n") if line != ""]

    @property
    def ok(self):
        return self.result == "OK"

    @property
    def value(self):
        """The quoted value of a query answer (`\\r\\n"QM0101"\\r\\n` → QM0101) exactly as
        sent, line ends inside the quotes included; else the body's first line."""
        body = self.body.strip(" \r\n")
        if len(body) >= 2 and body[0] == body[-1] == '"':
            return body[1:-1]
        lines = self.lines
        return lines[0] if lines else ""


@dataclass
class Decoded:
    consumed: int  # bytes of the buffer that belong to this answer (and what came before it)
    echo: bytes
    body: bytes
    result: str | None
    unsolicited: list


def text(data):
    return data.decode("latin-1")


def split_lines(data):
    """Complete unsolicited lines, their line ends dropped; a trailing partial line is kept."""
    return [text(line).rstrip("\r") for line in data.split(b"\n") if line.strip(b"\r")]


def echo_of(command):
    """What the phone echoes: the line upper-cased, blanks around it trimmed."""
    return command.strip(" ").upper().encode("latin-1")


def _find_echo(buffer, echo, suffix):
    upper = bytes(buffer).upper()
    start = 0
    while True:
        at = upper.find(echo + suffix, start)
        # The echo begins the buffer or follows a complete line.
        if at < 0 or at == 0 or buffer[at - 1:at] == b"\n":
            return at
        start = at + 1


def decode_serial(buffer, command, idle):
    echo = echo_of(command)
    framed = _find_echo(buffer, echo, b"\r\n\n")
    unknown = _find_echo(buffer, echo, b"\r\nERROR\r\n")
    if unknown >= 0 and (framed < 0 or unknown < framed):
        end = unknown + len(echo) + len(b"\r\nERROR\r\n")
        return Decoded(end, buffer[unknown:unknown + len(echo)], b"", "ERROR",
                       split_lines(buffer[:unknown]))
    if framed >= 0:
        body_start = framed + len(echo) + 3
        match = _WORD_LINE.search(buffer, body_start)
        if match is None or (match.group(1) == b"" and not idle):
            return None  # a body-only answer ends here unless more body follows
        body = buffer[body_start:match.start()]
        return Decoded(match.end(), buffer[framed:framed + len(echo)], body,
                       text(match.group(1)), split_lines(buffer[:framed]))
    if idle and buffer:
        return _unframed(buffer)
    return None


def _unframed(buffer):
    """A self-answering command's own text (or the 200-character line's lone ERROR)."""
    data = bytes(buffer)
    result = None
    for word in RESULT_WORDS:
        if data.endswith(b"\r\n" + word.encode() + b"\r\n"):
            result = word
            data = data[:-len(word) - 4]
            break
    return Decoded(len(buffer), b"", data, result, [])


def _nul_run(buffer, start):
    """(first NUL at or after start, index after its run) or (-1, -1)."""
    first = buffer.find(b"\0", start)
    if first < 0:
        return -1, -1
    end = first
    while end < len(buffer) and buffer[end] == 0:
        end += 1
    return first, end


def _block_start(buffer, lower, first_nul, run_end):
    """Where the padded block ending at run_end began, if that is a possible start."""
    start = run_end - BLOCK
    if start < lower or first_nul <= start:
        return -1
    if start > lower and buffer[start - 1:start] != b"\n":
        return -1
    return start


def decode_tcp(buffer, command, idle):
    echo = echo_of(command)
    at = _find_echo(buffer, echo, b"\r\n\n\0")
    if at < 0:
        unknown = _find_echo(buffer, echo, b"\r\nERROR\r\n")
        if unknown >= 0:
            end = unknown + len(echo) + len(b"\r\nERROR\r\n")
            return Decoded(end, buffer[unknown:unknown + len(echo)], b"", "ERROR",
                           split_lines(buffer[:unknown]))
        if idle and buffer and b"\0" not in buffer:
            return _unframed(buffer)
        return None
    unsolicited = split_lines(buffer[:at])
    pos = at + BLOCK
    if len(buffer) < pos:
        return None

    # The body block: its padding ends where the next send begins.
    first, run_end = _nul_run(buffer, pos)
    if first < 0 or run_end == len(buffer):
        return None
    start = _block_start(buffer, pos, first, run_end)
    if start < 0:
        return None
    unsolicited += split_lines(buffer[pos:start])
    body = buffer[start:first]
    body = body[:-1] if body.endswith(b"\n") else body
    pos = run_end

    # The result block: one of the known words, then padding up to a whole block.
    first = buffer.find(b"\0", pos)
    if first < 0:
        return None
    for word in sorted(RESULT_WORDS + ("",), key=len, reverse=True):
        block_text = word.encode() + b"\r\n\n"
        start = first - len(block_text)
        if start < pos or buffer[start:first] != block_text:
            continue
        if start > pos and buffer[start - 1:start] != b"\n":
            continue
        if len(buffer) < start + BLOCK:
            return None
        unsolicited += split_lines(buffer[pos:start])
        return Decoded(start + BLOCK, buffer[at:at + len(echo)], body, word, unsolicited)
    return None


def decoder_for(kind):
    return decode_tcp if kind == "tcp" else decode_serial
