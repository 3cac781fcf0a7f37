"""Lights, display, sensor and battery commands through the real daemon: a fresh template
phone, the worker streams between answers, and the sleep test on the UART."""
import re
import time

import pytest

from conftest import BLOCK, PATIENCE, QEMU_USER, TtyPhone, framed_tcp, framed_tty

import emulator

OK, ERR = b"OK", b"ERROR"

# (line, body, word) on a fresh template phone, in this order.
TEMPLATE_SEQUENCE = [
    (b"AT+EDFT=6,1", b"", OK), (b"AT+EDFT=6,1", b"", OK), (b"AT+EDFT=6,0", b"", OK),
    (b"AT+EDFT=5,1", b"", OK), (b"AT+EDFT=5,0", b"", OK), (b"AT+EDFT=0,5,128", b"", OK),
    (b"AT+EDFT=0,5,256", b"", ERR), (b"AT+EDFT=0,0", b"", OK),
    (b"AT+JVLIGHT=1", b"", OK), (b"AT+JVLIGHT=0", b"", OK),
    (b"AT+MMILED=1,1", b"", OK), (b"AT+MMILED=1,2", b"", OK), (b"AT+MMILED=1,3", b"", OK),
    (b"AT+MMILED=1,0", b"", OK),
    (b"AT+JVSG=1", b"", OK), (b"AT+JVSG=1,1", b"", OK), (b"AT+JVSG=1,2", b"", OK),
    (b"AT+JVSG=0,1", b"", OK), (b"AT+JVSG=0,2", b"", OK), (b"AT+JVSG=1,3", b"", OK),
    (b"AT+JVSG=0,3", b"", OK),
    (b"AT+JVFLIGHT=1", b"", OK), (b"AT+SGDJZ=1", b'\n+led_result:"0"\r\n', ERR),
    (b"AT+JVSP=0", b"", OK), (b"AT+JVSP=1", b"", OK), (b"AT+JVSP=3", b"", OK),
    (b"AT+JVBS=1", b"", OK), (b"AT+JVBS=0", b"", OK),
    (b"AT+LCMT=1,2", b"", OK), (b"AT+LCMT=0", b"", OK),
    (b"AT+JVLCD=1,1", b"", OK), (b"AT+JVLCD=0", b'\r\n"1"\r\n', OK),
    (b"AT+EQSB=0", b"", OK), (b"AT+ESLP=0", b"", OK),
    (b"AT+MMICCM=B,1", b"", OK), (b"AT+MMICCM=F,2", b"", OK), (b"AT+MMICCM=B,0", b"", OK),
    (b"AT+MMITW=1", b"", OK), (b"AT+MMITW=0", b"", OK),
    (b"AT+JVZLJC=0,3", b'"0,-0,10"\r\n', OK), (b"AT+JVZLJC=0,5", b"", OK),
    (b"AT+JVZLJC=0,2", b'"1"\r\n', OK), (b"AT+JVZLJC=0,6", b"", OK),
    (b"AT+JVDZLP=1", b'"0,0,0"\r\n', OK), (b"AT+JVDZLP=3", b'"0,0,0"\r\n', OK),
    (b"AT+JVDZLP=0", b"", OK),
    (b"AT+JVHWKJ=1", b'"0"\r\n', OK), (b"AT+JVHWKJ=2", b'"0,0"\r\n', OK),
    (b"AT+JVHWKJ=3", b"", OK),
    (b"AT+JVGM=2", b'"Not clibration"\r\n', ERR), (b"AT+JVGM=0", b"", OK),
    (b"AT+JVTLY=0", b"", OK), (b"AT+JVTLY=2", b"", OK),
    (b"AT+EADC=2", b'"1.25"', OK), (b"AT+EADC=3", b'\r\n"1500"\r\n', OK),
    (b"AT+JVDLJ=1", b'"3.85,57%"\r\n', OK), (b"AT+JVCHARGE=0", b"", OK),
    (b"AT+JVCHARG=0", b"", OK), (b"AT+RMCHARGEP=0", b"", OK), (b"AT+JVQXGWBH=1,0", b"", OK),
    (b"AT+JVDISRECHARGE=0", b"", OK), (b"AT+JVDLJCS=2", b"", OK),
]


