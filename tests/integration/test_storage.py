"""Device information and storage through the real daemon: the template phone's card and its
keep list, the emulated shell's tools and the vdc stand-in."""
from conftest import framed_tcp, framed_tty


def test_template_card_cleared_to_its_keep_list(usb_phone):
    p = usb_phone
    assert p.command(b"AT+JVRAM=0") == framed_tty(b"AT+JVRAM=0", b'\r\n"2790"\r\n', b"OK")
    counts = b'\r\n"0, 1"\r\n'
    assert p.command(b"AT+JVFN=0") == framed_tty(b"AT+JVFN=0", counts, b"ERROR")
    assert p.command(b"AT+JVDF=1") == framed_tty(b"AT+JVDF=1", b"", b"OK")
    assert (p.root / "storage/sdcard0/Music/Ringtones/factory_ring.ogg").exists()
    assert p.command(b"AT+JVFN=0") == framed_tty(b"AT+JVFN=0", counts, b"OK")


def test_shell_backed_checks(tcp_phone):
    p = tcp_phone
    (p.root / "data").mkdir(exist_ok=True)
    assert p.command(b"AT+JVSD=0") == framed_tcp(b"AT+JVSD=0", b"", b"OK")
    assert not (p.root / "storage/sdcard0/mount.txt").exists()
    assert p.command(b"AT+JVOTG=1") == framed_tcp(b"AT+JVOTG=1", b"", b"ERROR")
    (p.root / "dev/input/mouse0").write_bytes(b"")
    assert p.command(b"AT+JVOTG=1") == framed_tcp(b"AT+JVOTG=1", b"", b"OK")
    assert not (p.root / "data/getevent").exists()


def test_storage_calibration_through_vdc(tcp_phone):
    p = tcp_phone
    assert p.command(b"AT+JVSDCALI=0") == framed_tcp(b"AT+JVSDCALI=0", b'\r\n"0"\r\n', b"OK")
    # The emulated vdc makes the card report its calibrated size; the flag is then "X".
    assert p.command(b"AT+JVSDCALI=1") == framed_tcp(b"AT+JVSDCALI=1", b"", b"OK")
    assert p.command(b"AT+JVSDCALI=0") == framed_tcp(b"AT+JVSDCALI=0", b'\r\n"88"\r\n', b"OK")
    assert "vdc volume calibrate /storage/sdcard0" in (p.root / ".emu/vdc.log").read_text()
    # A second calibration finds the size unchanged.
    assert p.command(b"AT+JVSDCALI=1") == framed_tcp(b"AT+JVSDCALI=1", b"", b"ERROR")
