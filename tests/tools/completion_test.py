"""What a shell is told of a line that is being typed, and the script that asks for it."""
import os
import subprocess
import unittest.mock

import tool
from tool import ToolTest

TREE = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
EXAMPLE = os.path.join(TREE, "examples", "commands.xml")


class Completion(ToolTest):
    def completed(self, *words):
        lines = self.expect(0, "__complete", *words).out.splitlines()
        return [line.split("\t")[0] for line in lines]

    def test_words_are_completed_as_the_command_line_takes_them(self):
        defs = ("--defs", EXAMPLE)
        for words, wanted in (
                (("lo",), ["log"]), (("-p", "7", "lo"), ["log"]), (("nothing", "lo"), ["log"]), (("log", "x"), []),
                (("log", "capture", "--rot"), ["--rotate"]), (("log", "capture", "--js"), ["--json"]),
                (("log", "play", ""), [":files"]), (("--time-out", ""), []), (("--", "lo"), ["log"]),
                (("flash", "write", "--format", "h"), ["hex"]), (("flash", "write", "--format=h"), ["--format=hex"]),
                (("help", "nv", "ba"), ["backup"]), (("completion", ""), ["bash", "zsh", "fish"]),
                (("cmd", "call", *defs, "SE"), ["SENSOR.READ"]),
                (("cmd", "show", f"--defs={EXAMPLE}", "SE"), ["SENSOR.READ"]),
                (("cmd", "call", *defs, "SENSOR.READ", ""), ["sensor=", "kind=", "limit="]),
                (("cmd", "call", "SENSOR.READ", "sensor=1", *defs, "k"), ["kind="]),
                (("cmd", "call", *defs, "WLAN.TX_START", "rate=5"), ["rate=54M"]),
                (("cmd", "call", *defs, "WLAN.SET_TABLE", "c"), []),  # follows from what it counts
                (("cmd", "call", *defs, "WLAN.TX_START", "--rf"), ["--rf-mode"])):
            with self.subTest(words=words):
                self.assertEqual(self.completed(*words), wanted)
        self.assertEqual(self.expect(2, "__complete", "cmd", "call", "--defs", "/nonexistent", "").err, "")
        for noun in self.completed(""):
            for verb in self.completed(noun, "") if noun not in ("help", "completion") else ():
                if verb != ":files":
                    options = self.completed(noun, verb, "--")
                    self.assertIn("--json", options, (noun, verb))
                    self.assertEqual(sorted(set(options)), sorted(options), (noun, verb))

    def test_ports_are_those_that_are_there(self):
        self.ports = {207: "/dev/null", 217: "/dev/zero"}
        with unittest.mock.patch.dict(tool.EXTRA_ENVIRONMENT, {"KRAL_SLOTS": self.add("slots", b"3 /dev/ttyUSB0\n")}):
            for words, wanted in (
                    (("-p", "20"), ["207"]), (("info", "--port", "207,21"), ["207,217"]),
                    (("info", "--port=21"), ["--port=217"]), (("-p", "/dev/z"), ["/dev/zero"]),
                    (("-p", "s"), ["slot:3"]), (("-p", "207,s"), ["207,slot:3"])):
                with self.subTest(words=words):
                    self.assertEqual(self.completed(*words), wanted)
            self.assertEqual(self.expect(0, "__complete", "-p", "207").out, "207\t/dev/null\n")

    def test_bash_completes(self):
        script = self.add("kral.bash", self.expect(0, "completion", "bash").out.encode())
        for line, words, wanted in (
                ("kral log ca", ["kral", "log", "ca"], ["capture"]),
                ("kral log capture --keep", ["kral", "log", "capture", "--keep"], ["--keep"]),
                (f"kral cmd call --defs {EXAMPLE} WLAN.TX_START rate=1",
                 ["kral", "cmd", "call", "--defs", EXAMPLE, "WLAN.TX_START", "rate", "=", "1"], ["1M", "11M"]),
                (f"kral log play {self.folder}/kr", ["kral", "log", "play", self.folder + "/kr"], [script])):
            typed = " ".join(f"'{word}'" for word in words)
            done = subprocess.run(
                ["bash", "-c", f"PATH=$1:$PATH; . {script}; COMP_LINE='{line}' COMP_POINT={len(line)} "
                 f"COMP_WORDS=({typed}) COMP_CWORD={len(words) - 1}; _kral; printf '%s\\n' \"${{COMPREPLY[@]}}\"", "bash",
                 os.path.dirname(tool.KRAL)], capture_output=True, text=True, timeout=tool.PATIENCE, check=False)
            self.assertEqual((done.stdout.split(), done.stderr), (wanted, ""), line)