def test_template_phone(tcp_phone):
    for line, body, word in TEMPLATE_SEQUENCE:
        assert tcp_phone.command(line) == framed_tcp(line, body, word), line
    root = tcp_phone.root
    assert (root / "sys/class/timed_output/vibrator/enable").read_text() == "0"
    assert (root / "sys/class/leds/lcd-backlight/brightness").read_text() == "0"
    # The template is of the LED model group: "all off" only clears the engineering node.
    assert (root / "sys/class/leds/red/brightness").read_text() == "100"
    assert (root / "sys/class/leds/green/engineering").read_text() == "0"
    assert (root / "sys/class/leds/flash1_torch-light/brightness").read_text() == "0"
    assert (root / ".emu/wake_lock.log").read_text() == "acquire 1 atcid\nrelease atcid\n"
    if not QEMU_USER:  # the one effect of the isolated shell here (see conftest)
        assert (root / ".emu/input.log").read_text() == "input keyevent 4\n"
    assert (root / "sys/devices/system/cpu/cpu0/cpufreq/scaling_max_freq").read_text() == "800000"
    assert (root / "sys/kernel/debug/cms/debug").read_text() == "chg-cutoff"
    assert not (root / "data/data/com.ulda.engineermode/keepScreenOn").exists()
    assert (root / "sys/power/autosleep").read_text() == "off\n"


ADC_LINE = re.compile(rb"\+EADC: \"[-0-9.]+,[-0-9.]+,0\.58,[-0-9.]+,4\.50\"\r\n")


def read_tty_until(phone, done, timeout=20.0):
    data = b""
    deadline = time.monotonic() + timeout
    while time.monotonic() < deadline and not done(data):
        data += phone.station.read(65536)
    return data


def split_tty(data, answers):
    """Walks the bytes as whole answers with whole stream lines only between them:
    (answers matched, stream lines). Stops at the first byte that fits neither."""
    matched, lines = 0, []
    while data:
        line = ADC_LINE.match(data)
        if line:
            lines.append(line.group())
            data = data[line.end():]
        elif matched < len(answers) and data.startswith(answers[matched]):
            data = data[len(answers[matched]):]
            matched += 1
        else:
            break
    return matched, lines


def test_adc_stream_falls_between_tty_answers(usb_phone):
    lines = [(b"AT+EADC=1", b"", OK)] + [(b"AT+JVDLJ=1", b'"3.85,57%"\r\n', OK),
                                          (b"AT+EADC=2", b'"1.25"', OK),
                                          (b"AT+JVCHARGE=0", b"", OK)] * 4
    answers = [framed_tty(*line) for line in lines]
    data = b""
    for i, (line, _, _) in enumerate(lines):
        usb_phone.send(line + b"\n")
        data += read_tty_until(usb_phone, lambda d: split_tty(data + d, answers)[0] > i)
    data += read_tty_until(usb_phone, lambda d: len(split_tty(data + d, answers)[1]) >= 3)
    matched, stream = split_tty(data, answers)
    assert matched == len(answers)
    assert len(data) == len(b"".join(answers)) + len(b"".join(stream))  # nothing else
    assert stream[0] == b'+EADC: "3.85,25.00,0.58,450.00,4.50"\r\n'
    # Stopped: at most one line follows the answer, then the port stays quiet.
    usb_phone.send(b"AT+EADC=0\n")
    stop = [framed_tty(b"AT+EADC=0", b"", OK)]
    tail = read_tty_until(usb_phone, lambda d: split_tty(d, stop)[0] == 1)
    tail += usb_phone.receive(quiet=1.0, timeout=1.0)
    matched, stream = split_tty(tail, stop)
    assert matched == 1 and len(stream) <= 1 + stream_lines_before(tail, stop[0])
    assert len(tail) == len(stop[0]) + len(b"".join(stream))


