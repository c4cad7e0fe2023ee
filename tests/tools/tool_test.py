#!/usr/bin/env python3
"""The built tool against the handset it simulates, each in a process of its own, joined by a pseudo terminal.

usage: tool_test.py KRAL MODULE|MODULE.CLASS|MODULE.CLASS.TEST... The last line is "kral_tool: N passed, M failed".
"""
import os
import sys

sys.dont_write_bytecode = True  # nothing is left in the tree

import tool


if __name__ == "__main__":
    tool.KRAL = os.path.abspath(sys.argv[1])
    tool.run_tests("kral_tool", sys.argv[2:], module=None)
