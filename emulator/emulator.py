"""The emulated phone: a device root made from the template, its shell (a static mksh and busybox
tools), pseudo-terminals for the serial ports, and the atcid daemon serving on them.

Used by the launcher (atcid-emu) and by the integration tests.
"""

import errno
import os
import select
import shutil
import subprocess
import threading
import time
import tty
from pathlib import Path

HERE = Path(__file__).resolve().parent
TEMPLATE = HERE / "root"

# Directories a phone has that git cannot carry empty.
DIRECTORIES = (
    "data", "cache/recovery", "dev/input", "mnt", "persist", "storage/sdcard0",
    "storage/sdcard1", "system/bin", "system/xbin", "tmp", ".emu",
)

# Busybox applets installed as the phone's shell tools. The daemon's shell runs in namespaces
# of its own, so none of them could reach the machine; still, tools that would act on a whole
# machine (reboot, poweroff, halt, date, hwclock, insmod, rmmod, modprobe, mount, umount,
# chroot, swapon, ifconfig, ip, route, nsenter, unshare, sync, ...) and busybox's own shells
# are left out: the phone's tools of those names are stand-in scripts of the template.
SAFE_APPLETS = (
    "awk", "basename", "cat", "chmod", "cmp", "cp", "cut", "dd", "diff", "dirname",
    "du", "echo", "env", "expr", "false", "find", "grep", "head", "id", "kill", "killall", "ln",
    "ls", "md5sum", "mkdir", "mktemp", "mv", "od", "pgrep", "pidof", "pkill", "printf", "ps",
    "pwd", "readlink", "realpath", "rm", "rmdir", "sed", "seq", "sleep", "sort", "stat", "tail",
    "tee", "test", "[", "touch", "tr", "true", "uniq", "wc", "xargs", "yes",
)

BUSYBOX_CANDIDATES = ("/bin/busybox", "/usr/bin/busybox")
# The phone's shell is mksh; Debian's mksh package has a static build. It finds every command
# through PATH, so a stand-in script always runs, never a built-in applet of the same name.
MKSH_CANDIDATES = ("/bin/mksh-static", "/usr/lib/klibc/bin/mksh")


def _first_existing(paths):
    for path in paths:
        if os.path.exists(path):
            return path
    return None


def find_busybox():
    return _first_existing(BUSYBOX_CANDIDATES)


def find_mksh():
    return _first_existing(MKSH_CANDIDATES)


def set_property(root, name, value):
    """Writes a property the way the phone's property files hold it: the value, no line end."""
    path = Path(root) / "dev/__properties__" / name
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_bytes(value.encode() if isinstance(value, str) else value)


def make_root(root, busybox=None, mksh=None):
    """Creates a fresh device root at `root` from the template and installs the shell."""
    root = Path(root)
    if root.exists():
        shutil.rmtree(root)
    shutil.copytree(TEMPLATE, root, symlinks=True)
    for directory in DIRECTORIES:
        (root / directory).mkdir(parents=True, exist_ok=True)
    install_shell(root, mksh or find_mksh(), busybox or find_busybox())
    return root


def install_shell(root, mksh, busybox):
    """Installs the static mksh as /system/bin/sh, and a static busybox as /system/bin/busybox
    with links for the listed applets that no stand-in of the template already provides."""
    bindir = Path(root) / "system/bin"
    if mksh is not None:
        shutil.copy(mksh, bindir / "sh")
    if busybox is None:
        return mksh is not None
    shutil.copy2(busybox, bindir / "busybox")
    listed = subprocess.run([busybox, "--list"], capture_output=True, text=True).stdout.split()
    for applet in SAFE_APPLETS:
        link = bindir / applet
        if applet in listed and not link.exists() and not link.is_symlink():
            link.symlink_to("busybox")
    return mksh is not None


def device_cmdline(root, text):
    (Path(root) / "proc/cmdline").write_text(text + "\n")


