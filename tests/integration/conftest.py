"""Fixtures that start the real atcid binary on an emulated phone, on TCP or on a
pseudo-terminal, and talk to it as a test station does."""

import os
import socket
import sys
import time
from pathlib import Path

import pytest
import serial

SOURCE = Path(os.environ.get("ATCID_SOURCE", Path(__file__).resolve().parents[2]))
sys.path.insert(0, str(SOURCE / "emulator"))
import emulator  # noqa: E402

BINARY = Path(os.environ.get("ATCID_BIN", SOURCE / "build" / "atcid"))
BLOCK = 2048
RESULT_ENDINGS = (b"OK\r\n", b"ERROR\r\n", b"Not Implement\r\n", b"UNKNOWN\r\n")
# How long a test waits for something that should happen: only a failing test waits this long,
# so it is generous enough for a machine that is busy with other work.
PATIENCE = 30.0


# Under qemu-user (tools/cross-test) the emulated phone's shell cannot start: qemu keeps a
# thread of its own in every process and the kernel refuses unshare(CLONE_NEWUSER) to a
# multithreaded one (EINVAL). Commands are still recorded in shell.log; the tests below need
# them to run, and skip there with that reason. Tests that check a shell effect beside much
# else leave out just that check under qemu-user (`if not QEMU_USER`).
QEMU_USER = os.environ.get("ATCID_QEMU_USER")
QEMU_NO_SHELL = ("qemu-user keeps a thread of its own in every process and the kernel refuses "
                 "unshare(CLONE_NEWUSER) to a multithreaded process (EINVAL): the emulated "
                 "phone's isolated shell cannot start under it")
NEEDS_RUNNING_SHELL = {
    "test_audio.py::test_amplifier_and_i2c_on_the_template_phone",
    "test_audio.py::test_tone_and_media_playback_requests",
    "test_core.py::test_shell_runs_isolated_in_the_root",
    "test_emulator.py::test_stand_in_named_like_an_applet_runs",
    "test_emulator.py::test_background_job_outlives_its_call_and_ends_with_the_daemon",
    "test_emulator.py::test_shell_reboot_ends_the_daemon",
    "test_emulator.py::test_launcher_serves_one_station_after_another",
    "test_identity.py::test_clock_set_then_read",
    "test_identity.py::test_key_generated_then_saved",
    "test_lifecycle.py::test_update_answers_first_then_restarts_into_recovery",
    "test_lifecycle.py::test_root_integrity_check_runs_the_stand_in",
    "test_radio.py::test_wlan_rf_sequence",
    "test_radio.py::test_bluetooth_address_and_dut",
    "test_radio.py::test_fm",
    "test_storage.py::test_shell_backed_checks",
    "test_storage.py::test_storage_calibration_through_vdc",
}


def pytest_collection_modifyitems(config, items):
    if not QEMU_USER:
        return
    for item in items:
        if f"{Path(item.fspath).name}::{item.originalname}" in NEEDS_RUNNING_SHELL:
            item.add_marker(pytest.mark.skip(reason=QEMU_NO_SHELL))


def free_port():
    with socket.socket() as s:
        s.bind(("127.0.0.1", 0))
        return s.getsockname()[1]


class Phone:
    """One emulated phone and its daemon. Subclasses know the transport."""

    ready_text = None

    def __init__(self, root):
        self.root = Path(root)
        self.log_path = self.root / ".emu" / "atcid.log"
        self.proc = None

    def set_property(self, name, value):
        emulator.set_property(self.root, name, value)

    def start(self, port=None):
        with open(self.log_path, "ab") as log:
            self.proc = emulator.start_daemon(BINARY, self.root, port=port, log=log)
        if self.ready_text and not emulator.wait_for_log(self.log_path, self.ready_text, self.proc,
                                                         timeout=PATIENCE):
            raise RuntimeError(f"daemon not ready:\n{self.log()[-3000:]}")

    def log(self):
        return self.log_path.read_text(errors="replace") if self.log_path.exists() else ""

    def wait(self, timeout=PATIENCE):
        return self.proc.wait(timeout=timeout)

    def shell_log(self):
        path = self.root / ".emu" / "shell.log"
        return path.read_text().splitlines() if path.exists() else []

    def stop(self):
        if self.proc and self.proc.poll() is None:
            self.proc.kill()
            self.proc.wait()


