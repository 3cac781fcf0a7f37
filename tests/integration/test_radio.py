"""Radio test commands through the real daemon on a launcher-made root, and the stand-in tools
they run, answers compared byte for byte."""
import shutil
import subprocess
import threading
import time
from pathlib import Path

import pytest

import emulator
from conftest import BINARY, QEMU_USER, TcpPhone, framed_tty

UNSHARE = shutil.which("unshare")


def in_phone(root, command):
    """Runs a shell command chrooted into the root in a user namespace, as the daemon does."""
    return subprocess.run([UNSHARE, "--user", "--map-root-user", "--root", str(root),
                           "/system/bin/sh", "-c", command],
                          env={"PATH": "/system/bin", "HOME": "/data"}, capture_output=True,
                          timeout=60)


@pytest.fixture
def root(device_root):
    return device_root


@pytest.fixture
def phone(usb_phone):
    return usb_phone


def ok(line, body=b""):
    return framed_tty(line, body, b"OK")


def error(line):
    return framed_tty(line, b"", b"ERROR")


# Started first and checked last: the long waits of AT+JVDW and AT+JVCONNWIFI run on their
# own phones beside the other tests.
class SlowCommand:
    def __init__(self, root, line, setup=None):
        emulator.prepare_mode(root, "tcp")
        if setup:
            setup(Path(root))
        self.phone = TcpPhone(root)
        self.phone.start()
        self.line = line
        self.answer = None
        self.elapsed = None
        self.thread = threading.Thread(target=self._run, daemon=True)
        self.thread.start()

    def _run(self):
        start = time.monotonic()
        self.phone.send(self.line)
        self.answer = self.phone.receive(size=3 * 2048, quiet=5, timeout=150)
        self.elapsed = time.monotonic() - start


@pytest.fixture(scope="module")
def slow_commands(tmp_path_factory):
    if not BINARY.exists():
        pytest.fail(f"atcid binary missing at {BINARY}")
    track = emulator.make_root(tmp_path_factory.mktemp("dw") / "root")
    wifi = emulator.make_root(tmp_path_factory.mktemp("connwifi") / "root")
    commands = {
        "dw": SlowCommand(track, b"AT+JVDW=1", lambda r: (r / "data/lcn").write_bytes(b"")),
        "wifi": SlowCommand(wifi, b'AT+JVCONNWIFI="LabNet",pw;1'),
    }
    yield commands
    for c in commands.values():
        c.phone.stop()


def test_slow_commands_started(slow_commands):
    assert all(c.thread.is_alive() or c.answer is not None for c in slow_commands.values())


# The stand-in tools, run directly in a root.

def test_module_standins(root):
    modules = root / "proc/modules"
    assert modules.read_bytes() == b""
    assert in_phone(root, "insmod /system/lib/modules/wlan.ko con_mode=5").returncode == 0
    assert in_phone(root, "insmod /system/lib/modules/wlan.ko").returncode == 1
    assert in_phone(root, "insmod cfg80211.ko").returncode == 0
    assert modules.read_text() == ("wlan 0 0 - Live 0x0000000000000000\n"
                                   "cfg80211 0 0 - Live 0x0000000000000000\n")
    assert in_phone(root, "rmmod wlan").returncode == 0
    assert in_phone(root, "rmmod wlan").returncode == 1
    assert modules.read_text() == "cfg80211 0 0 - Live 0x0000000000000000\n"
    (root / ".emu/fail").mkdir()
    (root / ".emu/fail/rmmod").write_bytes(b"")
    r = in_phone(root, "rmmod cfg80211")
    assert (r.returncode, r.stdout) == (1, b"")
    assert modules.read_text() == "cfg80211 0 0 - Live 0x0000000000000000\n"
    assert (root / ".emu/insmod.log").read_text() == (
        "insmod /system/lib/modules/wlan.ko con_mode=5\n"
        "insmod /system/lib/modules/wlan.ko\ninsmod cfg80211.ko\n")
    assert (root / ".emu/rmmod.log").read_text() == "rmmod wlan\nrmmod wlan\nrmmod cfg80211\n"