class PtyBridge:
    """Two pseudo-terminals joined back to back: the daemon opens one as its serial port, the
    station opens the other. The daemon's side keeps a phone port's default settings; the
    station's side is raw."""

    def __init__(self):
        self.device_master, device_slave = os.openpty()
        self.device_path = os.ttyname(device_slave)
        os.close(device_slave)
        self.station_master, self._station_slave = os.openpty()
        tty.setraw(self._station_slave)
        self.station_path = os.ttyname(self._station_slave)
        self._stop = threading.Event()
        self._thread = threading.Thread(target=self._relay, daemon=True)
        self._thread.start()

    def _relay(self):
        pairs = {self.device_master: self.station_master, self.station_master: self.device_master}
        for fd in pairs:
            # A master whose side nobody has open reads as EIO until somebody opens it; a
            # blocking read started then would wait for data instead of looking again.
            os.set_blocking(fd, False)
        while not self._stop.is_set():
            try:
                ready, _, _ = select.select(list(pairs), [], [], 0.05)
            except (OSError, ValueError):
                return
            for fd in ready:
                try:
                    data = os.read(fd, 4096)
                except BlockingIOError:
                    continue
                except OSError as e:
                    if e.errno not in (errno.EIO, errno.EBADF):
                        raise
                    time.sleep(0.02)
                    continue
                self._write_all(pairs[fd], data)

    def _write_all(self, fd, data):
        while data and not self._stop.is_set():
            try:
                data = data[os.write(fd, data):]
            except BlockingIOError:
                select.select([], [fd], [], 0.05)
            except OSError:
                return

    def hang_up(self):
        """Pulls the cable: the daemon's side goes away for good."""
        self._stop.set()
        self._thread.join()
        os.close(self.device_master)

    def close(self):
        if not self._stop.is_set():
            self.hang_up()
        for fd in (self.station_master, self._station_slave):
            try:
                os.close(fd)
            except OSError:
                pass


def link_port(root, name, target):
    """Points the root's /dev/<name> at a pseudo-terminal of the machine."""
    link = Path(root) / "dev" / name
    if link.is_symlink() or link.exists():
        link.unlink()
    link.symlink_to(target)


def prepare_mode(root, mode):
    """Sets the properties and kernel command line that make the daemon choose `mode`."""
    if mode == "tcp":
        set_property(root, "persist.sys.kroem", "2")
    elif mode == "usb":
        set_property(root, "persist.sys.kroem", "1")
    elif mode == "uart":
        device_cmdline(root, "console=sendAT androidboot.uart=uart2 androidboot.hardware=qcom")
    else:
        raise ValueError(f"unknown mode {mode}")


def start_daemon(binary, root, port=None, log=None, listen=None):
    env = {k: v for k, v in os.environ.items()
           if not k.startswith("ATCID_") or k == "ATCID_RESOLVER"}
    env["ATCID_ROOT"] = str(root)
    if port is not None:
        env["ATCID_PORT"] = str(port)
    if listen is not None:
        env["ATCID_LISTEN"] = str(listen)
    return subprocess.Popen([str(binary)], env=env, stdin=subprocess.DEVNULL,
                            stdout=log or subprocess.DEVNULL, stderr=log or subprocess.DEVNULL)


def power_log_size(root):
    try:
        return (Path(root) / ".emu/power.log").stat().st_size
    except FileNotFoundError:
        return 0


# The least time from one start of the daemon to the next, so a daemon that cannot serve is
# never restarted in a tight loop: short after a normal ending (a station hung up), longer
# after a failure (its port cannot be opened or used).
RESTART_PAUSE = 0.05
RESTART_PAUSE_FAILED = 1.0


def run_service(binary, root, log_path, port=None, listen=None, on_start=None, stopping=None,
                on_power=None):
    """Runs the daemon on `root` as the phone's init runs its service: whenever it ends on its
    own it is started again on the same root, so a station can hang up and connect again.
    Returns the last status once the daemon ended by a power request (.emu/power.log grew
    while it ran) or once `stopping` (a threading.Event) is set. `on_start` gets each process;
    `on_power(state)` hears "serving" at each start, "restarting" when the daemon ended on its
    own and is started again, and "off" when the service ends."""
    stopping = stopping or threading.Event()
    power = on_power or (lambda state: None)
    while True:
        before = power_log_size(root)
        started = time.monotonic()
        with open(log_path, "ab") as log:
            proc = start_daemon(binary, root, port=port, log=log, listen=listen)
        if on_start is not None:
            on_start(proc)
        power("serving")
        if stopping.is_set():
            proc.terminate()
        status = proc.wait()
        if stopping.is_set() or power_log_size(root) > before:
            power("off")
            return status
        power("restarting")
        pause = RESTART_PAUSE if status == 0 else RESTART_PAUSE_FAILED
        if stopping.wait(max(0.0, pause - (time.monotonic() - started))):
            power("off")
            return status


def wait_for_log(path, text, proc=None, timeout=10.0):
    """Waits until the daemon's log holds `text`; False if the daemon ended or time ran out."""
    deadline = time.monotonic() + timeout
    needle = text.encode()
    while time.monotonic() < deadline:
        try:
            if needle in Path(path).read_bytes():
                return True
        except FileNotFoundError:
            pass
        if proc is not None and proc.poll() is not None:
            return needle in Path(path).read_bytes()
        time.sleep(0.02)
    return False
