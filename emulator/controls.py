"""Every input of the emulated phone that a person or a script may change: its name, the file it
writes under the phone's root, its format and its range. The live view's page, its HTTP
interface and `atcid-emu ctl` all set the phone through here, and nothing else of theirs writes
into the root. A value is checked whole before anything is written: a bad one raises
ControlError with the reason, and the root stays as it was.

Paths never follow a symbolic link: a link inside the root may point anywhere on this machine
(the phone's shell can make one), and the controls must not read or write there."""

import errno
import os
import re
from dataclasses import dataclass, field

PROPERTIES = "dev/__properties__"
SIM_STATE = "gsm.sim.state"
# The SIM states that mean a card is in the slot, as the daemon counts them.
SIM_PRESENT = ("PIN_REQUIRED", "PUK_REQUIRED", "NETWORK_LOCKED", "READY", "NOT_READY",
               "PERM_DISABLED", "CARD_IO_ERROR", "PERSO_LOCKED")
CARD = "storage/sdcard1"
CARD_REMOVED = ".emu/sdcard1.removed"
BATTERY = "sys/class/power_supply/battery/"
USB_ONLINE = "sys/class/power_supply/usb/online"


class ControlError(ValueError):
    """A control name or value that is refused; nothing was written."""


# --- Files of the root, reached without following links -------------------------------------

def _open_dir(root, parts, create=False):
    fd = os.open(root, os.O_RDONLY | os.O_DIRECTORY | os.O_CLOEXEC)
    try:
        for part in parts:
            if create:
                try:
                    os.mkdir(part, 0o755, dir_fd=fd)
                except FileExistsError:
                    pass
            nxt = os.open(part, os.O_RDONLY | os.O_DIRECTORY | os.O_NOFOLLOW | os.O_CLOEXEC,
                          dir_fd=fd)
            os.close(fd)
            fd = nxt
    except BaseException:
        os.close(fd)
        raise
    return fd


def _split(rel):
    parts = rel.split("/")
    return parts[:-1], parts[-1]


def _at(root, rel, action, failed=None):
    """action(directory descriptor, name) on a path of the root; `failed` when that fails."""
    dirs, name = _split(rel)
    try:
        dfd = _open_dir(root, dirs)
    except OSError:
        return failed
    try:
        return action(dfd, name)
    except OSError:
        return failed
    finally:
        os.close(dfd)


def _read(root, rel, limit, tail):
    def read(dfd, name):
        fd = os.open(name, os.O_RDONLY | os.O_NOFOLLOW | os.O_CLOEXEC | os.O_NONBLOCK, dir_fd=dfd)
        try:
            start = max(0, os.fstat(fd).st_size - limit) if tail else 0
            data = os.pread(fd, limit, start)
        finally:
            os.close(fd)
        # A tail begins at its first whole line.
        return (data[data.find(b"\n") + 1:] if start > 0 else data).decode("utf-8", "replace")
    return _at(root, rel, read)


def read_file(root, rel, limit=4096):
    """The first `limit` bytes of a file of the root as text, or None when it cannot be read."""
    return _read(root, rel, limit, tail=False)


def read_tail(root, rel, limit=65536):
    """The whole lines among the last `limit` bytes of a file of the root, or None."""
    return _read(root, rel, limit, tail=True)


def _lstat(dfd, name):
    return os.stat(name, dir_fd=dfd, follow_symlinks=False)


def modified(root, rel):
    """The file's modification time (seconds since the epoch), or None."""
    return _at(root, rel, lambda dfd, name: _lstat(dfd, name).st_mtime)


def exists(root, rel):
    return _at(root, rel, lambda dfd, name: bool(_lstat(dfd, name)), False)


def write_file(root, rel, text):
    """Replaces a file whole: readers see the old content or the new, never a part."""
    dirs, name = _split(rel)
    dfd = _open_dir(root, dirs, create=True)
    tmp = f".{name}.ctl-{os.getpid()}"
    try:
        fd = os.open(tmp, os.O_WRONLY | os.O_CREAT | os.O_TRUNC | os.O_NOFOLLOW | os.O_CLOEXEC,
                     0o644, dir_fd=dfd)
        try:
            os.write(fd, text.encode())
        finally:
            os.close(fd)
        os.rename(tmp, name, src_dir_fd=dfd, dst_dir_fd=dfd)
    finally:
        try:
            os.unlink(tmp, dir_fd=dfd)
        except FileNotFoundError:
            pass
        os.close(dfd)


