"""Audio commands through the real daemon on a pseudo-terminal: the audio library's calls,
the amplifier calibration in the phone's shell, the I2C check and the playback requests."""
from conftest import framed_tty


def calls(phone):
    path = phone.root / ".emu/audio/calls.log"
    return path.read_text().splitlines() if path.exists() else []


def expect(phone, line, body, word):
    assert phone.command(line) == framed_tty(line, body, word), line


def test_loop_ktv_and_speaker_sequence(usb_phone):
    p = usb_phone
    results = p.root / ".emu/audio"
    results.mkdir(parents=True, exist_ok=True)
    expect(p, b"AT+JVMT=0,1,40", b"", b"OK")
    expect(p, b"AT+JVMT=0,1", b"", b"OK")          # already running: no second start
    expect(p, b"AT+JVMT=0,0", b"", b"OK")
    expect(p, b"AT+JVKTV=1,1,5", b"", b"OK")
    expect(p, b"AT+JVKTV=1,2,7", b"", b"OK")       # stops the electric loop first
    expect(p, b"AT+JVEMTSA=1,3,2", b"", b"OK")
    expect(p, b"AT+JVMTE=1,1A", b"", b"ERROR")
    (results / "ftm_result.22").write_text("-19\n")
    expect(p, b"AT+JVXL=1", b"", b"ERROR")
    (results / "ftm_result.22").unlink()
    expect(p, b"AT+JVXL=1", b"", b"OK")
    expect(p, b"AT+JVXL=0", b"", b"OK")
    assert calls(p) == [
        "audio_ftm_process 11 1 40",
        "audio_ftm_process 11 0 100",
        "setParameters SET_LOOPBACK_TYPE=5",
        "setParameters tc-ktv-mic-volume=5",
        "audio_ftm_process 31 1 5",
        "audio_ftm_process 31 0 100",
        "setParameters SET_LOOPBACK_TYPE=0",
        "audio_ftm_process 32 1 7",
        "setParameters SET_LOOPBACK_TYPE=4",
        "setParameters tc-ktv-mic-volume=7",
        "audio_ftm_process 14 1 515",
        "audio_ftm_process 22 1 1",
        "audio_ftm_process 22 1 1",
        "audio_ftm_process 22 0 1",
        "ftm_hw_deinit",
    ]


def test_amplifier_and_i2c_on_the_template_phone(usb_phone):
    p = usb_phone
    debug = p.root / "sys/kernel/debug"
    result = p.root / "data/AmplifierCal"
    expect(p, b"AT+ZNGF=0", b"", b"OK")
    assert (debug / "tfa9890/calibrate").read_text() == "3\n"
    assert result.read_bytes() == (debug / "tfa9890/current_status").read_bytes()
    expect(p, b"AT+ZNGF=2", b"\r\n1\r\n", b"OK")
    assert result.read_text() == "reg{80}: 6\n"
    expect(p, b"AT+ZNGF=3", b"", b"OK")
    assert (debug / "tfa9890/calibrate").read_text() == "2\n"
    # The TFA98xx family on its models, and a register that reads not calibrated.
    p.set_property("ro.pemu.product.model", "QM0304A")
    (debug / "tfa98xx/codec_reg").write_text("reg{0080}: 4\n")
    expect(p, b"AT+ZNGF=2", b"\r\n0\r\n", b"OK")
    expect(p, b"AT+ZNGF=3", b"", b"OK")
    assert (debug / "tfa98xx/calibrate").read_text() == "8\n"
    expect(p, b"AT+ZNGF=1", b"", b"ERROR")
    assert '/system/bin/sh -c "echo "8" > /d/tfa98xx/calibrate"' in p.shell_log()
    # The I2C check walks the template's /d.
    expect(p, b"AT+JVAUDIO=1", b'\r\n"OK"\r\n', b"OK")
    (debug / "tfa98xx/i2c").write_text("ERROR 0x3a nack\n")
    expect(p, b"AT+JVAUDIO=1", b'\r\n"ERROR: ERROR"\r\n', b"OK")
    (debug / "tfa9890/i2c").unlink()
    (debug / "tfa9890/i2c").symlink_to("missing")
    expect(p, b"AT+JVAUDIO=1", b"", b"ERROR")


def test_tone_and_media_playback_requests(usb_phone):
    p = usb_phone
    (p.root / "storage/sdcard0/SONG.mp3").write_bytes(b"ID3")
    (p.root / "storage/sdcard1/MOVIE.mp4").write_bytes(b"\0\0\0\x18ftyp")
    player = ("am broadcast -n com.ulda.engineermode/.MediaPlayerReceiver"
              " -a kro.intent.action.MEDIA_PLAYER")
    expect(p, b"AT+JVMD=1,60", b"", b"OK")
    expect(p, b"AT+JVMD=0", b"", b"OK")
    expect(p, b"AT+JVMP=1,C:\\SONG.MP3", b"", b"OK")
    expect(p, b"AT+JVMP=1,D:\\MOVIE.MP4", b"", b"OK")
    expect(p, b"AT+JVMP=1,D:\\SONG.MP3", b"", b"ERROR")
    expect(p, b"AT+JVMP=1,E:\\A.MP3", b"", b"ERROR")
    expect(p, b"AT+JVMP=0", b"", b"OK")
    assert p.shell_log() == [
        player + " -e action start -e path /system/media/audio/ui/1KHz_tone_0dB.mp3"
                 " -e output normal --ei volume 60",
        player + " -e action stop",
        player + " -e action start -e path /sdcard/SONG.mp3 -e output normal --ei volume 60",
        "am start -n com.ulda.engineermode/.VideoFileView -a android.factorytest.PLAY_VIDEO"
        " -e video_file_path /mnt/sdcard/external_sd/MOVIE.mp4",
        '/system/bin/sh -c "input keyevent 4"',
        player + " -e action stop",
    ]
    assert (p.root / ".emu/input.log").read_text() == "input keyevent 4\n"
