"""Identity, clock, key and language commands through the real daemon and the emulated
phone's modem, date and key tools, answers compared byte for byte."""
import re
import time

import pytest

from conftest import framed_tcp, framed_tty


def framed(kind, line, body, word):
    return (framed_tcp if kind == "tcp" else framed_tty)(line, body, word)


@pytest.fixture(params=["tcp", "usb"])
def phone(request):
    """(kind, phone) for each transport."""
    return request.param, request.getfixturevalue(request.param + "_phone")


def needs_path_shell(p):
    # busybox's own shell runs its date applet and ends background jobs with the call; the
    # phone's shell (a PATH-only mksh) runs the stand-ins and keeps background jobs.
    if (p.root / "system/bin/sh").resolve().name == "busybox":
        pytest.skip("the emulated shell is busybox sh, not the PATH-only phone shell")


def wait_for(condition, timeout=30):
    deadline = time.monotonic() + timeout
    while not condition():
        if time.monotonic() > deadline:
            return False
        time.sleep(0.05)
    return True


def body_of(kind, line, answer, word):
    """The body of a framed answer, after checking the framing around it."""
    if kind == "tcp":
        body = answer[2048:4096].rstrip(b"\0")[:-1]
    else:
        body = answer[len(line) + 3:-len(word) - 5]
    assert answer == framed(kind, line, body, word)
    return body


def test_barcode_written_and_read_back(phone):
    kind, p = phone
    line = b'AT+EGMR=1,5,"pcb-0042"'
    assert p.command(line) == framed(kind, line.upper(), b"", b"OK")
    assert p.command(b"AT+EGMR=0,5") == framed(kind, b"AT+EGMR=0,5", b"PCB-0042", b"OK")
    assert (p.root / ".emu/modem/nv/6853").read_bytes() == b"PCB-0042"
    assert (p.root / "dev/__properties__/persist.sys.barcode").read_bytes() == b"PCB-0042"
    (p.root / ".emu/modem/transport_error").write_text("1")
    assert p.command(b"AT+EGMR=1,5,X") == framed(kind, b"AT+EGMR=1,5,X", b"", b"ERROR")
    assert (p.root / "dev/__properties__/persist.sys.barcode").read_bytes() == b"PCB-0042"


def test_language_change_reaches_engineer_mode(phone):
    kind, p = phone
    assert p.command(b"AT+JVLC=1,ZH,CN") == framed(kind, b"AT+JVLC=1,ZH,CN", b"", b"OK")
    assert p.command(b"AT+JVLC=1,ZH") == framed(kind, b"AT+JVLC=1,ZH", b"", b"ERROR")
    assert p.command(b"AT+JVLC=0") == framed(kind, b"AT+JVLC=0", b'"en","US"', b"OK")
    assert (p.root / ".emu/am.log").read_text().splitlines() == [
        "am broadcast -n com.ulda.engineermode/.ATSetLanguageReceiver "
        "-a kro.intent.action.AT_SET_LANGUAGE -e language ZH -e region CN"]


def test_clock_set_then_read(phone):
    kind, p = phone
    needs_path_shell(p)
    line = b"AT+JVSJ=1,2026-11-15,08:20:00"
    assert p.command(line) == framed(kind, line, b"", b"OK")
    answer = p.command(b"AT+JVSJ=0")
    # the emulated clock runs on from 08:20:00
    body = body_of(kind, b"AT+JVSJ=0", answer, b"OK")
    assert re.fullmatch(rb'\r\n"2026-11-15"\r\n"08:2\d:\d\d"\r\n"7"\r\n', body), body
    assert (p.root / ".emu/date.log").read_text().splitlines() == ["date -s 20261115.082000", "date"]
    # a date that does not exist leaves the clock alone, and the command still answers OK
    line = b"AT+JVSJ=1,2026-02-31,08:20:00"
    assert p.command(line) == framed(kind, line, b"", b"OK")
    (p.root / ".emu/date_output").write_text("Sun Nov 15 08:20:00 UTC 2026\n")
    assert p.command(b"AT+JVSJ=0") == framed(
        kind, b"AT+JVSJ=0", b'\r\n"2026-11-15"\r\n"08:20:00"\r\n"7"\r\n', b"OK")


def test_key_generated_then_saved(phone):
    kind, p = phone
    needs_path_shell(p)
    assert p.command(b"AT+PEMUKP=1,keysaved") == framed(kind, b"AT+PEMUKP=1,KEYSAVED", b"", b"ERROR")
    assert p.command(b"AT+PEMUKP=1,genkey") == framed(kind, b"AT+PEMUKP=1,GENKEY", b"", b"OK")
    key = p.root / ".emu/pemukp/key"
    assert wait_for(key.exists), "the background key generation never stored a key"
    assert p.command(b"AT+PEMUKP=1,keysaved") == framed(kind, b"AT+PEMUKP=1,KEYSAVED", b"", b"OK")
    body = b'"' + key.read_bytes() + b'"'
    assert p.command(b"AT+PEMUKP=1,getkey") == framed(kind, b"AT+PEMUKP=1,GETKEY", body, b"OK")
    assert not (p.root / "data/RSAtemp").exists()
