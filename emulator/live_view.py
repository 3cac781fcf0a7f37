"""The emulated phone's live view: a small HTTP server for the page in web/, the phone's state
read from its root and from the daemon's log, and changes pushed to every open page through one
server-sent event stream.

The view only reads. It watches the directories that hold the files it shows, and the log's,
with inotify, so it sleeps until something changes; it writes into the root only through the
controls module. The launcher drives the power state: `set_power("serving" | "restarting" |
"off")`."""

import ctypes
import json
import os
import queue
import re
import select
import socket
import struct
import threading
import time
from collections import deque
from pathlib import Path
from types import SimpleNamespace
from http.server import BaseHTTPRequestHandler

import controls
from controls import first_line, read_file

WEB = Path(__file__).resolve().parent / "web"
PAGES = {"/": ("index.html", "text/html"), "/style.css": ("style.css", "text/css"),
         "/view.js": ("view.js", "text/javascript")}
POWER_STATES = ("serving", "restarting", "off")
DIALOGUE_LENGTH = 200
LOG_TAIL = 4 << 20  # of a long log, only the end is read at start


# --- inotify, through libc --------------------------------------------------------------------

IN_MODIFY, IN_CREATE, IN_DELETE = 0x2, 0x100, 0x200
IN_MOVED_FROM, IN_MOVED_TO, IN_CLOSE_WRITE = 0x40, 0x80, 0x8
IN_Q_OVERFLOW, IN_IGNORED, IN_ISDIR = 0x4000, 0x8000, 0x40000000
IN_ONLYDIR, IN_DONT_FOLLOW = 0x01000000, 0x02000000
IN_NONBLOCK, IN_CLOEXEC = os.O_NONBLOCK, os.O_CLOEXEC
WATCH_MASK = (IN_MODIFY | IN_CLOSE_WRITE | IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO
              | IN_ONLYDIR | IN_DONT_FOLLOW)
EVENT = struct.Struct("iIII")


class Inotify:
    def __init__(self):
        self._libc = ctypes.CDLL(None, use_errno=True)
        self.fd = self._libc.inotify_init1(IN_NONBLOCK | IN_CLOEXEC)
        if self.fd < 0:
            raise OSError(ctypes.get_errno(), "inotify_init1")

    def add(self, path):
        wd = self._libc.inotify_add_watch(self.fd, os.fsencode(path), WATCH_MASK)
        return wd if wd >= 0 else None

    def read(self):
        """The pending events as (watch, mask, name); empty when there are none."""
        events = []
        while True:
            try:
                data = os.read(self.fd, 65536)
            except BlockingIOError:
                return events
            at = 0
            while at < len(data):
                wd, mask, _, size = EVENT.unpack_from(data, at)
                name = data[at + EVENT.size:at + EVENT.size + size].rstrip(b"\0")
                events.append((wd, mask, os.fsdecode(name)))
                at += EVENT.size + size

    def close(self):
        os.close(self.fd)


# --- What the view shows of the root ----------------------------------------------------------

LEDS = "sys/class/leds/"


def read_tail(root, rel, limit=65536):
    """The last lines of a log file of the root (at most `limit` bytes of them)."""
    text = controls.read_tail(root, rel, limit)
    return text.splitlines() if text else []


def node(path):
    return lambda root: first_line(read_file(root, path))


def number(text):
    try:
        return int(text, 0)
    except (TypeError, ValueError):
        return 0


def green_led(root):
    # The LED model group lights its green LED through "engineering".
    both = [first_line(read_file(root, LEDS + "green/" + f)) for f in ("brightness", "engineering")]
    return max(both, key=number) if any(both) else ""


VIBRATOR = "sys/class/timed_output/vibrator/enable"
# The pulse thread writes its next pulse a little after the last one ended.
PULSE_SLACK = 0.5