def stream_lines_before(data, answer):
    """Stream lines that arrived before the answer: they ran before the stop."""
    return len(ADC_LINE.findall(data[:data.index(answer)]))


def split_tcp(data):
    """Strips the Z stream's writes from between 2048-byte blocks: (blocks, stream writes)."""
    blocks, writes = [], []
    while data:
        if data.startswith(b"\r\n") and not data.startswith(b"\r\n\0"):
            end = 2
            while end < len(data) and data[end:end + 1] in b"-0123456789" and end < 9:
                end += 1
            writes.append(data[:end])
            data = data[end:]
            continue
        blocks.append(data[:BLOCK])
        data = data[BLOCK:]
    return blocks, writes


def test_z_stream_falls_between_tcp_blocks(tcp_phone):
    lines = [b"AT+JVZLJC=0,1"] + [b"AT+JVZLJC=0,3", b"AT+JVSP=3"] * 3 + [b"AT+JVZLJC=0,1"]
    answers = {b"AT+JVZLJC=0,1": (b"", OK), b"AT+JVZLJC=0,3": (b'"0,-0,10"\r\n', OK),
               b"AT+JVSP=3": (b"", OK)}
    expected = b""
    data = b""
    for i, line in enumerate(lines):
        body, word = answers[line]
        if i == len(lines) - 1:
            word = ERR  # a second start is refused while one is recorded
        expected += framed_tcp(line, body, word)
        tcp_phone.send(line)
        deadline = time.monotonic() + 20
        while time.monotonic() < deadline and b"".join(split_tcp(data)[0]) != expected:
            data += tcp_phone.receive(size=1, quiet=0.05, timeout=1)
    data += tcp_phone.receive(quiet=0.7, timeout=2)
    blocks, writes = split_tcp(data)
    assert b"".join(blocks) == expected
    assert writes and set(writes) == {b"\r\n10"}
    assert tcp_phone.command(b"AT+JVZLJC=0,0").endswith(framed_tcp(b"AT+JVZLJC=0,0", b"", OK))


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


def start_each(phone, kind, lines):
    """Sends each start line once the previous one is answered OK. Stream output may come
    before, after and, on TCP, between the answer's blocks."""
    usb = kind == "usb"
    data = b""
    for line in lines:
        phone.send(line + (b"\n" if usb else b""))
        answer = framed_tty(line, b"", OK) if usb else framed_tcp(line, b"", OK)
        pieces = [answer] if usb else [answer[i:i + BLOCK] for i in range(0, len(answer), BLOCK)]
        deadline = time.monotonic() + PATIENCE
        while not in_order(data, pieces) and time.monotonic() < deadline:
            data += phone.station.read(65536) if usb else phone.receive(size=1, timeout=1)
        assert in_order(data, pieces), line


def in_order(data, pieces):
    at = 0
    for piece in pieces:
        at = data.find(piece, at)
        if at < 0:
            return False
        at += len(piece)
    return True


@pytest.mark.parametrize("kind", ["usb", "tcp"])
def test_long_line_ends_the_daemon_while_workers_run(request, kind):
    phone = request.getfixturevalue(kind + "_phone")
    start_each(phone, kind, (b"AT+EDFT=6,1", b"AT+JVLIGHT=1", b"AT+EADC=1", b"AT+JVZLJC=0,1"))
    phone.send(b"AT+NOTHERE=" + b"X" * 189 + (b"\n" if kind == "usb" else b""))
    assert phone.wait(timeout=20) == 0


def test_lost_port_ends_the_daemon_while_streams_run(usb_phone):
    start_each(usb_phone, "usb", (b"AT+EADC=1", b"AT+JVZLJC=0,1", b"AT+EDFT=6,1"))
    read_tty_until(usb_phone, lambda d: len(ADC_LINE.findall(d)) >= 2)
    usb_phone.bridge.hang_up()
    assert usb_phone.wait(timeout=20) == 1
