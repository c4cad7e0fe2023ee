#!/usr/bin/env python3
"""plain_archive.py DATE ARCHIVE...: makes .zip and .tar.gz files anew, so that they tell what they hold and no more: in
the order of names, not of a disk, with DATE (seconds since 1970) on all, and nobody's name."""
import gzip
import io
import pathlib
import shutil
import sys
import tarfile
import time
import zipfile


def plain_zip(path: pathlib.Path, date: int, output: io.BufferedWriter) -> None:
    with zipfile.ZipFile(path) as old, zipfile.ZipFile(output, "w", zipfile.ZIP_DEFLATED) as new:
        for name in sorted(old.namelist()):
            entry = zipfile.ZipInfo(name, time.gmtime(date)[:6])
            entry.create_system = 3  # whose modes it has
            entry.external_attr = old.getinfo(name).external_attr
            entry.compress_type = zipfile.ZIP_STORED if entry.is_dir() else zipfile.ZIP_DEFLATED
            new.writestr(entry, old.read(name))


def plain_tar(path: pathlib.Path, date: int, output: io.BufferedWriter) -> None:
    with tarfile.open(path) as old, gzip.GzipFile("", "wb", 9, output, 0) as packed, \
            tarfile.open(fileobj=packed, mode="w", format=tarfile.GNU_FORMAT) as new:
        for entry in sorted(old.getmembers(), key=lambda each: each.name):
            entry.uid = entry.gid = 0
            entry.uname = entry.gname = "root"
            entry.mtime = date
            new.addfile(entry, old.extractfile(entry) if entry.isreg() else None)


def main() -> int:
    date = int(sys.argv[1])
    for path in map(pathlib.Path, sys.argv[2:]):
        part = path.with_name(path.name + ".part")
        with part.open("wb") as output:
            (plain_zip if path.suffix == ".zip" else plain_tar)(path, date, output)
        shutil.copymode(path, part)
        part.replace(path)
    return 0


if __name__ == "__main__":
    sys.exit(main())
