"""The emulated phone's controls as scripts and the live view use them: each one changes what
the daemon answers next (so its file and format are the daemon's), a bad value writes nothing,
and a link in the root is never followed out of it."""

import os
import subprocess
import sys

import pytest

import controls
from conftest import SOURCE, framed_tcp

# Applied in order to one phone: (control, value, command, body, result word).
EFFECTS = [
    ("battery.capacity", "15", b"AT+JVDLJ=1", b'"3.85,15%"\r\n', b"OK"),
    ("battery.voltage", 4200000, b"AT+JVDLJ=1", b'"4.20,15%"\r\n', b"OK"),
    ("battery.status", "full", b"AT+JVCHARGE=0", b"", b"OK"),
    ("usb.cable", "0", b"AT+JVCHARGE=0", b"", b"ERROR"),  # pulled: it discharges
    ("usb.cable", "1", b"AT+JVCHARGE=0", b"", b"OK"),
    ("sim.2", "1", b"AT+JVCARD=1", b'+cards:"","SIM2","TF"', b"OK"),
    ("card", "0", b"AT+JVCARD=1", b'+cards:"","SIM2",""', b"OK"),
    ("card", "1", b"AT+JVTFWR=0", b"", b"OK"),
    ("sim.1", "1", b"AT+JVSIM=1", b"", b"OK"),
    ("sim.1", "0", b"AT+JVSIM=1", b"", b"ERROR"),
    ("sensor.gsensor", "1 -2.4 9.6", b"AT+JVZLJC=0,3", b'"1,-2,10"\r\n', b"OK"),
    ("sensor.proximity", "123", b"AT+JVHWKJ=2", b'"123,0"\r\n', b"OK"),
    ("sensor.proximity.state", "away", b"AT+JVHWKJ=3", b"", b"ERROR"),
    ("sensor.hall", "1", b"AT+JVHALL=1", b"", b"ERROR"),
    ("headset", "0", b"AT+JVFM=3", b"", b"ERROR"),
    ("fm.signal", "35", b"AT+JVFM=1", b"", b"OK"),
    (None, None, b"AT+JVFM=2", b'\r\n"35"\r\n', b"OK"),
    ("modem.nv.6853", "PCB0001", b"AT+EGMR=0,5", b"PCB0001", b"OK"),
    ("modem.transport_error", "1", b"AT+EGMR=0,5", b"", b"ERROR"),
    ("modem.transport_error", "0", b"AT+EGMR=0,5", b"PCB0001", b"OK"),
    ("prop.ro.product.model", "QM0101", b"AT+JVMODEL=0", b'\r\n"QM0101"\r\n', b"OK"),
    ("modem.absent", "1", b"AT+JVHALL=1", b"", b"ERROR"),  # the modem's requests would wait
]


def test_each_control_changes_the_next_answer(tcp_phone):
    wrong = []
    for name, value, command, body, word in EFFECTS:
        if name:
            stored = controls.set_control(tcp_phone.root, name, value)
            if controls.find(name).read(tcp_phone.root) != stored:
                wrong.append((name, value, "reads back", controls.find(name).read(tcp_phone.root)))
        answer = tcp_phone.command(command)
        if answer != framed_tcp(command, body, word):
            wrong.append((name, value, command, answer.replace(b"\0", b"")))
    assert wrong == []


def snapshot(root):
    tree = {}
    for directory, _, files in os.walk(root):
        for name in files:
            path = os.path.join(directory, name)
            tree[path] = b"" if os.path.islink(path) else open(path, "rb").read()
    return tree


@pytest.mark.parametrize("name, value, reason", [
    ("battery.capacity", "101", "out of range 0..100"),
    ("battery.capacity", "1.5", "whole number"),
    ("battery.capacity", True, "whole number"),
    ("battery.temperature", "-401", "out of range"),
    ("battery.status", "charged", "one of Charging"),
    ("usb.cable", "2", "one of 1 \\(yes\\), 0 \\(no\\)"),
    ("sensor.gsensor", "1 2", "3 numbers"),
    ("sensor.gsensor", "1 2 nan", "a number"),
    ("modem.nv.4294967296", "x", "NV item number"),
    ("modem.nv.12", "x" * 257, "at most 256 bytes"),
    ("prop...", "x", "property name"),
    ("prop.a", "two\nlines", "control characters"),
    ("battery", "1", "no control named"),
])
def test_bad_value_writes_nothing(device_root, name, value, reason):
    before = snapshot(device_root)
    with pytest.raises(controls.ControlError, match=reason):
        controls.set_control(device_root, name, value)
    assert snapshot(device_root) == before


def test_a_link_in_the_root_is_not_followed(device_root, tmp_path):
    outside = tmp_path / "outside"
    outside.mkdir()
    (outside / "capacity").write_text("57\n")
    battery = device_root / "sys/class/power_supply/battery"
    os.rename(battery, tmp_path / "battery")
    battery.symlink_to(outside)
    with pytest.raises(controls.ControlError, match="cannot write"):
        controls.set_control(device_root, "battery.capacity", "5")
    assert (outside / "capacity").read_text() == "57\n"
    assert controls.values(device_root)["battery.capacity"] == ""


def test_console(device_root):
    def ctl(*args):
        return subprocess.run([sys.executable, str(SOURCE / "emulator/atcid-emu"), "ctl",
                               "--root", str(device_root), *args], capture_output=True, text=True)
    assert ctl("sensor.gsensor", "0", "-0.5", "9.8").stdout == "sensor.gsensor = 0 -0.5 9.8\n"
    refused = ctl("battery.capacity", "150")
    assert refused.returncode != 0 and "150 is out of range 0..100" in refused.stderr
    listed = dict(line.split(None, 1) for line in ctl().stdout.splitlines())
    assert listed["sensor.gsensor"] == "0 -0.5 9.8"
    assert listed["battery.capacity"] == "57"
    assert listed["prop.ro.pemu.product.model"] == "QM0305"
