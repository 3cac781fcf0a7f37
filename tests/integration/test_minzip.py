"""The zip reader through atcid-unzip: extraction, the index it builds, and every refusal."""
import os
import random
import struct
import subprocess
import warnings
import zipfile
from pathlib import Path

import pytest

from minzip_archives import (CD_CSIZE, CD_LOCAL, CD_MADE_BY, CD_METHOD, CD_NAME_LEN, CD_USIZE,
                             Layout, patch, write_zip)

REPO = Path(__file__).resolve().parents[2]
UNZIP = os.environ.get("ATCID_UNZIP") or str(REPO / "build" / "minzip" / "atcid-unzip")
STORED, DEFLATED = zipfile.ZIP_STORED, zipfile.ZIP_DEFLATED


class Extracted:
    """What atcid-unzip ARCHIVE ENTRY OUTFILE left: exit status, the file (None if not
    written) and the reader's messages (its standard output)."""

    def __init__(self, archive, name):
        out = Path(archive).parent / "extracted.out"
        out.unlink(missing_ok=True)
        run = subprocess.run([UNZIP, str(archive), name, str(out)], capture_output=True, timeout=120)
        self.returncode = run.returncode
        self.messages = run.stdout.decode()
        self.data = out.read_bytes() if out.exists() else None


def listing(archive):
    """atcid-unzip -l: the index lines, or the reader's messages when the archive is refused."""
    return subprocess.run([UNZIP, "-l", str(archive)], capture_output=True, timeout=120)


