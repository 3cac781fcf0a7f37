"""The emulated phone's date and device-key stand-ins, run as the phone's shell runs them:
chrooted into a device root, in a user namespace of their own, under mksh and busybox sh."""

import datetime
import shutil
import subprocess
from pathlib import Path

import pytest

from conftest import emulator

MKSH = next((p for p in ("/bin/mksh-static", "/usr/lib/klibc/bin/mksh") if Path(p).exists()), None)
SHELLS = [["/system/bin/busybox", "sh"], ["/system/bin/mksh"]]


@pytest.fixture(params=SHELLS, ids=["busybox-sh", "mksh"])
def phone_sh(request, tmp_path):
    root = emulator.make_root(tmp_path / "root")
    if not (root / "system/bin/busybox").exists():
        pytest.fail("no static busybox for the device root")
    if request.param[0].endswith("mksh"):
        if MKSH is None:
            pytest.skip("no static mksh")
        shutil.copy(MKSH, root / "system/bin/mksh")

    def run(*args):
        # Never outside the root, and without the power to set the machine's clock.
        return subprocess.run(
            ["/usr/bin/unshare", "--user", "--map-root-user", f"--root={root}",
             *request.param, *args],
            env={"PATH": "/system/bin"}, capture_output=True, timeout=60)

    run.root = root
    return run


def clock_reading(out):
    # "Sun Nov 15 08:20:00 UTC 2026", the day padded with a blank
    week, month, day, clock, zone, year = out.decode().split()
    assert zone == "UTC"
    when = datetime.datetime.strptime(f"{year} {month} {day} {clock}", "%Y %b %d %H:%M:%S")
    assert when.strftime("%a") == week
    return when


def test_date_set_and_read_back(phone_sh):
    assert phone_sh("/system/bin/date", "-s", "20261102.082000").returncode == 0
    result = phone_sh("/system/bin/date")
    assert result.returncode == 0
    assert result.stdout.startswith(b"Mon Nov  2 08:")
    elapsed = clock_reading(result.stdout) - datetime.datetime(2026, 11, 2, 8, 20)
    assert datetime.timedelta(0) <= elapsed < datetime.timedelta(minutes=5)
    # a later set replaces the offset, it does not add to it
    assert phone_sh("/system/bin/date", "-s", "20300101.000000").returncode == 0
    elapsed = clock_reading(phone_sh("/system/bin/date").stdout) - datetime.datetime(2030, 1, 1)
    assert datetime.timedelta(0) <= elapsed < datetime.timedelta(minutes=5)
    assert (phone_sh.root / ".emu/date.log").read_text().splitlines() == [
        "date -s 20261102.082000", "date", "date -s 20300101.000000", "date"]


def test_date_refuses_other_values(phone_sh):
    offset = phone_sh.root / ".emu/clock_offset"
    for args in (["-s", "2026111.082000"], ["-s", "20261315.082000"], ["-s", "20260231.082000"],
                 ["-s", "20261115.250000"], ["-s", "20261115.082000", "x"], ["-s"],
                 ["-s", "$(reboot)"], ["+%s"], ["20261115.082000"]):
        assert phone_sh("/system/bin/date", *args).returncode == 1, args
        assert not offset.exists(), args
    before = datetime.datetime.now(datetime.timezone.utc).replace(tzinfo=None)
    machine = clock_reading(phone_sh("/system/bin/date").stdout)
    assert abs(machine - before) < datetime.timedelta(minutes=5)


def test_date_prints_fixed_output(phone_sh):
    (phone_sh.root / ".emu/date_output").write_bytes(b"Thu Jan  1 00:00:00 CST 1970\r\n")
    assert phone_sh("/system/bin/date").stdout == b"Thu Jan  1 00:00:00 CST 1970\r\n"


def test_key_tool(phone_sh):
    key = phone_sh.root / ".emu/pemukp/key"
    assert phone_sh("/data/pemukp", "--keysaved").stdout == b"false\n"
    missing = phone_sh("/data/pemukp", "--getkey")
    assert (missing.returncode, missing.stdout) == (1, b"")
    assert phone_sh("/data/pemukp", "--genkey").returncode == 0
    first = key.read_bytes()
    assert len(first) >= 32
    assert phone_sh("/data/pemukp", "--keysaved").stdout == b"true\n"
    assert phone_sh("/data/pemukp", "--getkey").stdout == first
    key.write_bytes(b"KEY WITH\nLINES")
    assert phone_sh("/data/pemukp", "--getkey").stdout == b"KEY WITH\nLINES"
    phone_sh("/data/pemukp", "--genkey")
    assert key.read_bytes() not in (first, b"KEY WITH\nLINES")

    assert phone_sh("/data/pemukp", "--getuniqueid").returncode == 1
    phone_sh("/data/pemukp", "--genuniqueid")
    unique = (phone_sh.root / ".emu/pemukp/uniqueid").read_bytes()
    assert phone_sh("/data/pemukp", "--getuniqueid").stdout == unique != b""
    assert phone_sh("/data/pemukp", "--other").returncode == 1
    log = (phone_sh.root / ".emu/pemukp.log").read_text().splitlines()
    assert log[:3] == ["pemukp --keysaved", "pemukp --getkey", "pemukp --genkey"]
    assert log[-1] == "pemukp --other" and len(log) == 11
