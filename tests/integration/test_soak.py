"""A short soak (bench/soak.py has the long one): no descriptor or memory growth across many
commands on one daemon, nor across daemons serving one station connection after another."""

import sys

import pytest

from conftest import BINARY, SOURCE

sys.path.insert(0, str(SOURCE / "bench"))
import soak  # noqa: E402


def test_pty_commands_leave_no_growth(device_root):
    before, after = soak.pty_soak(BINARY, device_root, commands=2000, warmup=500)
    assert soak.compare("pty", before, after, BINARY) == []


def test_tcp_connections_leave_no_growth(device_root):
    try:
        first, last = soak.tcp_soak(BINARY, device_root, connections=50)
    except soak.Skip as skip:
        pytest.skip(str(skip))
    assert soak.compare("tcp", first, last, BINARY) == []
