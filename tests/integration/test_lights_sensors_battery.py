"""Lights, display, sensors and battery through the real daemon: one command of each family on
the template phone, the worker streams between answers, sleep on the UART, and the daemon's end
while workers run."""
import re
import time

import pytest

from conftest import BLOCK, PATIENCE, QEMU_USER, TtyPhone, framed_tcp, framed_tty

import emulator

OK, ERR = b"OK", b"ERROR"
ADC_LINE = rb'\+EADC: "[-0-9.]+,[-0-9.]+,0\.58,[-0-9.]+,4\.50"\r\n'
Z_WRITE = rb"\r\n-?[0-9]{1,7}"
STREAMS = ADC_LINE + b"|" + Z_WRITE


def test_one_command_per_family_on_the_template_phone(tcp_phone):
    for line, body in [(b"AT+EDFT=5,1", b""), (b"AT+MMITW=0", b""),
                       (b"AT+JVZLJC=0,3", b'"0,-0,10"\r\n'), (b"AT+JVDLJ=1", b'"3.85,57%"\r\n')]:
        assert tcp_phone.command(line) == framed_tcp(line, body, OK), line
    assert (tcp_phone.root / "sys/class/leds/button-backlight/brightness").read_text() == "255"
    if not QEMU_USER:  # the one effect of the isolated shell here (see conftest)
        assert (tcp_phone.root / ".emu/input.log").read_text() == "input keyevent 4\n"


def between(pieces):
    """The pieces whole and in order, with any number of the streams' writes around them."""
    around = b"(?:%s)*" % STREAMS
    return re.compile(around + b"".join(re.escape(piece) + around for piece in pieces))


def read_until(read, done, data=b""):
    deadline = time.monotonic() + PATIENCE
    while not done(data) and time.monotonic() < deadline:
        data += read()
    return data


def reader(phone, kind):
    return (lambda: phone.station.read(65536)) if kind == "usb" else (lambda: phone.receive(size=1, quiet=0.05, timeout=1))


def exchange(phone, kind, commands):
    """Sends each (line, body, word) once the previous one is answered; returns every byte
    received. Each answer comes whole (on TCP, each of its blocks), stream writes only around."""
    pieces, data = [], b""
    for line, body, word in commands:
        phone.send(line + (b"\n" if kind == "usb" else b""))
        answer = (framed_tty if kind == "usb" else framed_tcp)(line, body, word)
        pieces += [answer] if kind == "usb" else [answer[i:i + BLOCK] for i in range(0, len(answer), BLOCK)]
        data = read_until(reader(phone, kind), between(pieces).fullmatch, data)
        assert between(pieces).fullmatch(data), line
    return data


STARTS = [(line, b"", OK) for line in (b"AT+EDFT=6,1", b"AT+JVLIGHT=1", b"AT+EADC=1", b"AT+JVZLJC=0,1")]


@pytest.mark.parametrize("kind", ["usb", "tcp"])
def test_streams_fall_between_answers_and_a_long_line_ends_the_daemon(request, kind):
    phone = request.getfixturevalue(kind + "_phone")
    others = [(b"AT+JVDLJ=1", b'"3.85,57%"\r\n', OK), (b"AT+JVZLJC=0,3", b'"0,-0,10"\r\n', OK),
              (b"AT+JVZLJC=0,1", b"", ERR)]  # a second start is refused while one is recorded
    data = exchange(phone, kind, STARTS + others * 4)
    data = read_until(reader(phone, kind), lambda d: len(re.findall(ADC_LINE, d)) >= 3, data)
    assert re.findall(ADC_LINE, data)[0] == b'+EADC: "3.85,25.00,0.58,450.00,4.50"\r\n'
    assert set(re.findall(Z_WRITE, data)) == {b"\r\n10"}
    phone.send(b"AT+NOTHERE=" + b"X" * 189 + (b"\n" if kind == "usb" else b""))
    assert phone.wait(timeout=20) == 0


def test_sleep_in_console_mode_on_the_uart(device_root):
    emulator.prepare_mode(device_root, "uart")
    phone = TtyPhone(device_root, "uart")
    try:
        phone.start()
        assert phone.command(b"AT+EQSB=0") == b"AT+EQSB=0\r\n\r\nOK\r\n"
        if not QEMU_USER:  # written through the isolated shell (see conftest)
            assert (device_root / "sys/power/autosleep").read_text() == "mem\n"
            assert (device_root / "sys/touchscreen/suspend_cmd").read_text() == "1\n"
        assert (device_root / ".emu/framebuffer.log").read_text() == "blank 4\n"
        # The phone does not sleep: the daemon keeps serving.
        assert phone.command(b"AT+JVDLJ=1") == framed_tty(b"AT+JVDLJ=1", b'"3.85,57%"\r\n', OK)
    finally:
        phone.stop()


# A hang-up once left the daemon spinning: with the streams running it must still end.
def test_lost_port_ends_the_daemon_while_streams_run(usb_phone):
    data = exchange(usb_phone, "usb", STARTS)
    read_until(reader(usb_phone, "usb"), lambda d: len(re.findall(ADC_LINE, d)) >= 2, data)
    usb_phone.bridge.hang_up()
    assert usb_phone.wait(timeout=20) == 1
