#!/usr/bin/env python3
"""calibrate.py PORT [PLOT.png]: finds, for three WCDMA channels, the power setting at which the handset's own detector
reads a target, and draws how it got there: with matplotlib into a file, without it in text."""
import struct
import sys
from typing import Dict, List, Tuple

import kral

TARGET, TOLERANCE = 3000, 2
Steps = List[Tuple[float, int]]


def calibrate(phone: kral.Phone, channel: int) -> Steps:
    """The detector rises with the power, so the setting is found by halving the range. The last step is the result."""
    phone.ftm.set_channel(channel)
    low, high, steps = -5000, 2400, []
    while low <= high:
        power = (low + high) // 2
        phone.ftm.send("SET_TX_POWER_DBM", struct.pack("<h", power))
        detector, = struct.unpack_from("<H", phone.ftm.send("GET_HDET_FROM_TX_SWEEP_CAL"))
        steps.append((power / 100, detector))
        if abs(detector - TARGET) <= TOLERANCE:
            return steps
        low, high = (power + 1, high) if detector < TARGET else (low, power - 1)
    raise RuntimeError(f"channel {channel}: no power setting reaches the target")


def draw(found: Dict[int, Steps], file: str) -> None:
    try:
        import matplotlib
        matplotlib.use("Agg")
        from matplotlib import pyplot
    except ImportError:
        for channel, steps in found.items():
            for power, detector in steps:
                print(f"{channel:6} {power:7.2f} dBm {detector:6} |{'#' * (detector * 50 // 6000)}")
        return
    for channel, steps in found.items():
        pyplot.plot(*zip(*steps), "o-", label=f"channel {channel}")
    pyplot.axhline(TARGET, linestyle=":")
    pyplot.xlabel("power, dBm")
    pyplot.ylabel("detector")
    pyplot.legend()
    pyplot.savefig(file)
    print(f"drawn into {file}")


def main() -> None:
    found = {}
    with kral.connect(int(sys.argv[1])) as phone, phone.ftm.active() as ftm:
        ftm.set_rf_mode(kral.RfMode.WCDMA)
        ftm.tx_on()
        for channel in (9612, 9750, 9888):
            found[channel] = calibrate(phone, channel)
            power, detector = found[channel][-1]
            print(f"channel {channel}  power {power:7.2f} dBm  detector {detector}")
    draw(found, sys.argv[2] if len(sys.argv) > 2 else "calibration.png")


main()