def vibrator_ends(root):
    """When the vibrator stops (seconds since the epoch): a timed output runs for the
    milliseconds last written to it."""
    written = controls.modified(root, VIBRATOR)
    duration = number(first_line(read_file(root, VIBRATOR)))
    return written + duration / 1000 + PULSE_SLACK if written and duration > 0 else 0


def vibrator(root):
    return "on" if time.time() < vibrator_ends(root) else "off"


def framebuffer(root):
    lines = read_tail(root, ".emu/framebuffer.log", 4096)
    return "blanked" if lines and lines[-1].split()[-1:] != ["0"] else "on"


def wake_lock(root):
    held = set()
    for line in read_tail(root, ".emu/wake_lock.log"):
        words = line.split()
        if len(words) == 3 and words[0] == "acquire":
            held.add(words[2])
        elif len(words) == 2 and words[0] == "release":
            held.discard(words[1])
    return "held" if held else "released"


def screen(root):
    """The activity the engineer-mode application (or another) was last asked to show."""
    shown = "none"
    for line in read_tail(root, ".emu/am.log"):
        words = line.split()
        if words[1:2] == ["start"]:
            options = dict(zip(words[2::2], words[3::2]))
            shown = options.get("-n") or options.get("-a") or "unnamed"
        elif words[1:2] == ["force-stop"] and len(words) > 2 and shown.startswith(words[2] + "/"):
            shown = "none"
    return shown


AUDIO_CASES = {
    1: "main mic echo", 2: "send", 3: "main mic to headset right", 4: "sub mic echo",
    5: "sub mic to headset left", 6: "mic to headset", 11: "receiver", 12: "headset to earpiece",
    13: "headset to speaker", 14: "headset to speaker", 15: "headset echo",
    17: "headset to left speaker", 18: "headset to right speaker", 22: "loudspeaker playback",
    31: "KTV electric", 32: "KTV echo",
}


def audio(root):
    """The audio library's paths started and not stopped, from its calls. A start whose result
    file says it failed did not start; the result files are read now, so they speak for the
    last call of each case."""
    running = {}
    parameters = ""
    for line in read_tail(root, ".emu/audio/calls.log"):
        words = line.split()
        if words[:1] == ["audio_ftm_process"] and len(words) == 4:
            case = words[1]
            if words[2] == "0":
                running.pop(case, None)
                continue
            result = read_file(root, f".emu/audio/ftm_result.{case}")
            if result is None:
                result = read_file(root, ".emu/audio/ftm_result")
            if result is None or first_line(result) == "0":
                running[case] = AUDIO_CASES.get(number(case), f"case {case}")
        elif words[:1] == ["setParameters"]:
            parameters = line[len("setParameters "):]
    return {"audio.path": ", ".join(running.values()) or "none",
            "audio.parameters": parameters}


class Source:
    """Items read from some files of the root (a directory's "*" for all its files). `prefix`
    names a family, whose items come and go with their files."""

    def __init__(self, files, readers, prefix=None, ends=None):
        self.files, self.readers, self.prefix, self.ends = files, readers, prefix, ends

    def read(self, root):
        if callable(self.readers):
            return self.readers(root)
        return {name: read(root) for name, read in self.readers.items()}


def _node_source(name, path):
    return Source((path,), {name: node(path)})


SOURCES = [
    _node_source("led.red", LEDS + "red/brightness"),
    Source((LEDS + "green/brightness", LEDS + "green/engineering"), {"led.green": green_led}),
    _node_source("led.blue", LEDS + "blue/brightness"),
    _node_source("backlight.lcd", LEDS + "lcd-backlight/brightness"),
    _node_source("backlight.button", LEDS + "button-backlight/brightness"),
    Source((".emu/framebuffer.log",), {"framebuffer": framebuffer}),
    Source((VIBRATOR,), {"vibrator": vibrator}, ends=vibrator_ends),
    _node_source("flash.ext", "sys/ext_led/EXT_FLASH_LED"),
    _node_source("flash.white", LEDS + "flash1_torch-light/brightness"),
    _node_source("flash.warm", LEDS + "flash0_torch-light/brightness"),
    Source((".emu/am.log",), {"screen": screen}),
    Source((".emu/audio/*",), audio),
    Source((".emu/wake_lock.log",), {"wakelock": wake_lock}),
]
SOURCES += [Source(c.store.files(), {c.name: c.read}) for c in controls.CONTROLS]
SOURCES += [Source((f.directory + "/*",),
                   lambda root, f=f: {f.prefix + k: f.control(k).read(root) for k in f.keys(root)},
                   f.prefix) for f in controls.FAMILIES]


