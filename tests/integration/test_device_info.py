"""Device information queries through the real daemon, answers compared byte for byte."""
import pytest

from conftest import framed_tcp, framed_tty


def framed(kind, line, body, word):
    """The bytes a station receives for one command on that kind of port."""
    return (framed_tcp if kind == "tcp" else framed_tty)(line, body, word)


@pytest.fixture(params=["tcp", "usb"])
def phone(request):
    """(kind, phone) for each transport."""
    return request.param, request.getfixturevalue(request.param + "_phone")


@pytest.mark.parametrize("line, body, word", [
    (b"AT+JVRAM=0", b'\r\n"2790"\r\n', b"OK"),
    (b"AT+JVFQ=0", b'\r\n"14.56"\r\n', b"OK"),
    (b"AT+JVBBTYPE=0", b'\r\n"8974AB"\r\n', b"OK"),
    (b"AT+JVCCMID=0", b'\r\n"front:ov5670\r\nback:imx214"\r\n ', b"OK"),
    (b"AT+JVMPPS=0", b'\r\n"cpu--AB\n"\r\n', b"OK"),
    (b"AT+JVTS=1", b"\r\nsim1:1\n\r\n\r\nsim2:1\n\r\n\r\ntf:1\n\r\n", b""),
    (b"AT+JVSIM=1", b"", b"ERROR"),
    (b"AT+JVZSJ=1", b"", b"Not Implement"),
    (b"AT+JVIICRC=0", b"", b"Not Implement"),
])
def test_template_phone_answers(phone, line, body, word):
    kind, p = phone
    assert p.command(line) == framed(kind, line, body, word)


def test_values_follow_the_phone(phone):
    kind, p = phone
    p.set_property("ro.build.version.kro", "V1.0.3")
    p.set_property("gsm.sim.state", "READY,ABSENT")
    (p.root / "sys/devs_list/mpps_value").write_bytes(b"cpu--AA AB\n")
    (p.root / "proc/meminfo").write_bytes(b"MemTotal:\n")
    assert p.command(b"AT+JVTWST=0") == framed(kind, b"AT+JVTWST=0", b'"V1.0.3_0x1a"\n', b"OK")
    assert p.command(b"AT+JVCARD=1") == framed(kind, b"AT+JVCARD=1", b'+cards:"SIM1","","TF"', b"OK")
    assert p.command(b"AT+JVSIM=1") == framed(kind, b"AT+JVSIM=1", b"", b"OK")
    assert p.command(b"AT+JVBBTYPE=0") == framed(kind, b"AT+JVBBTYPE=0", b'\r\n"8974AB"\r\n', b"OK")
    assert p.command(b"AT+JVRAM=0") == framed(kind, b"AT+JVRAM=0", b"", b"ERROR")
