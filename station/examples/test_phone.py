"""A station engineer's first tests, to copy. With an emulated phone per test:

    python3 -m pytest -p atcid_station.pytest_plugin station/examples/test_phone.py

(from the checkout, with station/ on PYTHONPATH; once `pip install ./station` has run, the
plugin is found without -p). Against a phone on the line, unchanged:

    python3 -m pytest station/examples/test_phone.py --atcid-target tcp://192.168.7.2
"""

import itertools

import pytest


def test_model_and_memory(phone):
    model = phone.command("AT+JVMODEL=0")
    assert model.ok and model.value.startswith("QM")
    memory = phone.command("AT+JVRAM=0")
    assert memory.ok and int(memory.value) > 0


def test_unknown_command_is_refused(phone):
    answer = phone.command("AT+NOSUCH")
    assert (answer.result, answer.lines) == ("ERROR", [])


def test_battery_stream(phone):
    assert phone.command("AT+EADC=1").ok
    try:
        lines = list(itertools.islice(phone.unsolicited(timeout=10), 2))
    finally:
        phone.command("AT+EADC=0")
    assert len(lines) == 2 and all(line.startswith("+EADC: ") for line in lines)


def test_memory_comes_from_the_kernel(phone):
    if phone.root is None:
        pytest.skip("sets the state of an emulated phone")
    (phone.root / "proc/meminfo").write_text("MemTotal:        3145728 kB\n")
    assert phone.command("AT+JVRAM=0").value == "3072"
