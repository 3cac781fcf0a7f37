"""Line scale: a fleet of emulated phones, a multi-up run over it, the pytest plugin's phone,
and a stock AT client (chat) on the emulated USB port."""

import os
import re
import shutil
import signal
import socket
import subprocess
import sys
import threading
import xml.etree.ElementTree as ElementTree

import pytest

import fleet
from conftest import BINARY, PATIENCE, SOURCE, free_port

sys.path.insert(0, str(SOURCE / "station"))
from atcid_station import Unreachable, connect  # noqa: E402

LAUNCHER = [sys.executable, str(SOURCE / "emulator/atcid-emu"), "--bin", str(BINARY)]


def free_ports(count):
    """A base port whose `count` ports from it on are all free now."""
    while True:
        base = free_port()
        try:
            for port in range(base, base + count):
                with socket.socket() as s:
                    s.bind(("127.0.0.1", port))
            return base
        except OSError:
            continue


def stop(launcher):
    """Ctrl-C, so the launcher stops its daemons even when a test failed; a kill would leave
    them serving."""
    if launcher.poll() is None:
        launcher.send_signal(signal.SIGINT)
        try:
            launcher.wait(timeout=PATIENCE)
        except subprocess.TimeoutExpired:
            launcher.kill()
            launcher.wait()


class Output:
    """The lines a launcher prints, read as they come."""

    def __init__(self, stream):
        self.lines, self.cond = [], threading.Condition()
        threading.Thread(target=self._read, args=(stream,), daemon=True).start()

    def _read(self, stream):
        for line in stream:
            with self.cond:
                self.lines.append(line.rstrip("\n"))
                self.cond.notify_all()

    def wait_for(self, pattern):
        """The first line that matches `pattern`, once it came."""
        def found():
            return next((line for line in self.lines if re.search(pattern, line)), None)

        with self.cond:
            line = self.cond.wait_for(found, PATIENCE)
            assert line is not None, self.lines
            return line


def test_fleet_identities_power_off_and_ctrl_c(tmp_path):
    port = free_ports(3)
    launcher = subprocess.Popen(LAUNCHER + ["--count", "3", "--root", str(tmp_path),
                                            "--port", str(port)],
                                stdout=subprocess.PIPE, text=True)
    out = Output(launcher.stdout)
    try:
        out.wait_for("all 3 phones serving")
        for index in (1, 2, 3):
            ident = fleet.identity(index)
            target = out.wait_for(f"phone-{index} ").split()[2]
            assert target == f"tcp://127.0.0.1:{port + index - 1}"
            with connect(target) as phone:
                assert phone.command("AT+JVCPUID=1").value == ident.serial[2:] + "\n"
                assert phone.command("AT+EGMR=0,7").lines == [ident.imei]
                assert phone.command("AT+EGMR=0,5").lines == [ident.barcode]
        with connect(f"tcp://127.0.0.1:{port + 1}") as phone:
            phone.command("AT+JVGJ=0")
        out.wait_for(r"phone-2 off \(power-off")
        with pytest.raises(Unreachable, match="connection refused"):
            connect(f"tcp://127.0.0.1:{port + 1}")
        for other in (port, port + 2):
            with connect(f"tcp://127.0.0.1:{other}") as phone:
                assert phone.command("AT+JVMODEL=0").ok
        launcher.send_signal(signal.SIGINT)
        assert launcher.wait(timeout=PATIENCE) == 0
        out.wait_for("every phone stopped")
        for other in (port, port + 2):  # no daemon is left listening
            with pytest.raises(Unreachable):
                connect(f"tcp://127.0.0.1:{other}", connect_timeout=PATIENCE)
    finally:
        stop(launcher)


@pytest.fixture
def two_phones(tmp_path):
    phones = fleet.Fleet(BINARY, tmp_path / "fleet", 2, port=free_ports(2))
    phones.prepare()
    phones.start()
    assert phones.wait_serving(timeout=PATIENCE)
    yield [phone.target for phone in phones.phones]
    phones.stop()
    phones.wait()


def station(*args):
    return subprocess.run([sys.executable, str(SOURCE / "tools/atcid-station"), *map(str, args)],
                          capture_output=True, text=True, timeout=120)


def test_multi_up_run_reports_each_phone(two_phones, tmp_path):
    script = tmp_path / "checks.seq"
    # Passes on phone-1 only: each phone's outcomes must stay its own.
    script.write_text("AT+JVMODEL=0\nAT+EGMR=0,5 body=PCB0001 continue\nAT+JVRAM=0\n")
    absent = f"tcp://127.0.0.1:{free_port()}"
    report = tmp_path / "report.xml"
    run = station("run", script, *two_phones, absent, "--junit", report)
    assert run.returncode == 2, run.stdout + run.stderr
    suites = {s.get("name"): s for s in ElementTree.parse(report).getroot()}
    assert list(suites) == two_phones + [absent]
    assert [(s.get("tests"), s.get("failures"), s.get("errors")) for s in suites.values()] == [
        ("3", "0", "0"), ("3", "1", "0"), ("4", "0", "1")]
    assert "connection refused" in suites[absent].find("testcase/error").get("message")
    table = run.stdout.splitlines()[-3:]
    assert [line.split()[1:4] + line.split()[-1:] for line in table] == [
        ["3", "0", "0", "passed"], ["2", "1", "0", "failed"], ["0", "0", "3", "unreachable"]]
    targets = tmp_path / "phones.txt"
    targets.write_text("# the line\n" + "\n".join(two_phones) + "\n")
    assert station("run", script, "--targets", targets).returncode == 1
    assert station("run", script, two_phones[0]).returncode == 0
    assert station(two_phones[0], "run", script).returncode == 0


@pytest.mark.parametrize("with_target", [False, True])
def test_pytest_plugin_phone(with_target, request, tmp_path):
    target = ["--atcid-target", request.getfixturevalue("two_phones")[0]] if with_target else []
    env = dict(os.environ, PYTHONPATH=str(SOURCE / "station"))
    run = subprocess.run(
        [sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider", "-p",
         "atcid_station.pytest_plugin", "--basetemp", str(tmp_path / "t"), *target,
         str(SOURCE / "station/examples/test_phone.py")],
        capture_output=True, text=True, env=env, timeout=300)
    summary = "3 passed, 1 skipped" if with_target else "4 passed"
    assert summary in run.stdout.splitlines()[-1], run.stdout + run.stderr


def test_chat_on_the_usb_port(tmp_path):
    chat = shutil.which("chat", path=os.environ.get("PATH", "") + ":/usr/sbin")
    if chat is None:
        pytest.skip("chat (package ppp) is not installed; tools/install-deps installs it")
    # A fleet of two on USB: each phone's port is its own pseudo-terminal.
    launcher = subprocess.Popen(LAUNCHER + ["--mode", "usb", "--count", "2", "--root",
                                            str(tmp_path)], stdout=subprocess.PIPE, text=True)
    out = Output(launcher.stdout)
    try:
        out.wait_for("all 2 phones serving")
        device = out.wait_for("phone-2 ").split()[2]
        for command, status in (("AT+JVMODEL=0", 0), ("AT+JVMODEL=9", 4)):
            with open(device, "r+b", buffering=0) as port:
                ran = subprocess.run([chat, "-t", "20", "ABORT", "ERROR", "", command, "OK"],
                                     stdin=port, stdout=port, timeout=60)
            assert ran.returncode == status, command
    finally:
        stop(launcher)
