"""Closing the debug access, power requests and file transfer through the real daemon, as a
station sees them on the USB port, the UART and TCP."""
import hashlib
import os
import random
import time
import zipfile

import pytest

import emulator
from conftest import BLOCK, TtyPhone, framed_tcp, framed_tty


def framed(kind, line, body, word):
    return (framed_tcp if kind == "tcp" else framed_tty)(line, body, word)


@pytest.fixture(params=["tcp", "usb"])
def phone(request):
    """(kind, phone) for each transport."""
    return request.param, request.getfixturevalue(request.param + "_phone")


def read_exactly(kind, p, size, timeout=60.0):
    """At least `size` bytes, or what arrived before the deadline."""
    data = b""
    deadline = time.monotonic() + timeout
    while len(data) < size and time.monotonic() < deadline:
        chunk = p.receive(size - len(data), timeout=deadline - time.monotonic()) if kind == "tcp" \
            else p.receive(timeout=deadline - time.monotonic())
        if not chunk and p.proc.poll() is not None:
            break
        data += chunk
    return data


def read_to_end(kind, p, timeout=60.0):
    """Every byte the station receives until the daemon has ended."""
    p.wait(timeout=timeout)
    data = b""
    while True:
        chunk = p.receive(timeout=0.5) if kind == "tcp" else p.receive(quiet=0.1, timeout=0.5)
        if not chunk:
            return data
        data += chunk


def wait_log(p, text):
    assert emulator.wait_for_log(p.log_path, text, p.proc, timeout=60.0), p.log()[-2000:]


def test_close_adb_answers_early_then_frames(phone):
    kind, p = phone
    p.set_property("persist.sys.usb.config", "mtp,adb")
    line = b"AT+JVADB=0,1"
    p.send(line + (b"" if kind == "tcp" else b"\n"))
    expected = line + b"\r\nOK\r\n" + framed(kind, line, b"", b"OK")
    assert read_exactly(kind, p, len(expected)) == expected
    assert (p.root / "dev/__properties__/persist.sys.usb.config").read_text() == "charging"
    assert "am broadcast -a kro.intent.action.AT_SHUT_DOWN" in p.shell_log()


def test_close_adb_on_the_uart_frames_only(device_root):
    emulator.prepare_mode(device_root, "uart")
    p = TtyPhone(device_root, "uart")
    p.start()
    try:
        line = b"AT+JVADB=0,0"
        expected = framed_tty(line, b"", b"OK")
        p.send(line + b"\n")
        assert read_exactly("usb", p, len(expected)) == expected
        assert p.receive(timeout=0.5) == b""
    finally:
        p.stop()


@pytest.mark.parametrize("line, early, power", [
    (b"AT+JVGJ=0", b"AT+JVGJ=0\r\nOK\r\n", "power-off\n"),
    (b"at+jvgj=0 ", b"AT+JVGJ=0\r\nOK\r\n", "power-off\n"),
    (b"AT+JVREBOOT=1", b"AT+JVREBOOT=1\r\nOK\r\n", "restart\n"),
    (b"AT+JVADB=0,2", b"AT+JVADB=0,2\r\nOK\r\n", "restart\n"),
])
def test_power_requests_leave_only_the_early_answer(phone, line, early, power):
    kind, p = phone
    p.send(line + (b"" if kind == "tcp" else b"\n"))
    assert read_to_end(kind, p) == early
    assert p.proc.returncode == 0
    assert (p.root / ".emu/power.log").read_text() == power


def test_master_clear_answers_before_recovery(tcp_phone):
    p = tcp_phone
    (p.root / "cache/recovery").mkdir(parents=True, exist_ok=True)
    p.send(b"AT+JVRT=1")
    early = b"AT+JVRT=1\r\nOK\r\n"
    assert read_exactly("tcp", p, len(early)) == early
    wait_log(p, "reboot recovery")
    assert (p.root / "cache/recovery/command").read_bytes() == b"--wipe_data\0"
    record = (p.root / "persist/ulda_nvram").read_bytes()
    assert record[4:12] == (1).to_bytes(4, "little") + (13).to_bytes(4, "little")
    assert '/system/bin/sh -c "reboot recovery"' in p.shell_log()


def put_apps_package(root, version="version=QM0305_V1.0.12_20261101\n"):
    with zipfile.ZipFile(root / "storage/sdcard0/apps.zip", "w") as zf:
        zf.writestr("apps.version", version)


