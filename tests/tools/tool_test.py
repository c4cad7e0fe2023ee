#!/usr/bin/env python3
"""The built tool against the handset it simulates, each in a process of its own, joined by a pseudo terminal.

usage: tool_test.py KRAL MODULE|MODULE.CLASS|MODULE.CLASS.TEST... The last line is "kral_tool: N passed, M failed".
"""
import os
import sys
import unittest

sys.dont_write_bytecode = True  # nothing is left in the tree

import tool


class Counting(unittest.TextTestResult):
    passed = 0

    def addSuccess(self, test):
        super().addSuccess(test)
        self.passed += 1


if __name__ == "__main__":
    tool.KRAL = os.path.abspath(sys.argv[1])
    suite = unittest.main(module=None, argv=[sys.argv[0], *sys.argv[2:]], exit=False,
                          testRunner=unittest.TextTestRunner(resultclass=Counting, verbosity=1))
    bad = len(suite.result.failures) + len(suite.result.errors)
    print(f"kral_tool: {suite.result.passed} passed, {bad} failed")
    sys.exit(0 if suite.result.passed > 0 and bad == 0 else 1)
