"""The station tool: answer decoding of every framing shape, the encoder of file transfer,
sequences with their JUnit report, and the command line against the real daemon."""

import json
import subprocess
import sys
import xml.etree.ElementTree as ElementTree

import pytest

from conftest import BINARY, SOURCE, Phone, framed_tcp, framed_tty, free_port
import emulator

sys.path.insert(0, str(SOURCE / "station"))
from atcid_station import framing, push, sequence  # noqa: E402

TOOL = [sys.executable, str(SOURCE / "tools" / "atcid-station")]
ADC = b"+EADC:3850,57\r\n"


def tcp_block(text):
    return text.ljust(framing.BLOCK, b"\0")


@pytest.mark.parametrize("kind,data,idle,expected", [
    # (echo, body, result word, unsolicited lines), or None while incomplete
    ("serial", framed_tty(b"AT+JVRAM=0", b'\r\n"2790"\r\n', b"OK"), False,
     ("AT+JVRAM=0", '\r\n"2790"\r\n', "OK", [])),
    ("serial", framed_tty(b"AT+JVRAM=0", b'\r\n"2790"\r\n', b"OK")[:-3], True, None),
    ("serial", ADC + framed_tty(b"AT+JVRAM=0", b"", b"ERROR"), False,
     ("AT+JVRAM=0", "", "ERROR", ["+EADC:3850,57"])),
    ("serial", framed_tty(b"AT+JVRAM=0", b"x", b""), False, None),
    ("serial", framed_tty(b"AT+JVRAM=0", b"x", b""), True, ("AT+JVRAM=0", "x", "", [])),
    ("serial", b"AT+NOSUCH\r\nERROR\r\n", False, ("AT+NOSUCH", "", "ERROR", [])),
    ("serial", b"\r\nshutting down\r\n", False, None),
    ("serial", b"\r\nshutting down\r\n", True, ("", "\r\nshutting down\r\n", None, [])),
    ("tcp", framed_tcp(b"AT+JVRAM=0", b'\r\n"2790"\r\n', b"OK"), False,
     ("AT+JVRAM=0", '\r\n"2790"\r\n', "OK", [])),
    ("tcp", framed_tcp(b"AT+JVRAM=0", b"", b"Not Implement")[:-1], False, None),
    ("tcp", tcp_block(b"AT+JVRAM=0\r\n\n") + ADC + tcp_block(b"7\n") + ADC
     + tcp_block(b"\r\n\n"), False, ("AT+JVRAM=0", "7", "", ["+EADC:3850,57"] * 2)),
    ("tcp", ADC + framed_tcp(b"AT+JVRAM=0", b"", b"ERROR"), False,
     ("AT+JVRAM=0", "", "ERROR", ["+EADC:3850,57"])),
    ("tcp", b"AT+NOSUCH\r\nERROR\r\n", False, ("AT+NOSUCH", "", "ERROR", [])),
])
def test_decoders(kind, data, idle, expected):
    command = expected[0] if expected and expected[0] else "AT+JVRAM=0"
    decoded = framing.decoder_for(kind)(bytearray(data), command.lower(), idle)
    if expected is None:
        assert decoded is None
        return
    assert (framing.text(decoded.echo), framing.text(decoded.body), decoded.result,
            decoded.unsolicited) == expected
    assert decoded.consumed == len(data)


@pytest.mark.parametrize("body,value", [
    ('\r\n"QM0305"\r\n', "QM0305"),
    ('\r\n"4f2a91c3\n"\r\n', "4f2a91c3\n"),  # a file's line end stays inside the quotes
    ('\r\n"front:A\r\nback:B"\r\n ', "front:A\r\nback:B"),
    ('"1.25"', "1.25"),
    ("350000000000014", "350000000000014"),  # a modem item's text, unquoted
    ('\r\n"a"\r\nb', '"a"'),  # not one quoted value: the first line
    ("", ""),
])
def test_answer_value(body, value):
    assert framing.Answer("AT", body=body, result="OK").value == value


def test_encoder_matches_the_phones_decoding():
    data = bytes(range(256))
    chars = push.encode(data)
    assert chars[:4] == b"0001" and chars[-2:] == b"??" and chars[20:22] == b"0:"
    assert push.decode(chars) == data


