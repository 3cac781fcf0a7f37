"""The emulated phone as command families and station developers use it: stand-in tools win
over busybox's applets, background jobs outlive their call, the reboot stand-in ends the
daemon, and the launcher serves one station after another. The emergency call runs `am`
through the shell, so tests make `am` the script they need."""

import os
import select
import signal
import socket
import subprocess
import sys
import time

import pytest

import emulator
from conftest import BINARY, SOURCE, free_port

EMERGENCY = b"ATD112;"


def install_script(root, name, body):
    path = root / "system/bin" / name
    if path.is_symlink():
        path.unlink()
    path.write_text("#!/system/bin/sh\n" + body)
    path.chmod(0o755)


def read_pipe(fd, wanted=None, timeout=10.0):
    """Reads a non-blocking pipe until `wanted` arrived, or with no `wanted` until its end;
    returns what was read, and None in place of an end that never came."""
    data = b""
    deadline = time.monotonic() + timeout
    while time.monotonic() < deadline:
        select.select([fd], [], [], 0.1)
        try:
            chunk = os.read(fd, 4096)
        except BlockingIOError:
            continue
        if not chunk and wanted is None:
            return data
        data += chunk
        if wanted is not None and wanted in data:
            return data
    return data if wanted is not None else None


def test_stand_in_named_like_an_applet_runs(tcp_phone):
    root = tcp_phone.root
    listed = subprocess.run([str(root / "system/bin/busybox"), "--list"], capture_output=True,
                            text=True).stdout.split()
    assert "date" in listed and "reboot" in listed
    install_script(root, "date", "echo stand-in date\n")
    # Directly, and through a busybox applet that runs another program.
    install_script(root, "am", "date > /data/direct; env date > /data/via_env\n")
    assert tcp_phone.command(EMERGENCY) == EMERGENCY + b"\r\nOK\r\n"
    assert (root / "data/direct").read_text() == "stand-in date\n"
    assert (root / "data/via_env").read_text() == "stand-in date\n"


def test_background_job_outlives_its_call_and_ends_with_the_daemon(tcp_phone):
    root = tcp_phone.root
    os.mkfifo(root / "data/job")
    job = os.open(root / "data/job", os.O_RDONLY | os.O_NONBLOCK)
    try:
        install_script(root, "am", (
            "( exec 3> /data/job; echo started >&3\n"
            "  while [ ! -e /data/go ]; do sleep 0.05; done\n"
            "  echo outlived >&3; while :; do sleep 1; done ) &\n"))
        assert tcp_phone.command(EMERGENCY) == EMERGENCY + b"\r\nOK\r\n"
        # The call has returned; the job goes on only when told to.
        (root / "data/go").touch()
        assert read_pipe(job, b"outlived\n") == b"started\noutlived\n"
        tcp_phone.stop()
        # Its end of the pipe closes when the job is gone.
        assert read_pipe(job) == b""
    finally:
        os.close(job)


@pytest.mark.parametrize("command, request_line", [
    ("reboot recovery", "restart recovery\n"),
    ("reboot -p", "power-off\n"),
])
def test_shell_reboot_ends_the_daemon(tcp_phone, command, request_line):
    root = tcp_phone.root
    install_script(root, "am", command + "\n")
    tcp_phone.send(EMERGENCY)
    assert tcp_phone.wait() == 0
    # Nothing was written after the reboot: the connection just closes.
    assert tcp_phone.receive(timeout=5) == b""
    assert (root / ".emu/power.log").read_text() == request_line


def connect(port, timeout=20.0):
    deadline = time.monotonic() + timeout
    while True:
        try:
            return socket.create_connection(("127.0.0.1", port), timeout=10)
        except OSError:
            if time.monotonic() > deadline:
                raise
            time.sleep(0.05)


def test_launcher_serves_one_station_after_another(device_root):
    install_script(device_root, "am", "reboot\n")
    port = free_port()
    launcher = subprocess.Popen(
        [sys.executable, str(SOURCE / "emulator/atcid-emu"), "--root", str(device_root), "--keep",
         "--port", str(port), "--bin", str(BINARY)], stdout=subprocess.DEVNULL)
    try:
        for _ in range(2):
            with connect(port) as station:
                station.sendall(b"ATI")
                assert station.recv(100) == b"ATI\r\nERROR\r\n"
        # A power request ends the phone: the launcher does not start the daemon again.
        with connect(port) as station:
            station.sendall(EMERGENCY)
            assert station.recv(100) == b""
        assert launcher.wait(timeout=20) == 0
        assert (device_root / ".emu/power.log").read_text() == "restart\n"
        assert (device_root / ".emu/atcid.log").read_text().count(
            "The station closed the connection") == 2
    finally:
        if launcher.poll() is None:
            launcher.send_signal(signal.SIGTERM)
            launcher.wait(timeout=20)