class TcpPhone(Phone):
    ready_text = "start accept"

    def start(self, port=None):
        self.port = port or free_port()
        super().start(self.port)
        self.sock = socket.create_connection(("127.0.0.1", self.port), timeout=PATIENCE)

    def send(self, data):
        self.sock.sendall(data)

    def receive(self, size=None, quiet=0.4, timeout=PATIENCE):
        """Bytes until `size` arrived, or without a size until the line went quiet after the
        first byte; a sized read does not stop at a pause, however long the daemon takes."""
        data = b""
        deadline = time.monotonic() + timeout
        while time.monotonic() < deadline and (size is None or len(data) < size):
            left = max(0.01, deadline - time.monotonic())
            self.sock.settimeout(quiet if data and size is None else left)
            try:
                chunk = self.sock.recv(65536)
            except socket.timeout:
                if data and size is None:
                    break
                continue
            if not chunk:
                break
            data += chunk
        return data

    def command(self, line, **kw):
        """Sends one command line (the socket carries no line end) and returns every byte the
        station received for it: three 2048-byte blocks for a table command."""
        self.send(line)
        first = self.receive(size=len(line) + 2, **kw)
        if first.startswith(line + b"\r\n") and first.endswith(RESULT_ENDINGS) and b"\0" not in first:
            return first  # the reader's own one-piece answer to a name not in the table
        return first + self.receive(size=3 * BLOCK - len(first), **kw)

    def stop(self):
        if getattr(self, "sock", None):
            self.sock.close()
        super().stop()


class TtyPhone(Phone):
    ready_text = "Wait for select data from USB"

    def __init__(self, root, mode="usb"):
        super().__init__(root)
        self.mode = mode
        self.bridge = emulator.PtyBridge()
        emulator.link_port(self.root, "ttyGS0" if mode == "usb" else "ttyHSL0",
                           self.bridge.device_path)

    def start(self, port=None):
        super().start(port)
        self.station = serial.Serial(self.bridge.station_path, 115200, timeout=0.3)

    def send(self, data):
        self.station.write(data)
        self.station.flush()

    def receive(self, quiet=0.3, timeout=PATIENCE, until=RESULT_ENDINGS):
        """Bytes until the line went quiet after data that ends like an answer (`until`), or
        until the deadline."""
        data = b""
        deadline = time.monotonic() + timeout
        self.station.timeout = quiet
        while time.monotonic() < deadline:
            chunk = self.station.read(65536)
            if chunk:
                data += chunk
                continue
            if data and data.endswith(until):
                break
        return data

    def command(self, line, end=b"\n", **kw):
        """Sends one command line with its line end and returns the framed answer."""
        self.send(line + end)
        return self.receive(**kw)

    def stop(self):
        if getattr(self, "station", None):
            self.station.close()
        super().stop()
        self.bridge.close()


@pytest.fixture
def device_root(tmp_path):
    if not BINARY.exists():
        pytest.fail(f"atcid binary missing at {BINARY}")
    return emulator.make_root(tmp_path / "root")


@pytest.fixture
def tcp_phone(device_root):
    emulator.prepare_mode(device_root, "tcp")
    phone = TcpPhone(device_root)
    phone.start()
    yield phone
    phone.stop()


@pytest.fixture
def usb_phone(device_root):
    emulator.prepare_mode(device_root, "usb")
    phone = TtyPhone(device_root, "usb")
    phone.start()
    yield phone
    phone.stop()


def framed_tty(echo, body, word):
    """The answer of a table command on a tty: echo CR LF LF body LF CR LF word CR LF."""
    return echo + b"\r\n\n" + body + b"\n\r\n" + word + b"\r\n"


def framed_tcp(echo, body, word):
    """The answer of a table command on the socket: three NUL-padded 2048-byte blocks."""
    blocks = (echo + b"\r\n\n", body + b"\n", word + b"\r\n\n")
    return b"".join(b.ljust(BLOCK, b"\0") for b in blocks)
