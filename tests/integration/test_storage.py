"""Storage tests through the real daemon: the emulated card, its keep list and the shell."""
import re

from test_device_info import framed, phone  # noqa: F401 (fixture)


def card_tree(card):
    entries = []
    for path in sorted(card.rglob("*")):
        rel = path.relative_to(card).as_posix()
        if path.is_symlink():
            entries.append(rel + " -> " + str(path.readlink()))
        elif path.is_dir():
            entries.append(rel + "/")
        else:
            entries.append(rel)
    return sorted(entries)


def test_full_clear_of_the_populated_card(usb_phone):
    p = usb_phone
    card = p.root / "storage/sdcard0"
    # Links out of the card: removed as entries, their targets untouched.
    (p.root / "data/precious").mkdir(parents=True, exist_ok=True)
    (p.root / "data/precious/keep.txt").write_text("keep")
    (card / "Download/escape").symlink_to("/data/precious")
    (card / "Music/Ringtones/up").symlink_to("../../../sdcard1")
    (card / "DCIM/Camera/deep/deeper").mkdir(parents=True)
    (card / "DCIM/Camera/deep/deeper/x.jpg").write_bytes(b"x")

    before = b"\r\n\"0, 1\"\r\n"
    assert p.command(b"AT+JVFN=0") == framed("usb", b"AT+JVFN=0", before, b"ERROR")
    assert p.command(b"AT+JVDF=1") == framed("usb", b"AT+JVDF=1", b"", b"OK")
    assert card_tree(card) == [
        ".clear_sdcard.cfg",
        "Android/",
        "Android/data/",
        "Android/data/com.ulda.engineermode/",
        "Android/data/com.ulda.engineermode/state.txt",
        "Music/",
        "Music/Ringtones/",
        "Music/Ringtones/factory_ring.ogg",
        "Music/Ringtones/up -> ../../../sdcard1",
    ]
    assert (p.root / "data/precious/keep.txt").read_text() == "keep"
    assert (p.root / "storage/sdcard1/.sdcard_version").exists()
    assert p.command(b"AT+JVFN=0") == framed("usb", b"AT+JVFN=0", before, b"OK")

    (card / ".clear_sdcard.cfg").unlink()
    (card / "new.txt").write_text("n")
    assert p.command(b"AT+JVDF=1") == framed("usb", b"AT+JVDF=1", b"", b"ERROR")
    assert (card / "new.txt").exists()


def test_memory_card_and_internal_storage(phone):
    kind, p = phone
    assert p.command(b"AT+TFST=0") == framed(kind, b"AT+TFST=0", b'\r\n"SD_V1.2\n"\r\n', b"OK")
    assert p.command(b"AT+JVTFWR=0") == framed(kind, b"AT+JVTFWR=0", b"", b"OK")
    assert p.command(b"AT+JVUDWR=0") == framed(kind, b"AT+JVUDWR=0", b"", b"OK")
    (p.root / "storage/sdcard1/.sdcard_version").unlink()
    assert p.command(b"AT+TFST=0") == framed(kind, b"AT+TFST=0", b"", b"ERROR")


def test_shell_backed_checks(tcp_phone):
    p = tcp_phone
    (p.root / "data").mkdir(exist_ok=True)
    assert p.command(b"AT+JVSD=0") == framed("tcp", b"AT+JVSD=0", b"", b"OK")
    assert not (p.root / "storage/sdcard0/mount.txt").exists()
    # The template's storage is not the emulated kind.
    p.set_property("persist.sys.primary.emulate", "1")
    assert p.command(b"AT+JVSD=0") == framed("tcp", b"AT+JVSD=0", b"", b"ERROR")

    assert p.command(b"AT+JVOTG=1") == framed("tcp", b"AT+JVOTG=1", b"", b"ERROR")
    (p.root / "dev/input/mouse0").write_bytes(b"")
    assert p.command(b"AT+JVOTG=1") == framed("tcp", b"AT+JVOTG=1", b"", b"OK")
    assert not (p.root / "data/getevent").exists()

    p.set_property("persist.sys.primary.emulate", "0")
    answer = p.command(b"AT+JVUDROOM=0")
    body = answer[2048:4096].rstrip(b"\0")
    assert re.fullmatch(rb'\r\n"[0-9]+\.[0-9]{2},[0-9]+\.[0-9]{3}"\r\n\n', body), body
    assert answer == framed("tcp", b"AT+JVUDROOM=0", body[:-1], b"OK")


def test_storage_calibration_through_vdc(tcp_phone):
    p = tcp_phone
    assert p.command(b"AT+JVSDCALI=0") == framed("tcp", b"AT+JVSDCALI=0", b'\r\n"0"\r\n', b"OK")
    before = (p.root / "persist/ulda_nvram").read_bytes()
    # The emulated vdc makes the card report its calibrated size; the flag is then "X".
    assert p.command(b"AT+JVSDCALI=1") == framed("tcp", b"AT+JVSDCALI=1", b"", b"OK")
    after = (p.root / "persist/ulda_nvram").read_bytes()
    assert after == before[:264] + (88).to_bytes(4, "little") + before[268:]
    assert p.command(b"AT+JVSDCALI=0") == framed("tcp", b"AT+JVSDCALI=0", b'\r\n"88"\r\n', b"OK")
    assert "vdc volume calibrate /storage/sdcard0" in (p.root / ".emu/vdc.log").read_text()
    # A second calibration finds the size unchanged.
    assert p.command(b"AT+JVSDCALI=1") == framed("tcp", b"AT+JVSDCALI=1", b"", b"ERROR")
    assert (p.root / "persist/ulda_nvram").read_bytes() == after
