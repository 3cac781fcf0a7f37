"""The live view: its HTTP interface, and the page in a real browser (headless Chromium driven
by Selenium) beside a station driving the launcher's phone. With ATCID_SCREENSHOT=FILE the
browser test saves the page as it ends there (docs/live-view.png is made so)."""

import importlib.util
import json
import os
import select
import shutil
import signal
import subprocess
import sys
import time
import urllib.error
import urllib.request

import pytest

import live_view
from conftest import BINARY, PATIENCE, QEMU_USER, SOURCE, free_port

sys.path.insert(0, str(SOURCE / "station"))
from atcid_station import Station  # noqa: E402


def post(url, body, content_type="application/json"):
    request = urllib.request.Request(url + "api/control", data=json.dumps(body).encode(),
                                     headers={"Content-Type": content_type})
    try:
        with urllib.request.urlopen(request, timeout=PATIENCE) as answer:
            return answer.status, json.load(answer)
    except urllib.error.HTTPError as e:
        return e.code, json.load(e)


def next_event(stream, wanted):
    """Reads the event stream until an event's items include `wanted`."""
    for raw in stream:
        if raw.startswith(b"data: "):
            items = json.loads(raw[6:])["items"]
            if wanted.items() <= items.items():
                return items
    return None


def test_http_interface(device_root):
    view = live_view.LiveView(device_root, device_root / ".emu/atcid.log", "127.0.0.1", 0)
    view.start()
    try:
        events = urllib.request.urlopen(view.url + "api/events", timeout=PATIENCE)
        assert next_event(events, {"led.red": "0", "battery.capacity": "57", "power": "off"})
        assert post(view.url, {"name": "battery.capacity", "value": 20}) == (
            200, {"name": "battery.capacity", "value": "20"})
        assert next_event(events, {"battery.capacity": "20"})
        (device_root / "sys/class/leds/red/brightness").write_text("100")
        assert next_event(events, {"led.red": "100"})
        view.set_power("restarting")
        assert next_event(events, {"power": "restarting"})
        assert post(view.url, {"name": "battery.capacity", "value": "101"}) == (
            400, {"error": "battery.capacity: 101 is out of range 0..100"})
        assert post(view.url, {"name": "usb.cable", "value": "0"}, "text/plain")[0] == 415
        assert post(view.url, ["usb.cable", "0"])[0] == 400
        state = json.load(urllib.request.urlopen(view.url + "api/state", timeout=PATIENCE))
        assert state["items"]["battery.capacity"] == "20" and state["items"]["usb.cable"] == "1"
    finally:
        view.close()
    assert not any(thread.is_alive() for thread in view._threads)
    assert events.read().strip() == b""  # the stream ended with the view


# What the view makes of the daemon's log and logs, after each command (in order, one phone).
READS = [
    (b"AT+EADC=1", {"stream.battery": "on",
                    "stream.battery.last": '+EADC: "3.85,25.00,0.58,450.00,4.50"'}),
    (b"AT+EADC=0", {"stream.battery": "off"}),
    (b"AT+JVSP=0", {"wakelock": "held"}),
    (b"AT+JVXL=1", {"audio.path": "loudspeaker playback"}),
    (b"AT+JVXL=0", {"audio.path": "none"}),
    (b"AT+LCMT=0", {} if QEMU_USER else {"screen": "com.ulda.engineermode/.ATLcmTest"}),
    (b"AT+JVZLJC=0,1", {"stream.gsensor": "on", "stream.gsensor.last": "10"}),
]


def test_view_reads_the_daemon(tcp_phone):
    view = live_view.LiveView(tcp_phone.root, tcp_phone.log_path, "127.0.0.1", 0)
    view.start()
    try:
        for command, items in READS:
            tcp_phone.command(command)
            deadline = time.monotonic() + PATIENCE
            while not items.items() <= view.state()["items"].items():
                assert time.monotonic() < deadline, (command, items, view.state()["items"])
                time.sleep(0.02)
        dialogue = [(e["line"], e["answer"]) for e in view.state()["dialogue"]]
        assert dialogue[:3] == [("AT+EADC=1", "OK"), ("AT+EADC=0", "OK"), ("AT+JVSP=0", "OK")]
    finally:
        view.close()


