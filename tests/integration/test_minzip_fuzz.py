"""Bounded libFuzzer run of the zip reader (address sanitizer on); any crash fails the test."""
import os
import shutil
import subprocess
import warnings
import zipfile
from pathlib import Path

import pytest

from minzip_archives import write_zip

REPO = Path(__file__).resolve().parents[2]
CLANG = shutil.which("clang++") or shutil.which("clang++-14")
SECONDS = int(os.environ.get("ATCID_FUZZ_SECONDS", "20"))


def _seed_corpus(directory: Path, scratch: Path):
    directory.mkdir()
    seeds = [
        [("a", b"stored", zipfile.ZIP_STORED)],
        [("b/c.txt", b"deflated text " * 40, zipfile.ZIP_DEFLATED), ("d", b"", zipfile.ZIP_STORED)],
        [("dup", b"1", zipfile.ZIP_STORED), ("dup", b"2", zipfile.ZIP_DEFLATED)],
    ]
    for i, entries in enumerate(seeds):
        with warnings.catch_warnings():
            warnings.simplefilter("ignore")
            data = write_zip(scratch / f"seed{i}.zip", entries)
        (directory / f"seed{i}").write_bytes(data)


@pytest.mark.skipif(CLANG is None, reason="clang++ with libFuzzer is not installed")
def test_fuzz_zip_reader(tmp_path):
    binary = tmp_path / "zip_fuzz"
    subprocess.run([CLANG, "-std=c++20", "-g", "-O1", "-fsanitize=fuzzer,address,undefined",
                    "-fno-sanitize-recover=undefined", f"-I{REPO}", "-o", str(binary),
                    str(REPO / "minzip" / "zip_fuzz.cpp"), str(REPO / "minzip" / "Zip.cpp"), "-lz"],
                   check=True, timeout=300)
    corpus = tmp_path / "corpus"
    _seed_corpus(corpus, tmp_path)
    run = subprocess.run([str(binary), f"-max_total_time={SECONDS}", "-max_len=8192", "-rss_limit_mb=1024",
                          "-close_fd_mask=1", "-timeout=10", f"-artifact_prefix={tmp_path}/", str(corpus)],
                         capture_output=True, timeout=SECONDS + 120, cwd=tmp_path)
    report = run.stderr.decode(errors="replace")
    assert run.returncode == 0, report[-4000:]
    assert "Done" in report and "runs in" in report, report[-2000:]