def remove_file(root, rel):
    dirs, name = _split(rel)
    try:
        dfd = _open_dir(root, dirs)
    except OSError:
        return
    try:
        os.unlink(name, dir_fd=dfd)
    except FileNotFoundError:
        pass
    finally:
        os.close(dfd)


def move(root, src, dst):
    sdirs, sname = _split(src)
    ddirs, dname = _split(dst)
    sfd = _open_dir(root, sdirs)
    try:
        dfd = _open_dir(root, ddirs, create=True)
        try:
            os.rename(sname, dname, src_dir_fd=sfd, dst_dir_fd=dfd)
        finally:
            os.close(dfd)
    finally:
        os.close(sfd)


def list_dir(root, rel):
    try:
        fd = _open_dir(root, rel.split("/"))
    except OSError:
        return []
    try:
        return sorted(os.listdir(fd))
    finally:
        os.close(fd)


def first_line(text):
    return text.splitlines()[0].strip() if text and text.strip() else ""


# --- Value kinds: each turns what a user gave into the text to store, or refuses it ---------

def _plain(value, what):
    if isinstance(value, bool) or not isinstance(value, (str, int, float)):
        raise ControlError(f"expects {what}, not {value!r}")
    return value.strip() if isinstance(value, str) else str(value)


@dataclass(frozen=True)
class Integer:
    lo: int
    hi: int
    unit: str = ""

    def parse(self, value):
        text = _plain(value, "a whole number")
        if not re.fullmatch(r"[+-]?\d{1,12}", text):
            raise ControlError(f"expects a whole number, not {value!r}")
        number = int(text)
        if not self.lo <= number <= self.hi:
            raise ControlError(f"{number} is out of range {self.lo}..{self.hi}")
        return str(number)

    def describe(self):
        return {"kind": "integer", "min": self.lo, "max": self.hi, "unit": self.unit}


NUMBER = re.compile(r"[+-]?(\d+\.?\d*|\.\d+)([eE][+-]?\d{1,3})?")


@dataclass(frozen=True)
class Floats:
    count: int
    lo: float
    hi: float
    unit: str = ""

    def parse(self, value):
        words = value if isinstance(value, list) else _plain(value, "numbers").split()
        if len(words) != self.count:
            raise ControlError(f"expects {self.count} number{'s' if self.count > 1 else ''}, "
                               f"not {value!r}")
        out = []
        for word in words:
            text = _plain(word, "a number")
            if not NUMBER.fullmatch(text):
                raise ControlError(f"expects a number, not {word!r}")
            number = float(text)
            if not self.lo <= number <= self.hi:
                raise ControlError(f"{text} is out of range {self.lo:g}..{self.hi:g}")
            out.append(format(number, ".9g"))
        return " ".join(out)

    def describe(self):
        return {"kind": "floats", "count": self.count, "min": self.lo, "max": self.hi,
                "unit": self.unit}


@dataclass(frozen=True)
class Choice:
    choices: tuple  # (value, label) pairs

    def parse(self, value):
        text = _plain(value, "one of " + self._names())
        for choice, label in self.choices:
            if text.lower() in (choice.lower(), label.lower()):
                return choice
        raise ControlError(f"expects one of {self._names()}, not {value!r}")

    def _names(self):
        return ", ".join(c if c == label else f"{c} ({label})" for c, label in self.choices)

    def describe(self):
        return {"kind": "choice", "choices": [list(c) for c in self.choices]}


