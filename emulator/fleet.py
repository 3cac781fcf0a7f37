"""A fleet: N emulated phones side by side, as on a multi-up station. Each is one of the
launcher's phones with a root of its own (ROOT/phone-1 … ROOT/phone-N), its own daemon, its
own identity (serial number, IMEI, board barcode) and its own port: TCP P … P+N−1, or a pair
of pseudo-terminals each. One process serves them all, one service thread per phone, so the
memory a phone adds is its daemon's.

A phone that powers off stops alone; `Fleet.stop` (Ctrl-C in the launcher) stops them all.
"""

import signal
import sys
import threading
import time
from dataclasses import dataclass
from pathlib import Path

import emulator

# What the daemon logs once it waits for a station, per mode.
READY_TEXT = {"tcp": b"start accept", "usb": b"Wait for select data from USB",
              "uart": b"Wait for select data from USB"}


@dataclass(frozen=True)
class Identity:
    serial: str   # proc/sec_serial_num, read by AT+JVCPUID=1 (without its "0x")
    imei: str     # modem NV item 550: .emu/modem/nv/550, read by AT+EGMR=0,7
    barcode: str  # modem NV item 6853: .emu/modem/nv/6853 (AT+EGMR=0,5), persist.sys.barcode


def luhn_digit(digits):
    """The check digit that completes `digits` to a valid Luhn number, as an IMEI's last."""
    total = 0
    for position, char in enumerate(reversed(digits)):
        value = int(char) * (2 if position % 2 == 0 else 1)
        total += value - 9 if value > 9 else value
    return str(-total % 10)


def identity(index):
    """Phone `index` (from 1) of a fleet: its serial number, IMEI and board barcode."""
    body = f"35000000{index:06d}"
    return Identity(serial=f"0x4f2a{index:04x}", imei=body + luhn_digit(body),
                    barcode=f"PCB{index:04d}")


def set_identity(root, ident):
    """Writes the identity where the root holds it, as a provisioned phone holds it."""
    root = Path(root)
    (root / "proc/sec_serial_num").write_text(ident.serial + "\n")
    nv = root / ".emu/modem/nv"
    nv.mkdir(parents=True, exist_ok=True)
    (nv / "550").write_text(ident.imei)
    (nv / "6853").write_text(ident.barcode)
    emulator.set_property(root, "persist.sys.barcode", ident.barcode)


class FleetPhone:
    """One phone of the fleet: where it lives, how a station reaches it, its service state."""

    def __init__(self, index, root, mode, port, listen):
        self.index = index
        self.name = f"phone-{index}"
        self.root = Path(root)
        self.log_path = self.root / ".emu" / "atcid.log"
        self.mode = mode
        self.port = port if mode == "tcp" else None
        self.listen = listen
        self.bridge = None
        self.stopping = threading.Event()
        self.proc = None
        self.state = "off"
        self.thread = None
        self.view = None  # a live view, when the launcher gives the phone one
        self.identity = None  # set when the phone was made afresh

    @property
    def target(self):
        """What a station opens: tcp://HOST:PORT or the station side of the serial port."""
        if self.mode != "tcp":
            return self.bridge.station_path
        host = "127.0.0.1" if self.listen == "0.0.0.0" else self.listen
        return f"tcp://{host}:{self.port}"

    def stop(self):
        self.stopping.set()
        proc = self.proc
        if proc is not None and proc.poll() is None:
            proc.terminate()