BROWSER = ("/usr/bin/chromium", "/usr/bin/chromedriver")
MISSING = [p for p in BROWSER if not shutil.which(p)] + (
    [] if importlib.util.find_spec("selenium") else ["python3-selenium"])


def chromium(user_data):
    from selenium import webdriver
    from selenium.webdriver.chrome.service import Service
    options = webdriver.ChromeOptions()
    options.binary_location = BROWSER[0]
    for flag in ("--headless", "--no-sandbox", "--disable-gpu", "--disable-quic",
                 "--no-first-run", "--disable-background-networking",
                 "--disable-component-update", "--disable-sync", "--window-size=1400,1050",
                 f"--user-data-dir={user_data}"):
        options.add_argument(flag)
    options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
    return webdriver.Chrome(service=Service(BROWSER[1]), options=options)


def launcher_url(launcher):
    printed, deadline = b"", time.monotonic() + PATIENCE
    while time.monotonic() < deadline:
        if select.select([launcher.stdout], [], [], 0.1)[0]:
            printed += os.read(launcher.stdout.fileno(), 4096)
            for line in printed.decode().splitlines(keepends=True):
                if "live view" in line and line.endswith("\n"):
                    return line.split()[-1]
    raise AssertionError(f"the launcher printed no live view: {printed}")


@pytest.mark.skipif(bool(MISSING), reason=f"no browser to test the page in: {MISSING} missing "
                                         "(tools/install-deps installs them)")
def test_page_in_browser(device_root, tmp_path):
    from selenium.webdriver.common.by import By
    from selenium.webdriver.common.keys import Keys
    from selenium.webdriver.support.ui import WebDriverWait

    port = free_port()
    launcher = subprocess.Popen(
        [sys.executable, str(SOURCE / "emulator/atcid-emu"), "--root", str(device_root), "--keep",
         "--port", str(port), "--view-port", str(free_port()), "--bin", str(BINARY)],
        stdout=subprocess.PIPE)
    driver = station = None
    try:
        url = launcher_url(launcher)
        driver = chromium(tmp_path / "chromium")

        def shown(name, value, timeout=PATIENCE):
            item = f'[data-item="{name}"]'
            WebDriverWait(driver, timeout, poll_frequency=0.05).until(
                lambda d: d.find_element(By.CSS_SELECTOR, item).get_attribute("data-value")
                == value, f"{name} never showed {value}")

        driver.get(url)
        shown("power", "serving")
        station = Station.connect(f"tcp://127.0.0.1:{port}", 115200)
        for command, name, value in [("AT+MMILED=1,1", "led.red", "100"),
                                     ("AT+EDFT=0,5,128", "backlight.lcd", "128"),
                                     ("AT+EDFT=6,1", "vibrator", "on")]:
            assert station.ask(command).ok
            shown(name, value, timeout=2)
        capacity = driver.find_element(By.CSS_SELECTOR, '[data-item="battery.capacity"] input')
        capacity.clear()
        capacity.send_keys("15", Keys.ENTER)
        driver.find_element(By.CSS_SELECTOR, '[data-item="usb.cable"] input').click()
        shown("battery.capacity", "15")
        shown("usb.cable", "0")
        assert station.ask("AT+JVDLJ=1").value == "3.85,15%"
        assert station.ask("AT+JVCHARGE=0").result == "ERROR"  # no cable, no charging
        WebDriverWait(driver, PATIENCE).until(lambda d: ["AT+JVCHARGE=0", "ERROR"] in [
            [cell.text for cell in row.find_elements(By.TAG_NAME, "td")][1:3]
            for row in d.find_elements(By.CSS_SELECTOR, "#dialogue tr")])
        if os.environ.get("ATCID_SCREENSHOT"):
            driver.save_screenshot(os.environ["ATCID_SCREENSHOT"])
        assert [e for e in driver.get_log("browser") if e["level"] == "SEVERE"] == []
    finally:
        if station:
            station.close()
        if driver:
            driver.quit()
        launcher.send_signal(signal.SIGTERM)
        launcher.wait(timeout=PATIENCE)