# --- The daemon's log: the station's dialogue and the streams ---------------------------------

HEADER = re.compile(r"(\d\d-\d\d) (\d\d):(\d\d):(\d\d)\.(\d{3}) +(\d+) +(\d+) \S (\S*) *: (.*)")
CALL_SITE = re.compile(r"\d+:(\w+)\(\): (.*)", re.S)
WRITE_LENGTH = re.compile(r"(.*):\d+", re.S)
# Commands that start or stop a stream, when answered OK.
STREAM_COMMANDS = {"AT+EADC=1": ("battery", "on"), "AT+EADC=0": ("battery", "off"),
                   "AT+JVZLJC=0,1": ("gsensor", "on"), "AT+JVZLJC=0,0": ("gsensor", "off"),
                   "AT+JVGPS=2": ("gps", "on"), "AT+JVGPS=0": ("gps", "off")}
STREAMS = ("battery", "gsensor", "gps")


def clean_answer(line, answer):
    """The answer as a station reads it: without the echoed line, the blank lines and CRs."""
    text = answer.replace("\r", "")
    if text.startswith(line + "\n"):
        text = text[len(line) + 1:]
    return "\n".join(part for part in text.split("\n") if part.strip())


class LogReader:
    """Reads the daemon's log as it grows and keeps the station's dialogue (each command line,
    its answer, the time it took) and the streams' state and last lines."""

    def __init__(self, path):
        self.path = path
        self.offset = 0
        self.partial = b""
        self.message = None
        self.dialogue = deque(maxlen=DIALOGUE_LENGTH)
        self.pending = None
        self.next_id = 1
        self.streams = {f"stream.{s}": "off" for s in STREAMS}
        self.streams.update({f"stream.{s}.last": "" for s in STREAMS})
        self.changed_entries = {}
        self.changed_items = {}

    def read(self):
        """Reads what the log gained; returns (changed items, changed dialogue entries)."""
        try:
            fd = os.open(self.path, os.O_RDONLY | os.O_NOFOLLOW | os.O_CLOEXEC)
        except OSError:
            return {}, []
        try:
            size = os.fstat(fd).st_size
            if size < self.offset:  # a new log
                self.offset, self.partial = 0, b""
            if self.offset == 0 and size > LOG_TAIL:
                self.offset = size - LOG_TAIL
            chunks = []
            while True:
                data = os.pread(fd, 1 << 20, self.offset)
                if not data:
                    break
                chunks.append(data)
                self.offset += len(data)
        finally:
            os.close(fd)
        data = self.partial + b"".join(chunks)
        end = data.rfind(b"\n") + 1
        self.partial = data[end:]
        for raw in data[:end].decode("utf-8", "replace").split("\n")[:-1]:
            self._physical_line(raw)
        # The log's writer writes whole lines in batches: the last one is complete.
        self._end_message()
        items, entries = self.changed_items, list(self.changed_entries.values())
        self.changed_items, self.changed_entries = {}, {}
        return items, entries

    def _physical_line(self, raw):
        header = HEADER.fullmatch(raw)
        if header is None:
            if self.message is not None:  # a line end inside the logged text
                self.message[1].append(raw)
            return
        self._end_message()
        self.message = (header, [header.group(9)])

    def _end_message(self):
        if self.message is None:
            return
        header, lines = self.message
        self.message = None
        site = CALL_SITE.fullmatch("\n".join(lines))
        if site is None:
            return
        function, text = site.groups()
        hour, minute, second, milli, pid, tid = (int(g) for g in header.group(2, 3, 4, 5, 6, 7))
        clock = f"{hour:02d}:{minute:02d}:{second:02d}.{milli:03d}"
        at = ((hour * 60 + minute) * 60 + second) * 1000 + milli
        main_thread = pid == tid
        if function == "atcid_main" and text.startswith("atcid-daemon start"):
            self._close_pending()
            for stream in STREAMS:
                self._set(f"stream.{stream}", "off")
        elif function == "readerLoop" and text.startswith("Command:"):
            self._close_pending()
            self.pending = {"id": self.next_id, "time": clock, "line": text[len("Command:"):],
                            "answer": None, "ms": None, "_start": at, "_raw": ""}
            self.next_id += 1
            self.dialogue.append(self.pending)
            self._changed(self.pending)
        elif function == "writeDataToserialByResponseType" and text.startswith("========last_rsp:"):
            if self.pending is not None:
                self._answer(text[len("========last_rsp:"):], at)
                self._close_pending()
        elif function == "writeDataToSerial" and text.startswith("Enter with data:"):
            written = WRITE_LENGTH.fullmatch(text[len("Enter with data:"):])
            data = written.group(1) if written else text[len("Enter with data:"):]
            if not main_thread and self._stream_line(data):
                return
            if self.pending is not None:
                self._answer(data, at)

    def _stream_line(self, data):
        line = data.strip()
        if line.startswith("+EADC:"):
            stream = "battery"
        elif re.fullmatch(r"-?\d+", line):
            stream = "gsensor"
        elif self.streams["stream.gps"] == "on" or (self.pending or {}).get("line") == "AT+JVGPS=2":
            stream = "gps"
        else:
            return False
        self._set(f"stream.{stream}", "on")
        self._set(f"stream.{stream}.last", line)
        return True

    def _answer(self, data, at):
        entry = self.pending
        entry["_raw"] += data
        entry["answer"] = clean_answer(entry["line"], entry["_raw"])
        entry["ms"] = (at - entry["_start"]) % 86_400_000
        self._changed(entry)

    def _close_pending(self):
        entry, self.pending = self.pending, None
        if entry is None or entry["answer"] is None:
            return
        words = entry["answer"].split("\n")
        started = STREAM_COMMANDS.get(entry["line"])
        if started and words[-1].strip() == "OK":
            self._set(f"stream.{started[0]}", started[1])

    def _set(self, name, value):
        if self.streams.get(name) != value:
            self.streams[name] = value
            self.changed_items[name] = value

    def _changed(self, entry):
        self.changed_entries[entry["id"]] = public(entry)