def test_bluetooth_standins(root):
    nv = root / "persist/.bt_nv.bin"
    assert in_phone(root, "bdt dut").returncode == 1
    assert not (root / "dev/__properties__/bluetooth.bdt.pemudut").exists()
    # In place, the second header byte kept.
    nv.write_bytes(bytes.fromhex("017706ffffffffffff" "020003aabbcc"))
    assert in_phone(root, "btnvtool -b 00.0a.10.80.FF.fe").returncode == 0
    assert nv.read_bytes() == bytes.fromhex("017706000a1080fffe" "020003aabbcc")
    # Any other first record: the item goes in front.
    nv.write_bytes(bytes.fromhex("020003aabbcc"))
    assert in_phone(root, "btnvtool -b 01.02.03.04.05.06").returncode == 0
    assert nv.read_bytes() == bytes.fromhex("010006010203040506" "020003aabbcc")
    for bad in ("-b 01.02.03.04.05", "-b 01.02.03.04.05.0g", "-x 01.02.03.04.05.06", "-b"):
        assert in_phone(root, "btnvtool " + bad).returncode == 1, bad
    assert nv.read_bytes() == bytes.fromhex("010006010203040506" "020003aabbcc")
    assert in_phone(root, "ptt_socket_app").returncode == 0
    assert (root / ".emu/ptt_socket_app.log").read_text() == "ptt_socket_app\n"


# The commands through the daemon.

def test_wlan_rf_sequence(phone):
    root = phone.root
    assert phone.command(b"AT+JVWLAN=1") == ok(b"AT+JVWLAN=1")
    assert (root / "proc/modules").read_text() == ("cfg80211 0 0 - Live 0x0000000000000000\n"
                                                   "wlan 0 0 - Live 0x0000000000000000\n")
    assert (root / "sys/module/wcnsscore/parameters/wlan_eng_mode").read_text() == "5\n"
    assert phone.command(b"AT+JVWLAN=2,2412.00,11.00,15.5") == ok(b"AT+JVWLAN=2,2412.00,11.00,15.5")
    assert phone.command(b"AT+JVWLAN=2,2412.00,1.00,OFF") == ok(b"AT+JVWLAN=2,2412.00,1.00,OFF")
    assert phone.command(b"AT+JVWLAN=3,5210.00,200.00,15,2") == ok(b"AT+JVWLAN=3,5210.00,200.00,15,2")
    assert phone.command(b"AT+JVWLAN=7") == ok(b"AT+JVWLAN=7")
    assert phone.command(b"AT+JVWLAN=4,2437.00,6.00") == ok(b"AT+JVWLAN=4,2437.00,6.00")
    (root / ".emu/wlan/rxpktcnt").write_text("321")
    assert phone.command(b"AT+JVWLAN=6") == ok(b"AT+JVWLAN=6", b'"321"')
    assert phone.command(b"AT+JVWLAN=6") == ok(b"AT+JVWLAN=6", b'"0"')
    assert phone.command(b"AT+JVWLAN=8") == ok(b"AT+JVWLAN=8")
    assert phone.command(b"AT+JVWLAN=SP,B,20") == ok(b"AT+JVWLAN=SP,B,20")
    assert phone.command(b"AT+JVWLAN=GP,B") == ok(b"AT+JVWLAN=GP,B", b'\r\n"20.000000"\r\n')
    assert phone.command(b"AT+JVWLAN=SC,7") == ok(b"AT+JVWLAN=SC,7")
    assert phone.command(b"AT+JVWLAN=GC") == ok(b"AT+JVWLAN=GC", b'\r\n"7"\r\n')
    assert phone.command(b"AT+JVWLAN=2,2412,11.00,15") == error(b"AT+JVWLAN=2,2412,11.00,15")
    assert phone.command(b"AT+JVWLAN=9") == ok(b"AT+JVWLAN=9")
    assert (root / "proc/modules").read_text() == ""
    assert (root / "sys/module/wcnsscore/parameters/wlan_eng_mode").read_text() == "0\n"
    assert not (root / "data/wlanTxPower").exists() and not (root / "data/wlanRxPER").exists()
    log = (root / ".emu/iwpriv.log").read_text().splitlines()
    assert "iwpriv wlan0 set_txpower 1550" in log
    assert "iwpriv wlan0 set_txpower 1500" in log  # power off: the driver's own value
    assert "iwpriv wlan0 set_channel 42" in log
    assert not any("set_cb" in line for line in log)
    # The GP read ran after SP stored 2000; the driver loaded again by =1 is gone after =9.
    assert phone.command(b"AT+JVWLAN=GC") == error(b"AT+JVWLAN=GC")