def test_apps_update_goes_through_recovery(tcp_phone):
    p = tcp_phone
    put_apps_package(p.root)
    p.set_property("persist.sys.is_kro_log", "1")
    p.send(b"AT+JVUPDATE=1")
    early = b"AT+JVUPDATE=1\r\n\r\nOK\r\n"
    assert read_exactly("tcp", p, len(early)) == early
    wait_log(p, "reboot recovery")
    assert (p.root / "cache/recovery/command").read_bytes() == b"--update_app"
    record = (p.root / "persist/ulda_nvram").read_bytes()
    assert record[4:12] == (0).to_bytes(4, "little") + (256).to_bytes(4, "little")
    assert (p.root / "dev/__properties__/persist.sys.is_kro_log").read_text() == "0"
    card = p.root / "storage/sdcard0"
    assert (card / "apps.zip").exists() and not (card / "DCIM").exists()


@pytest.mark.parametrize("version, body, word, broadcast", [
    ("version=QM0305_V1.0.12_20261101\n", b"", b"OK",
     "am broadcast -n com.ulda.engineermode/.UpdateSWReceiver -a android.flashOP.UpdateSW"
     " -e mode update_with_app -e optr CMCC"),
    ("version=QM0305_V1.0.13_20261101\n",
     b"\r\nAPP version is not consistent with the software version!\r\n", b"ERROR", None),
])
def test_operator_and_apps_update(tcp_phone, version, body, word, broadcast):
    p = tcp_phone
    record = bytearray((p.root / "persist/ulda_nvram").read_bytes())
    record[244:260] = b"CMCC".ljust(16, b"\0")
    (p.root / "persist/ulda_nvram").write_bytes(bytes(record))
    (p.root / "storage/sdcard0/oem_CMCC.zip").write_bytes(b"zip")
    put_apps_package(p.root, version)
    assert p.command(b"AT+JVUPDATE=2") == framed_tcp(b"AT+JVUPDATE=2", body, word)
    assert (broadcast in p.shell_log()) if broadcast else not p.shell_log()


def encoded(content):
    return bytes(b for byte in content for b in (0x30 + (byte >> 4), 0x30 + (byte & 15)))


def send_transfer(kind, p, name, content, cut=False):
    """Announces the file, then sends its characters as a station does on that transport:
    lines of an even length on a tty, pieces split anywhere on TCP."""
    line = b"AT+JVFILE=1,%s,%d" % (name, len(content))
    p.send(line + (b"" if kind == "tcp" else b"\n"))
    wait_log(p, "file_name=" + name.decode())  # the command arrives alone
    text = encoded(content)
    if cut:
        text = text[:len(text) // 2]
    if kind == "tcp":
        for i in range(0, len(text), 997):
            p.send(text[i:i + 997] + (b"\r\n" if i % 3 == 0 else b""))
    else:
        for i in range(0, len(text), 1000):
            p.send(text[i:i + 1000] + b"\n")
    return line


def test_transfer_verified_by_md5(phone):
    kind, p = phone
    content = random.Random(7).randbytes(20000)
    line = send_transfer(kind, p, b"DATA.BIN", content)
    expected = framed(kind, line, b"", b"OK")
    assert read_exactly(kind, p, len(expected)) == expected
    assert (p.root / "data/data.bin").read_bytes() == content
    digest = hashlib.md5(content).hexdigest().encode()
    check = b"AT+JVFILE=2,DATA.BIN," + digest.upper()
    assert p.command(check) == framed(kind, check, b'"' + digest + b'"', b"OK")
    assert 'chmod 777 /data/data.bin' in p.shell_log()[-1]


def test_cut_transfer_keeps_the_older_file(phone):
    kind, p = phone
    (p.root / "data/keep.bin").write_bytes(b"older")
    send_transfer(kind, p, b"KEEP.BIN", os.urandom(4000), cut=True)
    if kind == "tcp":
        p.sock.close()
        p.sock = None
    else:
        p.bridge.hang_up()
    wait_log(p, "write file error")
    assert (p.root / "data/keep.bin").read_bytes() == b"older"
    assert sorted(f.name for f in (p.root / "data").iterdir()) == ["keep.bin"]


def wait_for_file(path, content, timeout=60.0):
    deadline = time.monotonic() + timeout
    while time.monotonic() < deadline:
        if path.exists() and path.read_bytes() == content:
            return True
        time.sleep(0.02)
    return False


def test_root_integrity_check_runs_the_stand_in(tcp_phone):
    p = tcp_phone
    result = p.root / "data/rooIntegityCheck.txt"
    assert p.command(b"AT+JVKJ=1") == framed_tcp(b"AT+JVKJ=1", b"", b"OK")
    assert wait_for_file(result, b"pass\n")
    (p.root / ".emu/richk").write_bytes(b"rooted\n")
    # A check still running (its chmod) makes the command start none: ask until one runs.
    for _ in range(20):
        assert p.command(b"AT+JVKJ=1") == framed_tcp(b"AT+JVKJ=1", b"", b"OK")
        if wait_for_file(result, b"rooted\n", timeout=3.0):
            break
    assert result.read_bytes() == b"rooted\n"
