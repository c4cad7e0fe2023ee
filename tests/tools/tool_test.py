#!/usr/bin/env python3
"""The built tool against the handset it simulates, each in a process of its own, joined by a pseudo terminal.

usage: tool_test.py KRAL [unittest arguments]. The last line is "kral_tool: N passed, M failed".
"""
import os
import sys
import unittest

sys.dont_write_bytecode = True  # nothing is left in the tree

import tool
from flash_test import BootLoader, Flash
from fs_test import Files
from info_test import Info, Ports
from log_test import Traffic
from many_test import ManyHandsets
from nv_test import Backups, NvItems
from raw_test import Failures, Requests
from sim_test import Simulation


class Counting(unittest.TextTestResult):
    passed = 0

    def addSuccess(self, test):
        super().addSuccess(test)
        self.passed += 1


if __name__ == "__main__":
    tool.KRAL = os.path.abspath(sys.argv[1])
    suite = unittest.main(argv=[sys.argv[0], *sys.argv[2:]], exit=False,
                          testRunner=unittest.TextTestRunner(resultclass=Counting, verbosity=1))
    bad = len(suite.result.failures) + len(suite.result.errors)
    print(f"kral_tool: {suite.result.passed} passed, {bad} failed")
    sys.exit(0 if suite.result.passed > 0 and bad == 0 else 1)