def test_bluetooth_address_and_dut(phone):
    root = phone.root
    assert phone.command(b"AT+EMBT=5") == error(b"AT+EMBT=5")  # no NV file in the template
    assert phone.command(b"AT+EMBT=0,BT,0123456789AB") == ok(b"AT+EMBT=0,BT,0123456789AB")
    assert phone.command(b"AT+EMBT=5") == ok(b"AT+EMBT=5", b'+EMBT: "0123456789AB"')
    assert phone.command(b"AT+EMBT=0,BT,A1B2C3D4E5F6") == ok(b"AT+EMBT=0,BT,A1B2C3D4E5F6")
    assert phone.command(b"AT+EMBT=5") == ok(b"AT+EMBT=5", b'+EMBT: "A1B2C3D4E5F6"')
    assert len((root / "persist/.bt_nv.bin").read_bytes()) == 9
    assert phone.command(b"AT+EMBT=4") == error(b"AT+EMBT=4")
    assert phone.command(b"AT+EMBT=1") == ok(b"AT+EMBT=1")
    assert phone.command(b"AT+EMBT=4") == ok(b"AT+EMBT=4")
    assert phone.command(b"AT+EMBT=2") == ok(b"AT+EMBT=2")
    assert phone.command(b"AT+EMBT=4") == error(b"AT+EMBT=4")
    assert phone.command(b"AT+EMBT=1,39") == ok(b"AT+EMBT=1,39")
    (root / ".emu/fail").mkdir()
    (root / ".emu/fail/bdt").write_bytes(b"")
    assert phone.command(b"AT+EMBT=2") == ok(b"AT+EMBT=2")  # its exit status is not checked
    assert phone.command(b"AT+EMBT=4") == ok(b"AT+EMBT=4")  # the failed tool changed nothing
    assert (root / ".emu/bdt.log").read_text() == (
        "bdt entrydut\nbdt exitdut\nbdt txcontinuous 39\nbdt exitdut\n")


def test_gps_stream_started_and_stopped(phone):
    root = phone.root
    (root / ".emu/modem/gps").mkdir(parents=True)
    (root / ".emu/modem/gps/2").write_bytes(b"$GPGSV,1,1\r\n")
    assert phone.command(b"AT+JVGPS=2") == error(b"AT+JVGPS=2")
    assert phone.command(b"AT+JVGPS=1") == ok(b"AT+JVGPS=1")
    phone.send(b"AT+JVGPS=2\n")
    received = b""
    deadline = time.monotonic() + 30
    while received.count(b"$GPGSV,1,1\r\n") < 3 and time.monotonic() < deadline:
        received += phone.receive(timeout=1)
    assert ok(b"AT+JVGPS=2") in received
    assert received.replace(ok(b"AT+JVGPS=2"), b"").replace(b"$GPGSV,1,1\r\n", b"") == b""
    phone.send(b"AT+JVGPS=0\n")
    closing = b""
    while ok(b"AT+JVGPS=0") not in closing and time.monotonic() < deadline:
        closing += phone.receive(timeout=1)
    assert closing.endswith(ok(b"AT+JVGPS=0"))
    assert closing.replace(ok(b"AT+JVGPS=0"), b"").replace(b"$GPGSV,1,1\r\n", b"") == b""
    requests = (root / ".emu/modem/requests.log").read_text().splitlines()
    assert requests[0] == "3 1" and requests[-1] == "3 0"
    assert set(requests[1:-1]) == {"3 2"}
    # Stopped: nothing more is streamed.
    assert phone.receive(timeout=1) == b""
    assert (root / ".emu/modem/requests.log").read_text().splitlines() == requests