def payload(size: int, seed: int) -> bytes:
    rng = random.Random(seed)
    # Half text (compresses), half noise (does not), so deflate makes both kinds of blocks.
    text = (b"factory line %d\n" * (size // 16 + 1))[: size // 2]
    return text + rng.randbytes(size - len(text))


SIZES = [0, 1, 100, 32767, 32768, 32769, 65536, 3 * 32768 + 5, 1 << 20]


@pytest.mark.parametrize("method", [STORED, DEFLATED])
def test_extracts_every_size_byte_for_byte(tmp_path, method):
    entries = [(f"dir/f{size}.bin", payload(size, size), method) for size in SIZES]
    archive = tmp_path / "a.zip"
    write_zip(archive, entries)
    for name, data, _ in entries:
        got = Extracted(archive, name)
        assert (got.returncode, got.messages, got.data) == (0, "", data), name


def test_info_zip_archives(tmp_path):
    src = tmp_path / "src"
    src.mkdir()
    files = {"a.txt": b"alpha\n" * 5000, "sub/b.bin": payload(70000, 7), "empty": b""}
    for name, data in files.items():
        (src / name).parent.mkdir(parents=True, exist_ok=True)
        (src / name).write_bytes(data)
    for flags in (["-q"], ["-q", "-0"], ["-q", "-9"]):
        archive = tmp_path / f"z{len(flags)}{flags[-1]}.zip"
        subprocess.run(["zip", *flags, "-r", str(archive), *files], cwd=src, check=True)
        for name, data in files.items():
            got = Extracted(archive, name)
            assert (got.returncode, got.messages, got.data) == (0, "", data), (flags, name)
    # Streamed from a pipe: sizes only in the data descriptor and the central directory.
    streamed = tmp_path / "streamed.zip"
    subprocess.run(["zip", "-q", str(streamed), "-"], input=files["a.txt"], check=True)
    assert Extracted(streamed, "-").data == files["a.txt"]


def test_listing_matches_central_directory(tmp_path):
    archive = tmp_path / "a.zip"
    unix = zipfile.ZipInfo("x/unix.sh", (1999, 12, 31, 23, 59, 58))
    unix.create_system, unix.external_attr = 3, 0o100755 << 16
    dos = zipfile.ZipInfo("DOS.TXT", (1985, 1, 2, 3, 4, 6))
    dos.create_system, dos.external_attr, dos.extra = 0, 0x20, b"\x99\x99\x04\x00abcd"
    data = write_zip(archive, [("zzz", b"z" * 999, DEFLATED), (unix, b"#!/bin/sh\n", STORED),
                               (dos, b"dos" * 50, DEFLATED), ("a b~!", b"", STORED)],
                     comment=b"an archive comment PK")
    layout = Layout(data[: data.rindex(b"PK\x05\x06") + 22])
    with zipfile.ZipFile(archive) as zf:
        infos = zf.infolist()
    expected = []
    for i, info in enumerate(infos):
        date_time = info.date_time
        dos_time = (date_time[3] << 11 | date_time[4] << 5 | date_time[5] // 2)
        dos_date = ((date_time[0] - 1980) << 9 | date_time[1] << 5 | date_time[2])
        made_by = info.create_system << 8 | info.create_version
        expected.append(f"{info.compress_type} {info.compress_size} {info.file_size} {info.CRC:08x} "
                        f"{dos_date << 16 | dos_time:08x} {made_by:04x} {info.external_attr:08x} "
                        f"{layout.data_offset(data, i)} {info.filename}")
    expected.sort(key=lambda line: line.split(" ", 8)[8].encode())
    got = listing(archive)
    assert got.returncode == 0
    assert got.stdout.decode().splitlines() == expected


def test_directory_of_megabytes_out_of_order_with_duplicates(tmp_path):
    # Over a megabyte of entry records takes the reader's large-block path; the names listed
    # last sort first, so the array and the hashes kept beside it both move under the index.
    names = [f"d/{i:06d}" for i in range(27_000)] + ["b/late", "a/dup", "c/late", "a/dup", "a/dup"]
    archive = tmp_path / "large.zip"
    with pytest.warns(UserWarning), zipfile.ZipFile(archive, "w") as zf:
        for i, name in enumerate(names):
            zf.writestr(name, f"{i}")
    got = listing(archive)
    lines = got.stdout.decode().splitlines()
    assert lines[:2] == ["minzip: WARNING: duplicate entry 'a/dup' in Zip"] * 2
    assert [line.split(" ", 8)[8] for line in lines[2:]] == sorted(names)
    for name, index in (("a/dup", 27_001), ("c/late", 27_002), ("d/000000", 0), ("d/026999", 26_999)):
        assert Extracted(archive, name).data == str(index).encode(), name


def _ordered_names(order):
    """Names of 1 to 4,095 bytes, so long names cross any reading boundary."""
    rng = random.Random(order)
    names = sorted({"n/" + "".join(rng.choice("abcXYZ019 -_.~") for _ in range(rng.choice((1, 30, 900, 4093))))
                    for _ in range(150)})
    if order == "ascending":
        return names[:40] + [names[40]] * 3 + names[41:]  # duplicates side by side
    if order == "descending":
        return names[::-1]
    if order == "descending_but_one":  # one pair out of order sends it to the sort
        return names[::-1][:100] + [names[0]] + names[::-1][100:]
    if order == "descending_with_duplicates":  # equal names keep their order: no plain reversal
        falling = names[::-1]
        return falling[:60] + [falling[59]] * 2 + falling[60:]
    rng.shuffle(names)
    return names + names[:2]


@pytest.mark.parametrize("order", ["ascending", "descending", "descending_but_one",
                                   "descending_with_duplicates", "random"])
def test_any_order_of_names_lists_sorted_and_finds_the_first(tmp_path, order):
    names = _ordered_names(order)
    archive = tmp_path / "ordered.zip"
    with warnings.catch_warnings():
        warnings.simplefilter("ignore")
        write_zip(archive, [(n, f"{i}:{n[:20]}".encode(), DEFLATED if i % 2 else STORED)
                            for i, n in enumerate(names)])
    first = {}
    for i, name in enumerate(names):
        first.setdefault(name, i)
    got = listing(archive)
    assert got.returncode == 0
    lines = got.stdout.decode().splitlines()
    repeats = sorted((n for i, n in enumerate(names) if first[n] != i))
    assert lines[:len(repeats)] == [f"minzip: WARNING: duplicate entry '{n}' in Zip" for n in repeats]
    listed = [line.split(" ", 8)[8] for line in lines[len(repeats):]]
    assert listed == sorted(names, key=str.encode)
    # Equal names keep the directory's order: the first one written is listed, and found, first.
    layout = Layout(archive.read_bytes())
    offsets = [int(line.split(" ", 8)[7]) for line in lines[len(repeats):]]
    by_name = sorted(range(len(names)), key=lambda i: (names[i].encode(), i))
    assert offsets == [layout.data_offset(archive.read_bytes(), i) for i in by_name]
    for name in (names[0], names[-1], *rng_sample(names, 12, order)):
        got = Extracted(archive, name)
        assert (got.returncode, got.data) == (0, f"{first[name]}:{name[:20]}".encode()), name[:40]
    for miss in (names[0] + "~", names[0][:-1], "m"):
        if miss not in first:
            assert Extracted(archive, miss).returncode == 1


def rng_sample(names, count, seed):
    return random.Random(seed).sample(names, count)


def test_duplicate_names_keep_the_first(tmp_path):
    archive = tmp_path / "dup.zip"
    with pytest.warns(UserWarning):
        write_zip(archive, [("same", b"first", STORED), ("other", b"o", STORED), ("same", b"second", DEFLATED)])
    got = Extracted(archive, "same")
    assert (got.returncode, got.data) == (0, b"first")
    assert got.messages == "minzip: WARNING: duplicate entry 'same' in Zip\n"


def _base(tmp_path, entries=None):
    entries = entries or [("first.txt", b"one " * 100, DEFLATED), ("second.bin", b"two" * 30, STORED)]
    data = write_zip(tmp_path / "base.zip", entries)
    return data, Layout(data)


def _bad_open_cases(tmp_path):
    """(id, archive bytes, expected messages) for archives that fail to open."""
    data, lay = _base(tmp_path)
    cd0, cd1, size = lay.central[0], lay.central[1], len(data)
    empty = write_zip(tmp_path / "empty.zip", [])
    long_name = write_zip(tmp_path / "long.zip", [("n" * 4096, b"x", STORED)])
    cases = [
        ("shorter than an end record", data[:21], ""),
        ("only an end record", empty, "minzip: Found Zip archive, but it looks empty\n"),
        ("not a zip", b"MZ" + data[2:], ""),
        ("end record missing", data[:lay.eocd] + b"XK\x05\x06" + data[lay.eocd + 4:],
         "minzip: Could not find end-of-central-directory in Zip\n"),
        ("zero entries", patch(data, lay.eocd + 8, "<H", 0),
         f"minzip: Invalid entries=0 offset={lay.cd} (len={size})\n"),
        ("directory offset at the end", patch(data, lay.eocd + 16, "<I", size),
         f"minzip: Invalid entries=2 offset={size} (len={size})\n"),
        ("more entries than written", patch(data, lay.eocd + 8, "<H", 3),
         f"minzip: Ran off the end (at {lay.eocd})\n"),
        ("central signature", patch(data, cd1, "<I", 0x02014b51),
         f"minzip: Missed a central dir sig (at {cd1})\n"),
        ("name past the end", patch(data, cd1 + CD_NAME_LEN, "<H", 0xFFFF),
         f"minzip: Filename ran off the end (at {cd1})\n"),
        ("name of 4096 bytes", long_name,
         f"minzip: Filename too long (4096 chatacters)\nminzip: Invalid filename (at {Layout(long_name).cd})\n"),
        ("made by VMS", patch(data, cd0 + CD_MADE_BY, "<H", 0x0214),
         f"minzip: Incompatible \"version made by\": 0x02 (at {cd0})\n"),
        ("made by NTFS", patch(data, cd1 + CD_MADE_BY, "<H", 0x0a3f),
         f"minzip: Incompatible \"version made by\": 0x0a (at {cd1})\n"),
        ("local header past the end", patch(data, cd1 + CD_LOCAL, "<I", size - 29),
         f"minzip: Bad offset to local header: {size - 29} (at {cd1})\n"),
        ("local signature", patch(data, lay.local[1], "<I", 0x04034b55),
         f"minzip: Missed a local header sig (at {cd1})\n"),
        ("data past the end", patch(data, cd0 + CD_CSIZE, "<I", size),
         f"minzip: Data ran off the end (at {cd0})\n"),
    ]
    for char, octal, bad_name in ((b"\x7f", "177", b"second\x7fbin"), (b"\x1f", "037", b"second\x1fbin"),
                                  (b"\xc3", "303", b"second\xc3bin"), (b"\x01", "001", b"second.bi\x01")):
        bad = data.replace(b"second.bin", bad_name)
        cases.append((f"name byte {octal}", bad,
                      f"minzip: Filename contains invalid character '{octal}'\n"
                      f"minzip: Invalid filename (at {cd1})\n"))
    return cases


def test_bad_archives_are_refused_with_their_message(tmp_path):
    for case, data, message in _bad_open_cases(tmp_path):
        archive = tmp_path / "bad.zip"
        archive.write_bytes(data)
        got = listing(archive)
        assert (got.returncode, got.stdout.decode()) == (1, message), case


def test_longest_valid_name_is_accepted(tmp_path):
    archive = tmp_path / "long.zip"
    write_zip(archive, [("n" * 4095, b"ok", STORED)])
    assert Extracted(archive, "n" * 4095).data == b"ok"


def test_bad_entries_fail_extraction_with_their_message(tmp_path):
    text = b"line of the version file\n" * 2000
    data, lay = _base(tmp_path, [("d", text, DEFLATED), ("s", b"stored bytes", STORED)])
    cd_d, cd_s = lay.central
    csize = struct.unpack_from("<I", data, cd_d + CD_CSIZE)[0]
    bad_block = patch(data, lay.data_offset(data, 0), "<B", 0x07)
    fail = "minzip: Can't extract entry to memory buffer.\n"
    cases = [
        ("d", patch(data, cd_d + CD_USIZE, "<I", len(text) + 1),
         f"minzip: Size mismatch on inflated file ({len(text)} vs {len(text) + 1})\n" + fail),
        ("d", patch(data, cd_d + CD_USIZE, "<I", len(text) - 1),
         "minzip: Process function elected to fail (in inflate)\n" + fail),
        ("d", patch(data, cd_d + CD_CSIZE, "<I", csize // 2), "minzip: zlib inflate call failed (zerr=-5)\n" + fail),
        ("d", bad_block, "minzip: zlib inflate call failed (zerr=-3)\n" + fail),
        ("d", patch(data, cd_d + CD_METHOD, "<H", 12), "minzip: Unsupported compression type 12 for entry 'd'\n" + fail),
        ("s", patch(data, cd_s + CD_USIZE, "<I", 0x7FFFFFF0), fail),
    ]
    for name, bad, message in cases:
        archive = tmp_path / "bad.zip"
        archive.write_bytes(bad)
        got = Extracted(archive, name)
        assert (got.returncode, got.data, got.messages) == (1, None, message), message
    archive.write_bytes(data)
    assert Extracted(archive, "d").data == text
    assert Extracted(archive, "s").data == b"stored bytes"


def test_unopenable_and_empty_files(tmp_path):
    missing, empty = tmp_path / "missing.zip", tmp_path / "empty.zip"
    empty.write_bytes(b"")
    got = Extracted(missing, "x")
    assert (got.returncode, got.data) == (1, None)
    assert got.messages == (f"sysutil: Unable to open '{missing}': No such file or directory\n"
                                   f"sysutil: Map of '{missing}' failed\n")
    got = Extracted(empty, "x")
    assert got.messages == f"sysutil: file is empty\nsysutil: Map of '{empty}' failed\n"
    assert subprocess.run([UNZIP, "-l"], capture_output=True).returncode == 2
