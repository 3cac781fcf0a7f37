"""The station's end of the port: a TCP connection or a serial device, read by a background
thread into one buffer that the answer decoder and the unsolicited-line printer share."""

import errno
import socket
import threading
import time

from .errors import ConnectionLost, Unreachable

DEFAULT_TCP_PORT = 6888
DEFAULT_BAUD = 115200
REFUSED_RETRY = 1.0



def parse_target(target):
    """`tcp://HOST[:PORT]` → ("tcp", host, port); anything else is a serial device path."""
    if target.startswith("tcp://"):
        rest = target[len("tcp://"):].rstrip("/")
        if not rest:
            raise Unreachable(f"{target}: no host")
        host, port = rest, DEFAULT_TCP_PORT
        if rest.startswith("["):  # [::1]:6888
            close = rest.find("]")
            if close < 0:
                raise Unreachable(f"{target}: unclosed '['")
            host, tail = rest[1:close], rest[close + 1:]
            if tail:
                if not tail.startswith(":"):
                    raise Unreachable(f"{target}: bad port")
                port = tail[1:]
        elif rest.count(":") == 1:
            host, port = rest.split(":")
        try:
            port = int(port)
        except ValueError:
            raise Unreachable(f"{target}: bad port {port!r}") from None
        if not 0 < port < 65536:
            raise Unreachable(f"{target}: port {port} out of range")
        return "tcp", host, port
    return "serial", target, None


class Link:
    """Bytes from the phone accumulate in `buffer` under `cond`; `closed` is set when the
    port ended. `arrived` is the monotonic time of the last read."""

    kind = None

    def __init__(self):
        self.buffer = bytearray()
        self.cond = threading.Condition()
        self.closed = False
        self.arrived = time.monotonic()
        self._reader = threading.Thread(target=self._read_loop, daemon=True)

    def _start(self):
        self._reader.start()

    def _read_loop(self):
        while True:
            try:
                data = self._read()
            except (OSError, ValueError, TypeError):
                data = b""
            with self.cond:
                if not data:
                    self.closed = True
                    self.cond.notify_all()
                    return
                self.buffer += data
                self.arrived = time.monotonic()
                self.cond.notify_all()

    def take(self, count):
        """Removes and returns the first `count` bytes of the buffer (caller holds `cond`)."""
        data = bytes(self.buffer[:count])
        del self.buffer[:count]
        return data

    def send(self, data):
        try:
            self._write(data)
        except OSError as e:
            raise ConnectionLost(f"{self.name}: cannot send to the phone: {e.strerror or e}"
                                 ) from None

    def close(self):
        self._close()
        if self._reader.is_alive() and self._reader is not threading.current_thread():
            self._reader.join(timeout=2)


class TcpLink(Link):
    kind = "tcp"

    def __init__(self, host, port, connect_timeout):
        super().__init__()
        self.name = f"tcp://{host}:{port}"
        started = time.monotonic()
        try:
            self.sock = self._connect(host, port, connect_timeout, started)
        except socket.timeout:
            raise Unreachable(f"{self.name}: connection timed out after "
                              f"{time.monotonic() - started:.1f} s") from None
        except ConnectionRefusedError:
            raise Unreachable(f"{self.name}: connection refused for "
                              f"{time.monotonic() - started:.1f} s (is the phone serving TCP?)"
                              ) from None
        except socket.gaierror as e:
            raise Unreachable(f"{self.name}: unknown host ({e.strerror})") from None
        except OSError as e:
            raise Unreachable(f"{self.name}: {e.strerror or e}") from None
        self.sock.settimeout(None)
        self._start()

    @staticmethod
    def _connect(host, port, timeout, started):
        # The phone serves one station per run and is started again when it hangs up, so a
        # refusal right after another station left is retried for a moment.
        while True:
            try:
                return socket.create_connection((host, port), timeout=timeout)
            except ConnectionRefusedError:
                if time.monotonic() - started >= REFUSED_RETRY:
                    raise
                time.sleep(0.05)

    def _read(self):
        return self.sock.recv(65536)

    def _write(self, data):
        self.sock.sendall(data)

    def _close(self):
        try:
            self.sock.shutdown(socket.SHUT_RDWR)
        except OSError:
            pass
        self.sock.close()


class SerialLink(Link):
    kind = "serial"

    def __init__(self, device, baud):
        super().__init__()
        import serial  # pyserial, only needed for serial devices

        self.name = device
        try:
            self.port = serial.Serial(device, baud, timeout=0.2, exclusive=True)
        except serial.SerialException as e:
            raise Unreachable(f"{device}: {_serial_reason(e)}") from None
        self._stop = False
        self._start()

    def _read(self):
        while not self._stop:
            waiting = self.port.in_waiting
            data = self.port.read(waiting or 1)
            if data:
                return data
        return b""

    def _write(self, data):
        self.port.write(data)
        self.port.flush()

    def _close(self):
        self._stop = True
        if self._reader.is_alive():
            self._reader.join(timeout=2)
        self.port.close()


def _serial_reason(error):
    code = getattr(error, "errno", None)
    if code is None and error.args and isinstance(error.args[0], int):
        code = error.args[0]
    reasons = {
        errno.ENOENT: "no such device",
        errno.EBUSY: "device busy (another program has it open)",
        errno.EAGAIN: "device busy (another program has it open)",
        errno.EACCES: "permission denied",
        errno.ENOTTY: "not a serial device",
    }
    if code in reasons:
        return reasons[code]
    text = str(error)
    if "could not exclusively lock" in text:
        return "device busy (another program has it open)"
    return text


def open_link(target, baud=DEFAULT_BAUD, connect_timeout=10.0):
    kind, where, port = parse_target(target)
    if kind == "tcp":
        return TcpLink(where, port, connect_timeout)
    return SerialLink(where, baud)