def test_fm(phone):
    root = phone.root
    device = root / "sys/devices/virtual/misc/msm_snd/device"
    assert phone.command(b"AT+JVFM=2") == error(b"AT+JVFM=2")
    assert phone.command(b"AT+JVFM=1") == ok(b"AT+JVFM=1")
    assert device.read_text() == "26 0 1\n"
    (root / ".emu/fm").mkdir()
    (root / ".emu/fm/signal").write_text("37\n")
    assert phone.command(b"AT+JVFM=2") == ok(b"AT+JVFM=2", b'\r\n"37"\r\n')
    (root / ".emu/fm/signal").unlink()
    assert phone.command(b"AT+JVFM=2") == ok(b"AT+JVFM=2", b'\r\n"0"\r\n')
    assert phone.command(b"AT+JVFM=3") == ok(b"AT+JVFM=3")
    (root / "sys/kernel/debug/mbhc_status").write_text("2")
    assert phone.command(b"AT+JVFM=3") == error(b"AT+JVFM=3")
    assert phone.command(b"AT+JVFM=0") == ok(b"AT+JVFM=0")
    assert device.read_text() == "6 1 1\n"
    (root / "dev/radio0").unlink()
    assert phone.command(b"AT+JVFM=1") == ok(b"AT+JVFM=1")
    assert phone.command(b"AT+JVFM=2") == error(b"AT+JVFM=2")


def test_dpdt_and_vsim_against_the_modem(phone):
    root = phone.root
    modem = root / ".emu/modem"
    modem.mkdir(parents=True)
    (modem / "set_status").write_text("6")
    assert phone.command(b"AT+JVDPDT=4") == ok(b"AT+JVDPDT=4", b'\r\n"2,1"\r\n')
    assert phone.command(b"AT+JVDPDT=8") == ok(b"AT+JVDPDT=8", b"\r\n6\r\n")
    assert phone.command(b"AT+JVDPDT=3") == error(b"AT+JVDPDT=3")
    (modem / "set_status").write_text("0")
    assert phone.command(b"AT+JVDPDT=3") == ok(b"AT+JVDPDT=3")
    assert (root / "dev/__properties__/persist.sys.dpdt").read_text() == "cross"
    assert phone.command(b"AT+JVVSIM=5") == ok(b"AT+JVVSIM=5", b"\r\n0\r\n")
    (modem / "transport_error").write_text("1")
    assert phone.command(b"AT+JVVSIM=3") == error(b"AT+JVVSIM=3")
    assert phone.command(b"AT+JVDPDT=4") == error(b"AT+JVDPDT=4")
    assert (modem / "requests.log").read_text().splitlines() == [
        "14 118", "14 118", "14 113", "14 113", "14 15", "14 13", "14 118"]


def test_slow_commands_answers(slow_commands):
    for c in slow_commands.values():
        c.thread.join(timeout=200)
        assert not c.thread.is_alive()
    dw = slow_commands["dw"]
    assert dw.answer == b"".join(
        b.ljust(2048, b"\0") for b in (b"AT+JVDW=1\r\n\n", b"\n", b"OK\r\n\n"))
    assert dw.elapsed >= 80
    if not QEMU_USER:  # am.log is the am stand-in's, run by the isolated shell (see conftest)
        assert (dw.phone.root / ".emu/am.log").read_text().splitlines() == [
            "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 3",
            "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 4",
            "am broadcast -n com.ulda.engineermode/.ConnWifiReceiver"
            " -a kro.intent.action.DISCONNWIFI",
        ]
    wifi = slow_commands["wifi"]
    assert wifi.answer == b""  # the phone restarts without answering
    assert wifi.elapsed >= 50
    assert wifi.phone.wait(timeout=30) == 0
    assert (wifi.phone.root / ".emu/power.log").read_text() == "restart\n"
    if not QEMU_USER:  # as above
        assert (wifi.phone.root / ".emu/am.log").read_text().splitlines() == [
            "am broadcast -n com.ulda.engineermode/.ConnWifiReceiver -a kro.intent.action.CONNWIFI"
            " -e ssid LABNET -e pwd PW;1",  # the reader upper-cases the line
            "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 3",
            "am broadcast -a kro.intent.action.KEEP_CREEN_ON -e status 4",
        ]