class Fleet:
    """`count` phones under `root`. `on_power(phone, state)` hears each phone's service state:
    "serving", "restarting" (a station hung up; the daemon starts again), "off"."""

    def __init__(self, binary, root, count, mode="tcp", port=6888, listen="127.0.0.1",
                 keep=False, on_power=None):
        if count < 1:
            raise ValueError("a fleet has at least one phone")
        if mode == "tcp" and not 0 < port <= 65536 - count:
            raise ValueError(f"ports {port}…{port + count - 1} are not all valid TCP ports")
        self.binary = binary
        self.root = Path(root)
        self.keep = keep
        self.on_power = on_power or (lambda phone, state: None)
        self.phones = [FleetPhone(i, self.root / f"phone-{i}", mode, port + i - 1, listen)
                       for i in range(1, count + 1)]
        self.stopped = threading.Event()

    def prepare(self):
        """Makes each phone's root (afresh, with its identity, unless kept) and its port."""
        self.root.mkdir(parents=True, exist_ok=True)
        for phone in self.phones:
            if not (self.keep and phone.root.exists()):
                emulator.make_root(phone.root)
                phone.identity = identity(phone.index)
                set_identity(phone.root, phone.identity)
            emulator.prepare_mode(phone.root, phone.mode)
            if phone.mode != "tcp":
                phone.bridge = emulator.PtyBridge()
                emulator.link_port(phone.root, "ttyGS0" if phone.mode == "usb" else "ttyHSL0",
                                   phone.bridge.device_path)

    def start(self):
        for phone in self.phones:
            phone.log_start = _size(phone.log_path)
            phone.thread = threading.Thread(target=self._serve, args=(phone,),
                                            name=phone.name, daemon=True)
            phone.thread.start()

    def _serve(self, phone):
        def on_start(proc):
            phone.proc = proc

        def on_power(state):
            phone.state = state
            self.on_power(phone, state)

        emulator.run_service(self.binary, phone.root, phone.log_path, port=phone.port,
                             listen=phone.listen, on_start=on_start, stopping=phone.stopping,
                             on_power=on_power)

    def wait_serving(self, timeout=None):
        """Waits until every phone still running has waited for a station at least once.
        False when time ran out or the fleet was stopped first."""
        deadline = None if timeout is None else time.monotonic() + timeout
        pending = list(self.phones)
        while pending:
            pending = [p for p in pending if p.thread.is_alive() and not _logged_since(
                p.log_path, p.log_start, READY_TEXT[p.mode])]
            if not pending:
                return True
            if self.stopped.is_set() or (deadline is not None and time.monotonic() > deadline):
                return False
            self.stopped.wait(0.02)
        return True

    def stop(self):
        """Stops every phone (safe from a signal handler)."""
        self.stopped.set()
        for phone in self.phones:
            phone.stop()

    def wait(self):
        # Joined in short slices: a signal that reached a service thread runs its handler
        # only once the main thread wakes up.
        for phone in self.phones:
            while phone.thread.is_alive():
                phone.thread.join(0.2)

    def close(self):
        for phone in self.phones:
            if phone.bridge is not None:
                phone.bridge.close()
            if phone.view is not None:
                phone.view.close()


def _size(path):
    try:
        return path.stat().st_size
    except FileNotFoundError:
        return 0


def _logged_since(path, offset, text):
    try:
        with open(path, "rb") as log:
            log.seek(offset)
            return text in log.read()
    except FileNotFoundError:
        return False


def last_power_request(root):
    try:
        lines = (Path(root) / ".emu/power.log").read_text().splitlines()
    except FileNotFoundError:
        return None
    return lines[-1] if lines else None


def main(args, binary, make_view=None):
    """The launcher with --count: prints one line per phone, serves until every phone powered
    off or Ctrl-C. `make_view(phone)` may give each phone a started live view (an object with
    url, set_power(state) and close(), or None); it then follows the phone's power state."""
    out = threading.Lock()

    def say(text):
        with out:
            try:
                print(f"atcid-emu: {text}", flush=True)
            except OSError:
                pass  # nobody reads the output any more; the phones go on serving

    def on_power(phone, state):
        if phone.view is not None:
            phone.view.set_power(state)
        if state == "off" and not phone.stopping.is_set():
            status = phone.proc.returncode if phone.proc else None
            say(f"{phone.name} off ({last_power_request(phone.root)}; daemon status {status}); "
                f"the others go on")

    fleet = Fleet(binary, Path(args.root).resolve(), args.count, args.mode, args.port,
                  args.listen, args.keep, on_power)
    fleet.prepare()
    if emulator.find_mksh() is None or emulator.find_busybox() is None:
        print("atcid-emu: no static mksh or busybox found (packages mksh, busybox-static); "
              "the phones have no shell or tools", file=sys.stderr)
    say(f"{args.count} phones under {fleet.root}, each logging to its .emu/atcid.log")
    for phone in fleet.phones:
        ident = phone.identity
        line = f"{phone.name}  {phone.target}  " + (
            f"serial {ident.serial}  IMEI {ident.imei}  barcode {ident.barcode}" if ident
            else "kept root, identity as it holds it")
        if make_view is not None:
            phone.view = make_view(phone)
            if phone.view is not None:
                line += f"  view {phone.view.url}"
        say(line)

    signal.signal(signal.SIGTERM, lambda *_: fleet.stop())
    signal.signal(signal.SIGINT, lambda *_: fleet.stop())
    fleet.start()
    if fleet.wait_serving():
        say(f"all {args.count} phones serving")
    fleet.wait()
    fleet.close()
    say("every phone stopped")
    return 0