@dataclass(frozen=True)
class Text:
    max_bytes: int
    single_line: bool = True

    def parse(self, value):
        if not isinstance(value, str):
            raise ControlError(f"expects a text, not {value!r}")
        if "\0" in value or self.single_line and any(ord(c) < 32 for c in value):
            raise ControlError("expects a text without control characters" if self.single_line
                               else "expects a text without NUL bytes")
        if len(value.encode()) > self.max_bytes:
            raise ControlError(f"expects a text of at most {self.max_bytes} bytes")
        return value

    def describe(self):
        return {"kind": "text", "max_bytes": self.max_bytes}


ON_OFF = Choice((("1", "yes"), ("0", "no")))


# --- Stores: where a control's value lives and how it is written ------------------------------

@dataclass(frozen=True)
class OneFile:
    path: str

    def files(self):
        return (self.path,)


class Node(OneFile):
    """A kernel node: the value and a line end, as the template's nodes hold them."""

    def read(self, root):
        return first_line(read_file(root, self.path))

    def write(self, root, value):
        write_file(root, self.path, value + "\n")


class Exact(OneFile):
    """A text the daemon takes exactly as stored, line ends and all."""

    def read(self, root):
        return read_file(root, self.path, 1024) or ""

    def write(self, root, value):
        write_file(root, self.path, value)


class Switch(Node):
    """A number file that is off when missing: 0 removes it."""

    def read(self, root):
        return super().read(root) or "0"

    def write(self, root, value):
        if value == "0":
            remove_file(root, self.path)
        else:
            super().write(root, value)


class Presence(OneFile):
    """A file whose being there is the state."""

    def read(self, root):
        return "1" if exists(root, self.path) else "0"

    def write(self, root, value):
        if value == "0":
            remove_file(root, self.path)
        elif not exists(root, self.path):
            write_file(root, self.path, "")


@dataclass(frozen=True)
class SensorValues:
    """Values `first`.. of a sensor test's file, the `values=` line; the other lines stay."""
    test: int
    first: int
    count: int

    @property
    def path(self):
        return f".emu/sensor/{self.test}"

    def files(self):
        return (self.path,)

    def _values(self, text):
        for line in (text or "").splitlines():
            if line.startswith("values="):
                values = []
                for word in line[len("values="):].split():
                    if not NUMBER.fullmatch(word):
                        break
                    values.append(word)
                return values
        return []

    def read(self, root):
        values = self._values(read_file(root, self.path)) + ["0"] * (self.first + self.count)
        return " ".join(format(float(v), ".9g") for v in values[self.first:self.first + self.count])

    def write(self, root, value):
        text = read_file(root, self.path) or ""
        values = self._values(text)
        values += ["0"] * max(0, self.first + self.count - len(values))
        values[self.first:self.first + self.count] = value.split()
        lines = [line for line in text.splitlines() if not line.startswith("values=")]
        write_file(root, self.path, "\n".join(lines + ["values=" + " ".join(values)]) + "\n")


def sim_slots(root):
    """Both slots' state texts, read as the daemon reads them."""
    both = read_file(root, f"{PROPERTIES}/{SIM_STATE}")
    if both is not None and "," in both:
        first, rest = both.split(",", 1)
        return [first, rest.split(",", 1)[0]]
    return [both or "", read_file(root, f"{PROPERTIES}/{SIM_STATE}.2") or ""]


@dataclass(frozen=True)
class SimSlot:
    """A SIM card in slot `slot` (0 or 1): both slots live in one property, "slot1,slot2"."""
    slot: int

    def files(self):
        return (f"{PROPERTIES}/{SIM_STATE}", f"{PROPERTIES}/{SIM_STATE}.2")

    def read(self, root):
        state = sim_slots(root)[self.slot]
        return "1" if state in SIM_PRESENT and "ABSENT" not in state else "0"

    def write(self, root, value):
        slots = [s if s.strip() else "ABSENT" for s in sim_slots(root)]
        slots[self.slot] = "READY" if value == "1" else "ABSENT"
        write_file(root, f"{PROPERTIES}/{SIM_STATE}", ",".join(slots))


