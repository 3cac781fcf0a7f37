"""pytest plugin: a `phone` fixture, a connected atcid_station.Phone for each test.

    pytest --atcid-target tcp://192.168.7.2          tests drive that phone
    pytest                                           each test gets a fresh emulated phone

Installed with the package (`pip install ./station`) it is found through its pytest11 entry
point; from a checkout, add `-p atcid_station.pytest_plugin`. Without a target the phone is an
emulated one from an atcid checkout (the one this file is in, else $ATCID_SOURCE or
--atcid-source), served on a free TCP port with its root in the test's tmp_path; `phone.root`
is that root, so a test can set the phone's state (docs/emulator.md), and None for a target.
"""

import os
import socket
import sys
from pathlib import Path

import pytest

from .api import connect
from .station import DEFAULT_TIMEOUT

# How long an emulated phone may take to serve on a busy machine.
START_PATIENCE = 30.0


def pytest_addoption(parser):
    group = parser.getgroup("atcid", "atcid phones")
    group.addoption("--atcid-target", metavar="URL",
                    help="the phone tests drive: tcp://HOST[:PORT] or a serial device "
                         "(default: a fresh emulated phone per test)")
    group.addoption("--atcid-timeout", type=float, default=DEFAULT_TIMEOUT, metavar="SEC",
                    help="seconds a command waits for its answer (%(default)s)")
    group.addoption("--atcid-source", metavar="DIR",
                    help="atcid checkout whose emulator serves the emulated phone "
                         "(default: $ATCID_SOURCE, else the checkout this plugin is in)")
    group.addoption("--atcid-bin", metavar="PATH",
                    help="the daemon of the emulated phone (default: $ATCID_BIN, else "
                         "build/atcid of the checkout)")


@pytest.fixture
def phone(request, tmp_path):
    config = request.config
    timeout = config.getoption("atcid_timeout")
    target = config.getoption("atcid_target")
    if target:
        with connect(target, timeout=timeout) as connected:
            yield connected
        return
    yield from _emulated_phone(config, tmp_path, timeout)


def _checkout(config):
    given = config.getoption("atcid_source") or os.environ.get("ATCID_SOURCE")
    candidates = [Path(given)] if given else [Path(__file__).resolve().parents[2]]
    for source in candidates:
        if (source / "emulator" / "fleet.py").is_file():
            return source
    pytest.fail("no --atcid-target and no atcid checkout to start an emulated phone from: "
                "give --atcid-target URL, or --atcid-source DIR (or $ATCID_SOURCE)",
                pytrace=False)


def _free_port():
    with socket.socket() as s:
        s.bind(("127.0.0.1", 0))
        return s.getsockname()[1]


def _emulated_phone(config, tmp_path, timeout):
    source = _checkout(config)
    binary = Path(config.getoption("atcid_bin") or os.environ.get("ATCID_BIN")
                  or source / "build" / "atcid")
    if not binary.is_file():
        pytest.fail(f"no atcid daemon at {binary}: build it (see README) or give --atcid-bin",
                    pytrace=False)
    emulator_dir = str(source / "emulator")
    if emulator_dir not in sys.path:
        sys.path.insert(0, emulator_dir)
    import fleet  # the emulator's, only for a phone of our own

    phones = fleet.Fleet(binary, tmp_path / "atcid", 1, port=_free_port())
    phones.prepare()
    phones.start()
    try:
        if not phones.wait_serving(timeout=START_PATIENCE):
            pytest.fail(f"the emulated phone did not serve within {START_PATIENCE:.0f} s; "
                        f"see {phones.phones[0].log_path}", pytrace=False)
        with connect(phones.phones[0].target, timeout=timeout) as connected:
            connected.root = phones.phones[0].root
            yield connected
    finally:
        phones.stop()
        phones.wait()
        phones.close()