@pytest.mark.parametrize("text,error", [
    ("AT+X expect=maybe", "unknown result word"),
    ("AT+X timeout=-1", "not a number"),
    ("AT+X body~=(", "bad regular expression"),
    ("HELLO", "beginning with AT"),
    ("wait", "wait takes one"),
    ("AT+X 'open", "No closing quotation"),
])
def test_sequence_errors_name_the_line(text, error):
    with pytest.raises(sequence.SequenceError, match=f"s.seq:2: .*{error}"):
        sequence.parse("# first\n" + text, where="s.seq")


@pytest.fixture
def tcp_daemon(device_root):
    emulator.prepare_mode(device_root, "tcp")
    phone = Phone(device_root)
    phone.ready_text = "start accept"
    port = free_port()
    phone.start(port)
    phone.url = f"tcp://127.0.0.1:{port}"
    yield phone
    phone.stop()


@pytest.fixture
def usb_daemon(device_root):
    emulator.prepare_mode(device_root, "usb")
    bridge = emulator.PtyBridge()
    emulator.link_port(device_root, "ttyGS0", bridge.device_path)
    phone = Phone(device_root)
    phone.ready_text = "Wait for select data from USB"
    phone.start()
    phone.url = bridge.station_path
    yield phone
    phone.stop()
    bridge.close()


def tool(*args, stdin=None, timeout=60):
    return subprocess.run(TOOL + [str(a) for a in args], input=stdin, capture_output=True,
                          text=True, timeout=timeout)


@pytest.mark.parametrize("transport", ["tcp", "usb"])
def test_one_shot_json_and_status(transport, request):
    phone = request.getfixturevalue(f"{transport}_daemon")
    run = tool(phone.url, "--json", "AT+JVMODEL=0", "at+jvmodel?")
    assert run.returncode == 1, run.stderr
    first, second = (json.loads(line) for line in run.stdout.splitlines())
    assert (first["result"], first["lines"]) == ("OK", ['"QM0305"'])
    assert first["raw"].encode("latin-1") == (
        framed_tcp if transport == "tcp" else framed_tty)(b"AT+JVMODEL=0", b'\r\n"QM0305"\r\n', b"OK")
    assert (second["echo"], second["result"]) == ("AT+JVMODEL?", "Not Implement")


def test_exit_statuses_and_interactive_prompt(usb_daemon):
    assert tool(usb_daemon.url, "AT+JVMODEL=0", "AT+JVRAM=0").returncode == 0
    refused = tool(f"tcp://127.0.0.1:{free_port()}", "AT+JVMODEL=0")
    assert refused.returncode == 2 and "connection refused" in refused.stderr
    missing = tool("/dev/no-such-tty", "AT")
    assert missing.returncode == 2 and "no such device" in missing.stderr
    session = tool(usb_daemon.url, "--upper", stdin="at+jvmodel=0\nat+nosuch\n")
    assert session.returncode == 0, session.stderr
    assert 'AT+JVMODEL=0 -> OK' in session.stdout and '   "QM0305"' in session.stdout
    assert "AT+NOSUCH -> ERROR" in session.stdout


def test_sequence_stops_at_a_failed_step_and_reports_junit(usb_daemon, tmp_path):
    script = tmp_path / "checks.seq"
    script.write_text(
        "AT+JVMODEL=0 save=model\n"
        "AT+JVMODEL=0 body='\"${model}\"'\n"
        "AT+NOSUCH expect=error continue\n"
        "AT+JVMODEL? expect=OK\n"
        "wait 0\n")
    report = tmp_path / "report.xml"
    run = tool(usb_daemon.url, "run", script, "--junit", report)
    assert run.returncode == 1
    assert run.stdout.splitlines()[-1] == "3 passed, 1 failed, 1 not run"
    suite = ElementTree.parse(report).getroot().find("testsuite")
    assert (suite.get("tests"), suite.get("failures"), suite.get("skipped")) == ("5", "1", "1")
    cases = suite.findall("testcase")
    assert cases[3].find("failure").get("message") == "result 'Not Implement', expected 'OK'"
    assert cases[4].find("skipped") is not None


@pytest.mark.parametrize("transport", ["tcp", "usb"])
def test_push_stores_every_byte_value(transport, request, tmp_path):
    phone = request.getfixturevalue(f"{transport}_daemon")
    data = bytes(range(256)) * 41 + b"\n\r\0"
    local = tmp_path / "blob.bin"
    local.write_bytes(data)
    run = tool(phone.url, "push", local, "Blob.BIN")
    assert run.returncode == 0, run.stdout + run.stderr
    assert "MD5 verified" in run.stdout and "[" not in run.stdout  # no progress bar in a pipe
    assert (phone.root / "data" / "blob.bin").read_bytes() == data
