"""Zip archives for the zip reader's tests: written with zipfile, then patched at known offsets."""
import struct
import zipfile
from pathlib import Path

EOCD_SIG = b"PK\x05\x06"


def write_zip(path: Path, entries, comment: bytes = b"") -> bytes:
    """entries: (name, data, method) or ZipInfo-with-data pairs; returns the archive bytes."""
    with zipfile.ZipFile(path, "w") as zf:
        zf.comment = comment
        for name, data, method in entries:
            info = name if isinstance(name, zipfile.ZipInfo) else zipfile.ZipInfo(name, (2020, 5, 17, 10, 30, 12))
            info.compress_type = method
            zf.writestr(info, data)
    return path.read_bytes()


class Layout:
    """Positions of the records of an archive without an archive comment."""

    def __init__(self, data: bytes):
        self.eocd = data.rindex(EOCD_SIG)
        self.count = struct.unpack_from("<H", data, self.eocd + 8)[0]
        self.cd = struct.unpack_from("<I", data, self.eocd + 16)[0]
        self.central = []
        pos = self.cd
        for _ in range(self.count):
            self.central.append(pos)
            n, e, c = struct.unpack_from("<HHH", data, pos + 28)
            pos += 46 + n + e + c
        self.local = [struct.unpack_from("<I", data, p + 42)[0] for p in self.central]

    def data_offset(self, data: bytes, i: int) -> int:
        local = self.local[i]
        n, e = struct.unpack_from("<HH", data, local + 26)
        return local + 30 + n + e


def patch(data: bytes, pos: int, fmt: str, value) -> bytes:
    out = bytearray(data)
    struct.pack_into(fmt, out, pos, value)
    return bytes(out)


# Central directory fields, as offsets into a central entry.
CD_MADE_BY, CD_METHOD, CD_CSIZE, CD_USIZE, CD_NAME_LEN, CD_LOCAL = 4, 10, 20, 24, 28, 42