@dataclass(frozen=True)
class MemoryCard:
    """The card is its directory: pulled, it is kept aside with its files until put back."""

    def files(self):
        return (CARD, CARD_REMOVED)

    def read(self, root):
        return "1" if exists(root, CARD) else "0"

    def write(self, root, value):
        here, aside = exists(root, CARD), exists(root, CARD_REMOVED)
        if value == "1" and not here:
            if aside:
                move(root, CARD_REMOVED, CARD)
            else:
                os.close(_open_dir(root, CARD.split("/"), create=True))
        elif value == "0" and here:
            if aside:
                raise ControlError(f"{CARD_REMOVED} is in the way; remove it first")
            move(root, CARD, CARD_REMOVED)


class UsbCable(Node):
    """The charger follows the cable, as the kernel's battery status does: pulled, a charging
    battery discharges; plugged in, it charges (Full at 100 %)."""

    def files(self):
        return (self.path, BATTERY + "status", BATTERY + "capacity")

    def write(self, root, value):
        status = first_line(read_file(root, BATTERY + "status"))
        if value == "0" and status in ("Charging", "Full"):
            status = "Discharging"
        elif value == "1" and status in ("Discharging", "Not charging"):
            full = first_line(read_file(root, BATTERY + "capacity")) == "100"
            status = "Full" if full else "Charging"
        else:
            status = None
        super().write(root, value)
        if status:
            write_file(root, BATTERY + "status", status + "\n")


# --- The controls ------------------------------------------------------------------------------

@dataclass(frozen=True)
class Control:
    name: str
    label: str
    group: str
    kind: object
    store: object
    help: str = ""

    def read(self, root):
        return self.store.read(root)

    def describe(self):
        return {"name": self.name, "label": self.label, "group": self.group, "help": self.help,
                "files": list(self.store.files()), **self.kind.describe()}


@dataclass(frozen=True)
class Family:
    """Controls named PREFIX + KEY, one per item (an NV item, a property)."""
    prefix: str
    label: str
    group: str
    key: re.Pattern
    key_help: str
    kind: object
    directory: str
    help: str = ""
    key_max: int = None
    skip: re.Pattern = field(default=re.compile(r"^\.|\.(oem|valid|tmp)$"))

    def control(self, key):
        if not self.key.fullmatch(key) or self.key_max is not None and int(key) > self.key_max:
            raise ControlError(f"{self.prefix}{key}: expects {self.key_help} after {self.prefix}")
        return Control(self.prefix + key, f"{self.label} {key}", self.group, self.kind,
                       Exact(f"{self.directory}/{key}"), self.help)

    def keys(self, root):
        return [k for k in list_dir(root, self.directory)
                if self.key.fullmatch(k) and not self.skip.search(k)]

    def describe(self):
        return {"prefix": self.prefix, "label": self.label, "group": self.group,
                "key_help": self.key_help, "help": self.help, "directory": self.directory,
                **self.kind.describe()}


STATUSES = Choice(tuple((s, s) for s in ("Charging", "Discharging", "Not charging", "Full",
                                         "Unknown")))
INT32 = Integer(-2**31, 2**31 - 1)