def public(entry):
    return {k: v for k, v in entry.items() if not k.startswith("_")}


# --- The view ---------------------------------------------------------------------------------

class LiveView:
    """The page, its HTTP interface and the watcher of one emulated phone."""

    def __init__(self, root, log_path, host="127.0.0.1", port=8688):
        self.root = str(Path(root))
        self.log_path = Path(log_path)
        self.host = host
        self.port = port
        self.items = {"power": "off"}
        self._log = LogReader(self.log_path)
        self._lock = threading.Lock()
        self._subscribers = []
        self._threads = []
        self._socket = None
        self._inotify = None
        self._wake_r, self._wake_w = os.pipe2(os.O_CLOEXEC)
        self._watches = {}  # watch descriptor: directory
        self._depends = {}  # (directory, name or "*"): source indexes
        self._timers = {}  # source index: when (epoch seconds) it must be read again

    @property
    def url(self):
        host = "127.0.0.1" if self.host in ("0.0.0.0", "") else self.host
        return f"http://{host}:{self.port}/"

    def start(self):
        """Opens the port (OSError when it cannot) and starts watching and serving."""
        self._socket = socket.create_server((self.host, self.port))
        self.port = self._socket.getsockname()[1]
        for index, source in enumerate(SOURCES):
            for rel in source.files:
                directory, name = os.path.split(os.path.join(self.root, rel))
                self._depends.setdefault((directory, name), []).append(index)
        self._inotify = Inotify()
        self._watch_all()
        self.items.update(self._log.streams)
        self._refresh(set(range(len(SOURCES))), log_changed=True)
        for target in (self._watch, self._serve):
            thread = threading.Thread(target=target, daemon=True)
            thread.start()
            self._threads.append(thread)

    def set_power(self, state):
        if state not in POWER_STATES:
            raise ValueError(f"power state {state!r} is not one of {POWER_STATES}")
        self._publish({"power": state}, [])

    def close(self):
        os.write(self._wake_w, b"x")
        if self._socket is not None:
            try:
                self._socket.shutdown(socket.SHUT_RDWR)
            except OSError:
                pass
            self._socket.close()
        for thread in self._threads:
            thread.join()
        with self._lock:
            for subscriber in self._subscribers:
                subscriber.put(None)
            self._subscribers.clear()
        if self._inotify is not None:
            self._inotify.close()
        os.close(self._wake_r)
        os.close(self._wake_w)

    def state(self):
        with self._lock:
            return {"items": dict(self.items),
                    "dialogue": [public(e) for e in self._log.dialogue]}

    def subscribe(self):
        """A queue of event texts, the whole state first; None ends it."""
        events = queue.SimpleQueue()
        with self._lock:
            events.put(json.dumps({"items": dict(self.items), "reset": True,
                                   "dialogue": [public(e) for e in self._log.dialogue]}))
            self._subscribers.append(events)
        return events

    def unsubscribe(self, events):
        with self._lock:
            if events in self._subscribers:
                self._subscribers.remove(events)

    def _publish(self, items, entries):
        with self._lock:
            items = {k: v for k, v in items.items() if self.items.get(k, None) != v}
            for name, value in items.items():
                if value is None:
                    self.items.pop(name, None)
                else:
                    self.items[name] = value
            if not items and not entries:
                return
            text = json.dumps({"items": items, "dialogue": entries})
            for subscriber in self._subscribers:
                subscriber.put(text)

    # The watcher: every directory that holds a shown file, or the nearest one that exists
    # until it is made.
    def _watch_all(self):
        watched = set(self._watches.values())
        for directory in {d for d, _ in self._depends} | {str(self.log_path.parent)}:
            while not os.path.isdir(directory) and directory.startswith(self.root + "/"):
                directory = os.path.dirname(directory)
            if directory not in watched:
                wd = self._inotify.add(directory)
                if wd is not None:
                    self._watches[wd] = directory
                    watched.add(directory)

    def _watch(self):
        log_key = (str(self.log_path.parent), self.log_path.name)
        while True:
            # Asleep until a file changes; or, while something runs for a set time (a vibrator
            # pulse), until that time is over.
            timeout = max(0.0, min(self._timers.values()) - time.time()) if self._timers else None
            ready, _, _ = select.select([self._inotify.fd, self._wake_r], [], [], timeout)
            if self._wake_r in ready:
                return
            dirty, log_changed, rewatch = set(), False, False
            dirty.update(i for i, at in self._timers.items() if at <= time.time())
            for wd, mask, name in self._inotify.read():
                directory = self._watches.get(wd)
                if mask & IN_IGNORED:
                    self._watches.pop(wd, None)
                if mask & (IN_ISDIR | IN_IGNORED | IN_Q_OVERFLOW):
                    rewatch = True
                    continue
                if directory is None:
                    continue
                dirty.update(self._depends.get((directory, name), ()))
                dirty.update(self._depends.get((directory, "*"), ()))
                log_changed |= (directory, name) == log_key
            if rewatch:
                self._watch_all()
                dirty = set(range(len(SOURCES)))
                log_changed = True
            self._refresh(dirty, log_changed)

    def _refresh(self, dirty, log_changed):
        items = {}
        for index in sorted(dirty):
            source = SOURCES[index]
            values = source.read(self.root)
            if source.ends:
                ends = source.ends(self.root)
                if ends > time.time():
                    self._timers[index] = ends
                else:
                    self._timers.pop(index, None)
            if source.prefix:  # items whose file went away are dropped
                with self._lock:
                    gone = [n for n in self.items if n.startswith(source.prefix)]
                items.update({name: None for name in gone if name not in values})
            items.update(values)
        entries = []
        if log_changed:
            with self._lock:  # the dialogue is read by the HTTP threads
                log_items, entries = self._log.read()
            items.update(log_items)
        self._publish(items, entries)

    # HTTP: one thread per connection, started from a blocking accept, so nothing wakes while
    # nobody calls.
    def _serve(self):
        context = SimpleNamespace(view=self)
        while True:
            try:
                connection, address = self._socket.accept()
            except OSError:
                return
            threading.Thread(target=self._handle, args=(connection, address, context),
                             daemon=True).start()

    @staticmethod
    def _handle(connection, address, context):
        try:
            Handler(connection, address, context)
        except OSError:
            pass
        finally:
            connection.close()


