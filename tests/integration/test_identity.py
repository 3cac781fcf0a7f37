"""Clock and device key through the real daemon and the emulated phone's shell and tools."""
import re
import time

import pytest

from conftest import framed_tcp, framed_tty


@pytest.fixture(params=["tcp", "usb"])
def phone(request):
    p = request.getfixturevalue(request.param + "_phone")
    # busybox's own shell runs its date applet and ends background jobs with the call; the
    # phone's shell (a PATH-only mksh) runs the stand-ins and keeps background jobs.
    if (p.root / "system/bin/sh").resolve().name == "busybox":
        pytest.skip("the emulated shell is busybox sh, not the PATH-only phone shell")
    return (framed_tcp if request.param == "tcp" else framed_tty), p


def test_clock_set_then_read(phone):
    framed, p = phone
    line = b"AT+JVSJ=1,2026-11-15,08:20:00"
    assert p.command(line) == framed(line, b"", b"OK")
    answer = p.command(b"AT+JVSJ=0")
    clock = re.search(rb"08:2\d:\d\d", answer)  # the emulated clock runs on from 08:20:00
    assert clock and answer == framed(b"AT+JVSJ=0", b'\r\n"2026-11-15"\r\n"%s"\r\n"7"\r\n' % clock[0], b"OK")
    assert (p.root / ".emu/date.log").read_text().splitlines() == ["date -s 20261115.082000", "date"]


def test_key_generated_then_saved(phone):
    framed, p = phone
    assert p.command(b"AT+PEMUKP=1,keysaved") == framed(b"AT+PEMUKP=1,KEYSAVED", b"", b"ERROR")
    assert p.command(b"AT+PEMUKP=1,genkey") == framed(b"AT+PEMUKP=1,GENKEY", b"", b"OK")
    key = p.root / ".emu/pemukp/key"
    deadline = time.monotonic() + 30
    while not key.exists() and time.monotonic() < deadline:
        time.sleep(0.05)
    assert p.command(b"AT+PEMUKP=1,keysaved") == framed(b"AT+PEMUKP=1,KEYSAVED", b"", b"OK")
    assert p.command(b"AT+PEMUKP=1,getkey") == framed(b"AT+PEMUKP=1,GETKEY", b'"%s"' % key.read_bytes(), b"OK")
    assert not (p.root / "data/RSAtemp").exists()
