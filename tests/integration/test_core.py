"""The daemon core as a station sees it: start-up modes, line rules and answer framing."""

import os
import socket
import struct
import subprocess
import termios

import pytest

import emulator
from conftest import BINARY, BLOCK, PATIENCE, TcpPhone, TtyPhone, framed_tcp, framed_tty, free_port

# Commands whose rows have no behaviour of their own answer "Not Implement" in every
# accepted form; they exercise the dispatcher without depending on any command family.
UNSPECIFIED = b"AT+JVLIFE"


def test_tty_answers(usb_phone):
    # The reader's own answer to an unknown name, and the dispatcher's frame.
    assert usb_phone.command(b"at+nothere=1  ") == b"AT+NOTHERE=1\r\nERROR\r\n"
    assert usb_phone.command(UNSPECIFIED + b"=1") == \
        framed_tty(UNSPECIFIED + b"=1", b"", b"Not Implement")


@pytest.mark.parametrize("map_cr, answer", [
    # A port that maps CR to NL turns CR LF into two lines; the empty second one is dropped.
    (True, framed_tty(b"AT+JVLIFE", b"", b"Not Implement")),
    # Without the mapping the CR stays in the line, so the name is not found.
    (False, b"AT+JVLIFE\r\r\nERROR\r\n"),
])
def test_tty_line_ended_by_cr_lf(device_root, map_cr, answer):
    emulator.prepare_mode(device_root, "usb")
    phone = TtyPhone(device_root)
    with open(phone.bridge.device_path, "rb", buffering=0) as port:
        attrs = termios.tcgetattr(port.fileno())
        attrs[0] = attrs[0] | termios.ICRNL if map_cr else attrs[0] & ~termios.ICRNL
        termios.tcsetattr(port.fileno(), termios.TCSANOW, attrs)
    try:
        phone.start()
        assert phone.command(b"AT+JVLIFE", end=b"\r\n") == answer
    finally:
        phone.stop()


def test_tty_end_of_service_command_closes_the_port(usb_phone):
    # The answer comes first; the next wait on the closed port ends the daemon.
    assert usb_phone.command(b"AT+JVSSID=0") == framed_tty(b"AT+JVSSID=0", b"", b"Not Implement")
    assert usb_phone.wait() != 0


def test_tty_cable_pulled_and_reopen_fails(usb_phone):
    usb_phone.bridge.hang_up()
    assert usb_phone.wait() == 1
    assert "The process is terminated due to fatal error" in usb_phone.log()


def test_tty_port_that_fails_again_after_each_reopen(device_root):
    # A port that opens fine but reads nothing (a hung-up gadget port; here /dev/null) counts
    # each useless re-open as a failed try instead of spinning.
    emulator.prepare_mode(device_root, "usb")
    emulator.link_port(device_root, "ttyGS0", "/dev/null")
    assert run_daemon(device_root) == 1
    assert "The process is terminated due to fatal error" in \
        (device_root / ".emu/atcid.log").read_text()


def test_tcp_station_hang_up_ends_the_daemon(tcp_phone):
    assert tcp_phone.command(b"ATI") == b"ATI\r\nERROR\r\n"
    tcp_phone.sock.close()
    assert tcp_phone.wait() == 0
    assert "The station closed the connection" in tcp_phone.log()


def test_tcp_end_of_service_command_ends_the_daemon(tcp_phone):
    # The answer comes first; the next receive on the closed descriptor ends the daemon.
    line = b"AT+JVSSID=0"
    assert tcp_phone.command(line) == framed_tcp(line, b"", b"Not Implement")
    assert tcp_phone.wait() == 0
    assert "Failed to receive command !!!" in tcp_phone.log()
    assert "receive error: 9" in tcp_phone.log()


def listening_address(port):
    """The local address of the socket listening on `port`, as /proc/net/tcp shows it."""
    for line in open("/proc/net/tcp").readlines()[1:]:
        fields = line.split()
        address, local_port = fields[1].split(":")
        if int(local_port, 16) == port and fields[3] == "0A":
            return address
    return None


@pytest.mark.parametrize("listen, address", [
    (None, "0100007F"),       # 127.0.0.1 unless asked
    ("0.0.0.0", "00000000"),  # every interface
    ("localhost", None),      # not an address: the daemon does not serve
])
def test_tcp_listen_address(device_root, listen, address):
    emulator.prepare_mode(device_root, "tcp")
    port = free_port()
    with open(device_root / ".emu/atcid.log", "ab") as log:
        proc = emulator.start_daemon(BINARY, device_root, port=port, log=log, listen=listen)
    try:
        if address is None:
            assert proc.wait(timeout=PATIENCE) == 1
            assert "Bind socket error!!!" in (device_root / ".emu/atcid.log").read_text()
            return
        assert emulator.wait_for_log(device_root / ".emu/atcid.log", "start accept", proc,
                                     timeout=PATIENCE)
        assert listening_address(port) == address
    finally:
        proc.kill()
        proc.wait()


