"""Closing the debug access, power and recovery requests and file transfer through the real
daemon, as a station sees them on the USB port, the UART and TCP."""
import hashlib
import random
import time
import zipfile

import pytest

import emulator
from conftest import TtyPhone, framed_tcp, framed_tty


@pytest.fixture(params=["tcp", "usb"])
def phone(request):
    """(kind, phone) for each transport."""
    return request.param, request.getfixturevalue(request.param + "_phone")


def send_line(kind, p, line):
    p.send(line if kind == "tcp" else line + b"\n")


def read_at_least(kind, p, size, timeout=60.0):
    data = b""
    deadline = time.monotonic() + timeout
    while len(data) < size and time.monotonic() < deadline and p.proc.poll() is None:
        data += p.receive(size - len(data)) if kind == "tcp" else p.receive()
    return data


def wait_log(p, text):
    assert emulator.wait_for_log(p.log_path, text, p.proc, timeout=60.0), p.log()[-2000:]


def test_close_adb_answers_early_then_frames(phone):
    kind, p = phone
    send_line(kind, p, b"AT+JVADB=0,1")
    framed = framed_tcp if kind == "tcp" else framed_tty
    expected = b"AT+JVADB=0,1\r\nOK\r\n" + framed(b"AT+JVADB=0,1", b"", b"OK")
    assert read_at_least(kind, p, len(expected)) == expected
    assert (p.root / "dev/__properties__/persist.sys.usb.config").read_text() == "charging"


def test_close_adb_on_the_uart_frames_only(device_root):
    emulator.prepare_mode(device_root, "uart")
    p = TtyPhone(device_root, "uart")
    p.start()
    try:
        expected = framed_tty(b"AT+JVADB=0,0", b"", b"OK")
        assert p.command(b"AT+JVADB=0,0", timeout=60.0) == expected
    finally:
        p.stop()


@pytest.mark.parametrize("kind, line, early, power", [
    ("usb", b"at+jvgj=0 ", b"AT+JVGJ=0\r\nOK\r\n", "power-off\n"),
    ("tcp", b"AT+JVREBOOT=1", b"AT+JVREBOOT=1\r\nOK\r\n", "restart\n"),
    ("tcp", b"AT+JVADB=0,2", b"AT+JVADB=0,2\r\nOK\r\n", "restart\n"),
])
def test_power_requests_leave_only_the_early_answer(request, kind, line, early, power):
    p = request.getfixturevalue(kind + "_phone")
    send_line(kind, p, line)
    assert p.wait(timeout=60) == 0
    assert p.receive(timeout=2.0) == early
    assert (p.root / ".emu/power.log").read_text() == power


def put_apps_package(root):
    with zipfile.ZipFile(root / "storage/sdcard0/apps.zip", "w") as zf:
        zf.writestr("apps.version", "version=QM0305_V1.0.12_20261101\n")


def test_update_answers_first_then_restarts_into_recovery(tcp_phone):
    p = tcp_phone
    put_apps_package(p.root)
    p.send(b"AT+JVUPDATE=1")
    assert p.wait(timeout=60) == 0
    assert p.receive(timeout=2.0) == b"AT+JVUPDATE=1\r\n\r\nOK\r\n"
    assert (p.root / ".emu/power.log").read_text() == "restart recovery\n"
    assert (p.root / "cache/recovery/command").read_bytes() == b"--update_app"
    assert not (p.root / "storage/sdcard0/DCIM").exists()  # the card cleaned for apps


def encoded(content):
    return bytes(b for byte in content for b in (0x30 + (byte >> 4), 0x30 + (byte & 15)))


def send_transfer(kind, p, name, content, cut=False):
    """Announces the file, lets the command arrive alone, then sends the characters: lines of
    an even length on a tty, pieces split anywhere (CR LF here and there) on TCP."""
    line = b"AT+JVFILE=1,%s,%d" % (name, len(content))
    send_line(kind, p, line)
    wait_log(p, "file_name=" + name.decode())
    text = encoded(content)[:len(content) if cut else None]
    step = 997 if kind == "tcp" else 1000
    for i in range(0, len(text), step):
        end = b"\n" if kind != "tcp" else b"\r\n" if i % 3 else b""
        p.send(text[i:i + step] + end)
    return line


def test_transfer_verified_by_md5(phone):
    kind, p = phone
    framed = framed_tcp if kind == "tcp" else framed_tty
    content = random.Random(7).randbytes(20000)
    line = send_transfer(kind, p, b"DATA.BIN", content)
    expected = framed(line, b"", b"OK")
    assert read_at_least(kind, p, len(expected)) == expected
    assert (p.root / "data/data.bin").read_bytes() == content
    digest = hashlib.md5(content).hexdigest().encode()
    check = b"AT+JVFILE=2,DATA.BIN," + digest.upper()
    assert p.command(check) == framed(check, b'"' + digest + b'"', b"OK")


def test_cut_transfer_keeps_the_older_file(phone):
    kind, p = phone
    (p.root / "data/keep.bin").write_bytes(b"older")
    send_transfer(kind, p, b"KEEP.BIN", random.Random(8).randbytes(4000), cut=True)
    if kind == "tcp":
        p.sock.close()
        p.sock = None
    else:
        p.bridge.hang_up()
    wait_log(p, "write file error")
    assert not (p.root / "data/.atcid-file-transfer.partial").exists()
    assert (p.root / "data/keep.bin").read_bytes() == b"older"


def test_root_integrity_check_runs_the_stand_in(tcp_phone):
    p = tcp_phone
    result = p.root / "data/rooIntegityCheck.txt"
    (p.root / ".emu/richk").write_bytes(b"rooted\n")
    assert p.command(b"AT+JVKJ=1") == framed_tcp(b"AT+JVKJ=1", b"", b"OK")
    deadline = time.monotonic() + 60
    while not (result.exists() and result.read_bytes() == b"rooted\n") and time.monotonic() < deadline:
        time.sleep(0.02)
    assert result.read_bytes() == b"rooted\n"
