#!/usr/bin/env python3
"""station.py PORT FOLDER: a station that takes in one handset after the other: identity, backup, verdict."""
import pathlib
import sys
import time

import kral


def take_in(phone: kral.Phone, folder: pathlib.Path) -> str:
    identity = phone.identity
    file = folder / f"{identity.serial:08X}.pkv"
    result = phone.backup(file, items=range(0, 1000))
    phone.verify(file)
    return f"{identity.model} {identity.serial:08X}: {result.done} items in {file.name}"


def main() -> int:
    port, folder = int(sys.argv[1]), pathlib.Path(sys.argv[2])
    while True:
        try:
            with kral.connect(port, wait=60) as phone:
                print("PASS", take_in(phone, folder), flush=True)
                while "--once" not in sys.argv and phone.is_connected:
                    time.sleep(0.5)  # until it is taken away
            if "--once" in sys.argv:
                return 0
        except (kral.NoAnswer, kral.NoPort):
            return 0  # nobody came within a minute
        except kral.KralError as failure:
            print("FAIL", type(failure).__name__, failure, flush=True)


sys.exit(main())