SO_TIMESTAMPNS = getattr(socket, "SO_TIMESTAMPNS", 35)  # Linux's value; Python 3.11 lacks it


def test_tcp_blocks_are_padded_and_paced(tcp_phone):
    # The kernel stamps each block when it reaches the socket, so a test that is itself kept
    # waiting by a busy machine still sees the daemon's pauses. Each block is one segment on
    # loopback; reading no further than its end takes its stamp alone.
    sock = tcp_phone.sock
    sock.setsockopt(socket.SOL_SOCKET, SO_TIMESTAMPNS, 1)
    sock.settimeout(PATIENCE)
    # The kernel turns stamping on a moment after the first socket asks for it.
    assert tcp_phone.command(b"ATI") == b"ATI\r\nERROR\r\n"
    tcp_phone.send(UNSPECIFIED + b"=1")
    data, stamps = b"", []
    while len(data) < 3 * BLOCK:
        chunk, ancillary, _, _ = sock.recvmsg(BLOCK - len(data) % BLOCK, 64)
        assert chunk, "answer stopped early"
        if len(data) % BLOCK == 0:
            seconds, nanoseconds = struct.unpack("qq", ancillary[0][2][:16])
            stamps.append(seconds + nanoseconds / 1e9)
        data += chunk
    assert data == framed_tcp(UNSPECIFIED + b"=1", b"", b"Not Implement")
    # Each block follows the one before it after a pause of 100 ms.
    assert stamps[1] - stamps[0] >= 0.099
    assert stamps[2] - stamps[1] >= 0.099


def test_tcp_line_of_200_characters_ends_the_daemon(tcp_phone):
    # The socket has no line end to drop: a CR LF sent by the station stays in the line.
    assert tcp_phone.command(b"ATI\r\n") == b"ATI\r\n\r\nERROR\r\n"
    tcp_phone.send(b"AT" + b"X" * 198)
    assert tcp_phone.receive() == b"\r\nERROR\r\n"
    assert tcp_phone.wait() == 0


@pytest.mark.parametrize("cmdline, kroem, expected", [
    # Console mode and uart2 together choose the UART whatever the property says.
    ("console=sendAT androidboot.uart=uart2", "2", "uart"),
    # Only the property's first character chooses the socket.
    ("console=ttyHSL0", "20", "tcp"),
    ("console=ttyHSL0", "1", "usb"),
    ("console=ttyHSL0", "3", "none"),
])
def test_port_selection(device_root, cmdline, kroem, expected):
    emulator.device_cmdline(device_root, cmdline)
    if kroem:
        emulator.set_property(device_root, "persist.sys.kroem", kroem)
    if expected == "none":
        assert run_daemon(device_root) == 0
        return
    if expected == "tcp":
        phone = TcpPhone(device_root)
    else:
        phone = TtyPhone(device_root, expected)
    try:
        phone.start()
        assert phone.command(b"ATI") == b"ATI\r\nERROR\r\n"
        if expected == "uart":
            with open(phone.bridge.device_path, "rb", buffering=0) as port:
                attrs = termios.tcgetattr(port.fileno())
            assert attrs[4] == termios.B115200 and attrs[5] == termios.B115200
            assert "cat /proc/kmsg > /data/log.txt&" in phone.shell_log()
            assert (device_root / "dev/__properties__/persist.sys.is_kro_log").read_text() == "2"
        elif expected == "usb":
            with open(phone.bridge.device_path, "rb", buffering=0) as port:
                attrs = termios.tcgetattr(port.fileno())
            assert attrs[4] != termios.B115200
    finally:
        phone.stop()


def run_daemon(root):
    """Runs the daemon on `root` until it ends by itself; returns its status."""
    with open(root / ".emu/atcid.log", "ab") as log:
        return emulator.start_daemon(BINARY, root, log=log).wait(timeout=PATIENCE)


def test_usb_port_that_cannot_open(device_root):
    emulator.prepare_mode(device_root, "usb")
    (device_root / "dev/ttyGS0").unlink(missing_ok=True)
    assert run_daemon(device_root) == 1
    assert "Could not open serial device :/dev/ttyGS0 and start atci service" in \
        (device_root / ".emu/atcid.log").read_text()


def test_missing_root_is_refused():
    env = {k: v for k, v in os.environ.items() if k != "ATCID_ROOT"}
    result = subprocess.run([str(BINARY)], env=env, capture_output=True, timeout=PATIENCE)
    assert result.returncode != 0
    assert b"ATCID_ROOT" in result.stderr


def test_shell_runs_isolated_in_the_root(tcp_phone):
    # The emergency call goes through the phone's own shell and its stand-in for am.
    assert tcp_phone.command(b"ATD112;") == b"ATD112;\r\nOK\r\n"
    am_log = (tcp_phone.root / ".emu/am.log").read_text()
    assert "am broadcast -a kro.intent.action.AT_EMERG_CALL" in am_log
