"""Requests of the caller's own and mode switches, and the exit code of everything that can become of a request."""
import contextlib
import json
import os
import re
import signal
import subprocess

import tool
from tool import PATIENCE, ToolTest, clean_environment, holds, start, wait_until


class Requests(ToolTest):
    def test_raw_shows_the_reply_as_it_came(self):
        with self.handset("--switches", "0x1234"):
            self.assertEqual(self.text("raw", "2F").split()[:4], ["0000", "2F", "34", "12"])
            for words in (["30", "78", "56"], ["307856"], ["0x30,0x78,0x56"]):
                self.assertEqual(self.ask(0, "raw", *words)["request"], "30 78 56")
            self.assertEqual(self.ask(0, "raw", "2f")["reply"], "2F 78 56")

    def test_modes_are_switched_and_read_back(self):
        with self.handset():
            self.assertEqual(self.text("mode", "get"), "online\n")
            for mode in ("ftm", "lpm", "online"):
                self.assertEqual(self.ask(0, "mode", mode)["mode"], mode)
                self.assertEqual(self.text("mode", "get"), f"{mode}\n")


class Failures(ToolTest):
    @contextlib.contextmanager
    def tool_waiting_for_an_answer(self, *options):
        """The tool, with the request 7C sent and its answer outstanding."""
        log = self.path("log")
        process = start("-p", "7", "--time-out", "2000", "--log", log, "raw", "7C", *options, ports=self.ports)
        try:
            wait_until(lambda: process.poll() is not None or holds(log, "SEND (1 bytes):7C"))
            yield process
        finally:
            if process.poll() is None:
                process.kill()
                process.communicate()

    def test_each_has_its_code_and_text(self):
        for fault, words, code, text, hint, status, reply in (
                ("ignore", ["info"], 5, "COM7", "", None, ""),
                ("corrupt", ["info"], 6, "frames came with a wrong check", "cable", None, ""),
                ("wrong=153", ["info"], 6, "a reply of 153", "other program", {"kind": "reply", "value": 153}, ""),
                ("lose,of=7C", ["--time-out", "300", "raw", "7C"], 5, "no answer to command 124 within 300 ms",
                 "still answers", None, ""),
                ("refuse=24,of=29", ["raw", "29 05 00"], 7, "not in the present operating mode", "kral mode ftm",
                 {"kind": "refusal", "value": 24}, "18"),
                ("wrong=0x55,of=7C", ["raw", "7C"], 6, "a reply of 85", "other program",
                 {"kind": "reply", "value": 0x55}, "55")):
            with self.subTest(fault=fault), self.handset("--fault", fault):
                answer = self.ask(code, *words)
                error = answer["error"]
                self.assertIn(text, error["text"])
                self.assertIn("COM7", error["text"])
                self.assertIn(hint, error["hint"])
                self.assertEqual(error.get("status"), status)
                self.assertEqual(error["function"], "KRAL_SendSync" if "raw" in words else "KRAL_IsPhoneConnected")
                self.assertIn(reply, answer.get("reply", "")[:2])

    def test_what_the_library_refuses_is_a_mistake_and_names_number_and_range(self):
        with self.handset():
            self.ask(0, "mode", "ftm")
            for words, text, function in (
                    (("ftm", "mode", "9999"), "RF mode 9999 is not one of the listed modes, 2 to 92",
                     "KRAL_FTM_SET_MODE"),
                    (("log", "on", "0x1FFF"), "log code 0x1FFF is not one of equipment id 1, 0x1000 to 0x1",
                     "KRAL_DIAG_AddExtendedLogCodes"),
                    (("event", "on", "4000"), "event 4000 is not one of the handset's, 0 to ",
                     "KRAL_DIAG_SetEventMaskBits")):
                with self.subTest(words=words):
                    error = self.ask(2, *words)["error"]
                    self.assertIn(text, error["text"])
                    self.assertEqual(error["function"], function)

    def test_handset_that_vanishes_is_lost(self):
        with self.plugged_handset("--fault", "lose,of=7C") as sim, self.tool_waiting_for_an_answer() as process:
            self.unplug(sim)
            _, err = process.communicate(timeout=PATIENCE)
            self.assertEqual(process.returncode, 9, err)

    def test_handset_that_comes_back_is_served_again(self):
        link = self.path("port")
        with self.handset("--fault", "hang-up,nth=1,of=7C", "--back-after", "300", "--link", link):
            self.ports = {7: link}
            self.ask(9, "--time-out", "200", "raw", "7C")
            wait_until(lambda: os.path.lexists(link))
            self.ask(0, "raw", "7C")

    def test_mistakes_on_the_command_line_are_usage(self):
        for words in (["frobnicate"], ["info", "--frobnicate"], [], ["raw", "4B0"], ["raw", "xyz"],
                      ["-p", "seven", "info"], ["mode", "sideways"], ["--time-out", "0", "info"],
                      ["sim", "--fault", "frobnicate"]):
            with self.subTest(words=words):
                self.expect_json(2, *words)

    def test_mistakes_are_named_with_what_would_be_right(self):
        for words, text in (
                (["bogus"], "there is no verb bogus; did you mean boot?"),
                (["--json", "-p", "7", "nv", "raed", "1"], "there is no verb nv raed; did you mean nv read?"),
                (["info", "--tiem-out", "5"], "kral info has no option --tiem-out; did you mean --time-out?"),
                (["nv"], "kral nv needs a verb: read, write,"),
                (["flash", "load"], "kral flash load: programmer is required"),
                (["fs", "mv", "a"], "kral fs mv: paths needs 2 values"),
                (["-p", "7", "-p", "8", "info"], "kral info: --port is given too often"),
                (["info", "me"], "kral info takes no 'me'"),
                (["info", "--time-out", "0"], "--time-out takes a number from 1 to 3600000 ms, not '0'"),
                (["band", "ul", "gsm", "x"], "channel takes a number from"),
                (["band", "ul", "tetra", "1"], "there is no band tetra"),
                (["band", "ul", "gsm900", "4000"], "no band gsm900 has channel 4000"),
                (["ftm", "tx", "up"], "state cannot be 'up': it is on or off")):
            with self.subTest(words=words):
                self.assertIn(text, self.expect_json(2, *words)["error"]["text"])

    def test_a_band_has_an_id_and_a_name(self):
        self.assertEqual(self.expect(0, "band", "ul", "gsm900", "62").out, self.expect(0, "band", "ul", "1", "62").out)

    def verbs_of(self, *words):
        """Every verb below these words, with its help."""
        page = self.expect(0, "help", *words).out
        self.assertEqual(page, self.expect(0, *words, "--help").out)
        answer = self.expect_json(0, "help", *words)
        self.assertEqual(answer, self.expect_json(0, *words, "--help"))
        for text in (*(each["names"] for each in answer["options"]), *(each["name"] for each in answer["verbs"]),
                     *answer["examples"]):
            self.assertIn(text, page)
        below = re.findall(r"(?m)^  (\S+)", page.partition("Subcommands:\n")[2].partition("\n\n")[0])
        if not below or "\nExamples:" in page:
            yield words, page
        for name in below:
            yield from self.verbs_of(*words, name)

    def test_help_of_every_verb_has_an_example_and_ranges_without_types(self):
        pages = dict(self.verbs_of())
        self.assertGreater(len(pages), 50)
        for words, page in pages.items():
            with self.subTest(words=words):
                self.assertRegex(page, rf"\n  kral (-\S+ (\d+ )?)*{' '.join(words)}\b")
                self.assertNotRegex(page, r" in \[|INT|FLOAT|:\{|Usage:.*\(\d+x\)|\n\nPositionals:\n  paths ")
        self.assertIn("\nUsage: kral fs put [OPTIONS] LOCAL... :PATH\n", pages["fs", "put"])
        self.expect(0, "help", "--man", self.path("."))
        self.assertIn(b"\\fBfs put\\fR [\\fIOPTION\\fR]... \\fILOCAL... :PATH\\fR\n", self.content("kral-fs.1"))
        for words, page in pages.items():
            with self.subTest(manual=words), open(self.path(f"kral-{words[0]}.1"), encoding="utf-8") as file:
                manual = file.read().replace("\\-", "-").replace("\\&", "")
                options = page.partition("Options:")[2].partition("\n\n")[0]
                for about in re.findall(r"(?m)^(?:  -[^h].*| +)  (\S.*)$", options):
                    self.assertIn(f"\n{about.rstrip('.')}.\n", manual)
        self.expect(10, "help", "--man", self.path("nowhere"))
        self.assertIn("--time-out 1-3600000 ms", self.expect(0, "help").out)
        self.assertEqual(self.expect_json(0, "--version")["version"] + "\n", self.expect(0, "--version").out)

    def test_result_that_cannot_be_written_is_not_a_success(self):
        with self.handset(), open("/dev/full", "w", encoding="ascii") as full:
            done = subprocess.run([tool.KRAL, "-p", "7", "info"], env=clean_environment(self.ports), stdout=full,
                                  stderr=subprocess.PIPE, text=True, timeout=PATIENCE, check=False)
        self.assertEqual(done.returncode, 1, done.stderr)

    def test_interrupted_verb_disconnects_and_says_so(self):
        with self.handset("--fault", "lose,of=7C"), self.tool_waiting_for_an_answer("--json") as process:
            process.send_signal(signal.SIGINT)
            out, _ = process.communicate(timeout=PATIENCE)
            self.assertEqual((process.returncode, json.loads(out)["error"]["name"]), (130, "interrupted"))