CONTROLS = (
    Control("battery.capacity", "Battery level", "Battery", Integer(0, 100, "%"),
            Node(BATTERY + "capacity")),
    Control("battery.voltage", "Voltage", "Battery", Integer(0, 10_000_000, "µV"),
            Node(BATTERY + "voltage_now")),
    Control("battery.temperature", "Temperature", "Battery", Integer(-400, 1000, "0.1 °C"),
            Node(BATTERY + "temp")),
    Control("battery.current", "Current", "Battery", Integer(-20_000_000, 20_000_000, "µA"),
            Node(BATTERY + "current_now")),
    Control("battery.status", "Status", "Battery", STATUSES, Node(BATTERY + "status")),
    Control("usb.cable", "USB cable", "Connections", ON_OFF, UsbCable(USB_ONLINE),
            "pulled, a charging battery turns Discharging; plugged, Charging (Full at 100 %)"),
    Control("sim.1", "SIM card 1", "Connections", ON_OFF, SimSlot(0),
            f"property {SIM_STATE}, READY or ABSENT"),
    Control("sim.2", "SIM card 2", "Connections", ON_OFF, SimSlot(1),
            f"property {SIM_STATE}, READY or ABSENT"),
    Control("card", "Memory card", "Connections", ON_OFF, MemoryCard(),
            f"pulled, {CARD} is kept as {CARD_REMOVED} until put back"),
    Control("headset", "Headset", "Connections", ON_OFF, Node("sys/kernel/debug/mbhc_status")),
    Control("sensor.gsensor", "G-sensor X Y Z", "Sensors", Floats(3, -1000, 1000, "m/s²"),
            SensorValues(49, 0, 3), "the Z stream prints Z"),
    Control("sensor.light", "Light", "Sensors", Floats(1, 0, 1e6, "lux"),
            SensorValues(17, 0, 1)),
    Control("sensor.proximity", "Proximity reading", "Sensors", Floats(1, 0, 1e6),
            SensorValues(33, 0, 1)),
    Control("sensor.proximity.state", "Proximity state", "Sensors",
            Choice((("0", "near"), ("1", "away"))), SensorValues(37, 0, 1)),
    Control("sensor.hall", "Hall sensor", "Sensors",
            Choice((("0", "magnet"), ("1", "no magnet"))), Node("sys/class/switch/hall/state")),
    Control("modem.gps", "GPS text", "Modem", Text(515, single_line=False),
            Exact(".emu/modem/gps/2"), "what the GPS stream sends, exactly"),
    Control("modem.absent", "Service absent", "Modem", ON_OFF, Presence(".emu/modem/absent"),
            "the next modem request waits for good; back on, the daemon must start again"),
    Control("modem.transport_error", "Transport error", "Modem", INT32,
            Switch(".emu/modem/transport_error"), "fails every request so; 0: off"),
    Control("modem.response_error", "Error answer", "Modem", INT32,
            Switch(".emu/modem/response_error"), "fails every request so; 0: off"),
    Control("modem.send_error", "Send error", "Modem", INT32,
            Switch(".emu/modem/send_error"), "fails every request so; 0: off"),
    Control("modem.init_error", "Client open error", "Modem", INT32,
            Switch(".emu/modem/init_error"), "fails every request so; 0: off"),
    Control("fm.signal", "FM signal", "Radio", Integer(0, 65535), Node(".emu/fm/signal")),
)

FAMILIES = (
    Family("modem.nv.", "NV item", "Modem", re.compile(r"0|[1-9]\d{0,9}"),
           "an NV item number (0..4294967295)", Text(256, single_line=False), ".emu/modem/nv",
           "the item's text, exactly", key_max=2**32 - 1),
    Family("prop.", "Property", "Properties", re.compile(r"[A-Za-z0-9][A-Za-z0-9._-]{0,95}"),
           "a property name (letters, digits, '.', '_', '-')", Text(91), PROPERTIES),
)

_BY_NAME = {c.name: c for c in CONTROLS}


def find(name):
    """The control of that name, or ControlError."""
    if not isinstance(name, str):
        raise ControlError(f"a control name is a text, not {name!r}")
    if name in _BY_NAME:
        return _BY_NAME[name]
    for family in FAMILIES:
        if name.startswith(family.prefix):
            return family.control(name[len(family.prefix):])
    raise ControlError(f"no control named {name!r} (atcid-emu ctl --root DIR lists them)")


def set_control(root, name, value):
    """Checks the value, then writes it; returns the value as stored."""
    control = find(name)
    try:
        text = control.kind.parse(value)
    except ControlError as e:
        raise ControlError(f"{name}: {e}") from None
    try:
        control.store.write(root, text)
    except ControlError as e:
        raise ControlError(f"{name}: {e}") from None
    except OSError as e:
        raise ControlError(f"{name}: cannot write: {os.strerror(e.errno or errno.EIO)}") from None
    return text


def names(root):
    """Every control name: the fixed ones, then the NV items and properties the root has."""
    out = [c.name for c in CONTROLS]
    for family in FAMILIES:
        out += [family.prefix + key for key in family.keys(root)]
    return out


def values(root):
    """Every control's name and current value."""
    return {name: find(name).read(root) for name in names(root)}


def describe():
    return {"controls": [c.describe() for c in CONTROLS],
            "families": [f.describe() for f in FAMILIES]}