class Handler(BaseHTTPRequestHandler):
    server_version = "atcid-live-view"
    protocol_version = "HTTP/1.0"
    timeout = 60  # for a request to arrive; an event stream waits on its queue, not here

    def log_message(self, *_):
        pass

    def _send(self, status, body, content_type="application/json"):
        data = body if isinstance(body, bytes) else json.dumps(body).encode()
        self.send_response(status)
        self.send_header("Content-Type", content_type + "; charset=utf-8")
        self.send_header("Content-Length", str(len(data)))
        self.send_header("Cache-Control", "no-store")
        self.end_headers()
        self.wfile.write(data)

    def do_GET(self):
        view = self.server.view
        path = self.path.split("?", 1)[0]
        if path in PAGES:
            name, kind = PAGES[path]
            self._send(200, (WEB / name).read_bytes(), kind)
        elif path == "/api/state":
            self._send(200, view.state())
        elif path == "/api/controls":
            self._send(200, controls.describe())
        elif path == "/api/events":
            self._events(view)
        else:
            self._send(404, {"error": f"no page {path}"})

    def do_POST(self):
        if self.path != "/api/control":
            self._send(404, {"error": f"no page {self.path}"})
            return
        # A JSON body only: a page of another site cannot send one here without asking first.
        if self.headers.get("Content-Type", "").split(";")[0].strip() != "application/json":
            self._send(415, {"error": "send the control as application/json"})
            return
        length = self.headers.get("Content-Length", "")
        length = int(length) if length.isdigit() else 0
        if not 0 < length <= 65536:
            self._send(400, {"error": "a JSON body of at most 64 KiB is needed"})
            return
        try:
            request = json.loads(self.rfile.read(length))
            if not isinstance(request, dict) or set(request) != {"name", "value"}:
                raise ValueError
        except ValueError:
            self._send(400, {"error": 'expects {"name": ..., "value": ...}'})
            return
        try:
            value = controls.set_control(self.server.view.root, request["name"], request["value"])
        except controls.ControlError as e:
            self._send(400, {"error": str(e)})
            return
        self._send(200, {"name": request["name"], "value": value})

    def _events(self, view):
        events = view.subscribe()
        try:
            self.send_response(200)
            self.send_header("Content-Type", "text/event-stream")
            self.send_header("Cache-Control", "no-store")
            self.end_headers()
            while True:
                text = events.get()
                if text is None:
                    return
                self.wfile.write(b"data: " + text.encode() + b"\n\n")
        finally:
            view.unsubscribe(events)
