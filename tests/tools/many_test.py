"""One verb on several handsets: who they are, what becomes of each, and the one verdict."""
import fcntl
import json
import os
import pty
import re
import signal
import struct
import subprocess
import termios

import nv_test
import tool
from cmd_test import EXAMPLE as COMMANDS
from flash_test import BootLoader
from tool import PATIENCE, ToolTest, clean_environment, command, fixture, start, wait_until


class ManyHandsets(ToolTest):
    def fixture(self, count, *options):
        return fixture(count, self.path("ports"), "--esn", "0x10", *options)

    def verdicts(self, code, *words):
        """The code of each handset by port; the whole agrees with them."""
        answer = self.expect_json(code, *words)
        return {row["port"]: 0 if row["ok"] else row["error"]["code"] for row in answer["handsets"]}

    def test_each_handset_has_a_verdict_and_all_have_one(self):
        with self.fixture(4, "--fault-at", "3:refuse=24,of=4B 0F", "--fault-at", "4:ignore") as (sim, self.ports):
            answer = self.expect_json(0, "-p", "2,1", "info")
            self.assertEqual([[row[name] for name in ("port", "serial", "model", "esn", "mode")]
                              for row in answer["handsets"]],
                             [[2, "00000011", "VH-1", "00000011", "online"],
                              [1, "00000010", "VH-1", "00000010", "online"]])
            self.assertEqual(self.verdicts(12, "-p", "1-4", "mode", "get"), {1: 0, 2: 0, 3: 7, 4: 5})
            self.assertEqual(self.verdicts(0, "--all", "--jobs", "1", "nv", "write", "10", "0A"), {1: 0, 2: 0, 3: 0})
            done = self.expect(12, "-p", "1-3", "mode", "get")
            self.assertEqual(done.out, "COM1: online\nCOM2: online\n")
            self.assertRegex(done.err, r"(?m)^COM1 +00000010 .* passed$")
            self.assertRegex(done.err, r"(?m)^COM3 +00000012 .* FAILED: .*not in the present operating mode$")
            self.assertIn("1 of 3 handsets failed: COM3", done.err)
            # One that answers, but not who it is, is none of those that passed.
            command(sim, "fault 2 lose,of=26")
            traces = ("--trace-on-failure", self.path("trace{port}"))
            self.assertEqual(self.verdicts(12, "--all", "--time-out", "200", *traces, "raw", "7C"), {1: 0, 2: 5, 3: 0})
            self.assertGreater(len(self.content("trace2")), 0)

    def test_those_that_fail_alike_end_with_their_code(self):
        with self.fixture(2, "--fault", "refuse=24,of=4B 0F") as (_, self.ports):
            self.assertEqual(self.verdicts(7, "-p", "1,2", "mode", "get"), {1: 7, 2: 7})

    def test_names_of_files_are_those_of_the_handset(self):
        with self.fixture(2, "--model", "../VH") as (_, self.ports):
            backup = self.path("{serial}-{model}-{slot}-{port}.pkv")
            self.expect(0, "-p", "2,1", "nv", "backup", backup, "--items", "0-20")
            self.assertEqual(sorted(os.listdir(self.folder)),
                             ["00000010-_._VH-2-1.pkv", "00000011-_._VH-1-2.pkv", "ports"])
            self.expect(0, "-p", "2,1", "nv", "verify", backup)
            self.expect(8, "-p", "2", "nv", "verify", self.path("00000010-_._VH-2-1.pkv"))
            self.expect(0, "-p", "1", "nv", "verify", self.path("{serial}-_._VH-2-1.pkv"))
            for port in (1, 2):
                self.add(f"cal-0000001{port - 1}", bytes([port]))
            self.expect(0, "--all", "fs", "put", self.path("cal-{serial}"), ":/cal")
            self.expect(0, "--all", "fs", "get", ":/cal", self.path("back{port}"), "--log", self.path("log{port}"))
            self.assertEqual([self.content(f"back{port}") for port in (1, 2)], [b"\1", b"\2"])
            self.assertGreater(len(self.content("log2")), 0)

    def test_mistakes_are_told_before_anything_is_done(self):
        with self.fixture(3) as (sim, self.ports):
            self.ports[9] = os.path.realpath(self.ports[1])
            log = self.path("log")
            self.expect(0, "-p", "1", "nv", "backup", self.path("1.pkv"), "--items", "0-3")
            for code, text, words in (
                    (2, "COM2 is named twice", ("-p", "1,2,2", "info")),
                    (2, "COM2 is named twice", ("-p", "1-2,2-3", "info")),
                    (2, "is no list of ports", ("-p", "3-1", "info")),
                    (2, "0 is not a port number in 1,0", ("-p", "1,0", "info")),
                    (2, "1, is no list of ports", ("-p", "1,", "info")),
                    (2, "that is no port", ("-p", "", "mode", "get")),
                    (2, "nothing behind --port=", ("--port=", "mode", "get")),
                    (2, "no name of a file", ("-p", "1", "mode", "get", "--log", "")),
                    (2, "would destroy", ("-p", "1", "nv", "verify", self.path("1.pkv"), "--report", self.path("1.pkv"))),
                    (2, "would destroy", ("-p", "1,2", "nv", "verify", self.path("{port}.pkv"), "--report",
                                          self.path("1.pkv"))),
                    (2, "would destroy", ("-p", "1,2", "flash", "write", f"2:{self.path('1.pkv')}", "--report",
                                          self.path("1.pkv"))),
                    (2, "{port} is of one", ("-p", "1", "info", "--report", self.path("{port}.html"))),
                    (2, "are the same device", ("-p", "1,9", "info")),
                    (2, "different things", ("-p", "1", "--all", "info")),
                    (2, "one handset at a time", ("-p", "1,2", "event", "tail")),
                    (2, "x.pkv for both COM1 and COM2", ("-p", "1,2", "nv", "backup", self.path("x.pkv"))),
                    (2, "both COM1 and COM2", ("--all", "fs", "get", ":/x")),
                    (2, "both COM1 and COM3", ("-p", "1,3", "info", "--log", log)),
                    (2, "zz is not hex", ("-p", "1,2", "nv", "write", "447", "zz")),
                    (2, "129 bytes are too many", ("--all", "nv", "write", "447", "00" * 129)),
                    (2, "no item nosuch", ("-p", "1,2", "nv", "read", "nosuch")),
                    (2, "99-1 is no range", ("-p", "1,2", "nv", "backup", self.path("{port}"), "--items", "99-1")),
                    (2, "NV item 10: ", ("-p", "1,2", "nv", "write", "10", "1,x", *nv_test.NvItems.DEFS)),
                    (2, "xyz is not hex", ("-p", "1,2", "raw", "xyz")),
                    (2, "no FTM command NOSUCH", ("-p", "1,2", "ftm", "cmd", "NOSUCH")),
                    (2, "no path of its side", ("-p", "1,2", "fs", "put", log, "/x")),
                    (2, "nothing to switch", ("-p", "1,2", "log", "on")),
                    (2, "99999 is not an id", ("-p", "1,2", "log", "capture", self.path("{port}.log"), "--on", "99999")),
                    (2, "there is no command A.B", ("-p", "1,2", "cmd", "call", "A.B", "--defs", COMMANDS)),
                    (2, "channel", ("-p", "1,2", "cmd", "call", "WLAN.TX_START", "channel=15", "--defs", COMMANDS)),
                    (2, "named", ("info", "--report", log)),
                    (2, "does nothing to handsets", ("-p", "1", "band", "list", "--report", log)),
                    (2, "would destroy", ("-p", "1", "nv", "backup", log, "--report", log)),
                    (10, "cannot be written", ("-p", "1", "fs", "mkdir", ":/made", "--report", "/nonexistent/page")),
                    (10, "2.pkv for COM2", ("-p", "1,2", "nv", "restore", self.path("{port}.pkv"))),
                    (3, "nothing was done", ("-p", "1-3,5", "fs", "mkdir", ":/made"))):
                with self.subTest(words=words):
                    answer = self.expect_json(code, *words)
                    self.assertIn(text, answer["error"]["text"])
                    self.assertNotIn("handsets", answer, "none of them has a verdict")
            self.assertFalse(os.path.exists(self.path("x.pkv")))
            command(sim, "fault 3 lose,of=7C")
            held = start("-p", "3", "--time-out", "20000", "--log", log, "raw", "7C", ports=self.ports)
            try:
                wait_until(lambda: tool.holds(log, "SEND (1 bytes):7C"))
                self.expect_json(4, "-p", "1-3", "fs", "mkdir", ":/made")
            finally:
                held.kill()
                held.communicate()
            self.expect(7, "-p", "1", "fs", "stat", ":/made")

    def test_a_download_is_one_job_for_all_handsets(self):
        programmer = self.add("programmer", BootLoader.PROGRAMMER)
        image = self.add("<b>software", BootLoader.SOFTWARE)
        page = self.path("page.html")
        with self.fixture(3, "--loader", "boot", "--fault-at", "2:wrong=13,of=08") as (_, self.ports):
            self.expect_json(2, "--all", "flash", "all", programmer, image)
            self.expect_json(2, "-p", "1,2", "boot", "info", "--log", self.path("{serial}"))
            self.expect_json(10, "-p", "1-3", "flash", "all", programmer, "/nonexistent/image")
            for row in self.expect_json(7, "-p", "1,3", "flash", "write", image)["handsets"]:
                self.assertIn("is in diagnostic mode", row["error"]["text"])
            flash = ("flash", "all", "--enter", "--wait", "1", programmer, image)
            self.assertEqual(self.verdicts(0, "-p", "1,3", *flash, "--log", self.path("log{port}")), {1: 0, 3: 0})
            self.assertGreater(len(self.content("log3")), 0)
            self.expect_json(10, "-p", "1,3", "boot", "load", "/nonexistent/programmer")
            for code, port, log in ((2, 1, "log"), (10, 1, "no/log{port}"), (3, 9, "log{slot}")):
                error = self.expect_json(code, "-p", f"{port},3", "--log", self.path(log), "flash", "write", image)["error"]
                self.assertNotIn("COM0", error["text"])
            self.assertTrue(os.path.exists(self.path("log1")))
            self.assertEqual({row["state"] for row in self.expect_json(0, "-p", "1,3", "flash", "info")["handsets"]},
                             {"programmer"})
            answer = self.expect_json(0, "--all", "flash", "write", image, "--reset")
            self.assertEqual([(row["port"], row["bytes"], row["attempts"]) for row in answer["handsets"]],
                             [(port, len(BootLoader.SOFTWARE), 1) for port in (1, 3)])
            self.assertEqual({row["build"]["software_revision"]
                              for row in self.expect_json(0, "-p", "1,3", "info")["handsets"]}, {"VHS-2.0.1"})
            answer = self.expect_json(12, "-p", "1,2", "--report", page, *flash)
            self.assertEqual([row["ok"] for row in answer["handsets"]], [True, False])
            # How long each step took is told, without a gap in between.
            steps = answer["handsets"][0]["steps"]
            self.assertEqual([step["step"] for step in steps], ["identity", "enter loader", "flash programmer (programmer)",
                                                                "image 1 (<b>software)"])
            for step, following in zip(steps, steps[1:]):
                self.assertAlmostEqual(step["begin"] + step["seconds"], following["begin"], delta=0.003)
            rows = re.findall(r'<tr class="(\w+)"><td>COM(\d)</td><td>(\w+)</td>.*"verdict">(.*)</td></tr>',
                              self.content("page.html").decode())
            self.assertEqual([row[:3] for row in rows], [("passed", "1", "00000010"), ("failed", "2", "00000011")])
            self.assertIn(answer["handsets"][1]["error"]["hint"], rows[1][3])
            self.assertIn(b"image 1 (&lt;b>software) ", self.content("page.html"))
            self.assertEqual(answer["handsets"][1]["error"]["name"], "link")

    def test_the_rate_of_a_download_is_counted_anew_in_a_retry(self):
        words = (self.add("programmer", BootLoader.PROGRAMMER), self.add("image", bytes(120000)))
        with self.fixture(2, "--loader", "boot", "--rate", "100k", "--fault-at", "1:wrong=13,nth=110,of=08") as (_, self.ports):
            done = self.expect(0, "--all", "--json", "flash", "all", "--enter", *words)
        told = [event for event in map(json.loads, done.err.splitlines())
                if event["event"] == "progress" and event["port"] == 1 and "per_second" in event]
        before, after = next(pair for pair in zip(told, told[1:]) if pair[0]["done"] > pair[1]["done"])
        self.assertGreater(after["per_second"], before["per_second"] / 2)

    def test_another_handset_on_the_port_is_not_worked_on(self):
        with self.fixture(3, "--rate", "20k") as (_, self.ports):
            process = start("-p", "1,2", "--jobs", "1", "--json", "fs", "put", self.add("big", bytes(8000)), ":/big",
                            ports=self.ports)
            process.stderr.readline()  # work on the first has begun
            os.remove(self.ports[2])
            os.symlink(os.path.realpath(self.ports[3]), self.ports[2])
            out, _ = process.communicate(timeout=PATIENCE)
            rows = json.loads(out)["handsets"]
            self.assertEqual([row.get("error", {}).get("name") for row in rows], [None, "safety-stop"])
            self.assertIn("00000012 in place of 00000011", rows[1]["error"]["text"])
            self.expect(7, "-p", "3", "fs", "stat", ":/big")

    def test_an_interrupt_ends_all_of_them(self):
        with self.fixture(3, "--rate", "20k") as (_, self.ports):
            process = start("-p", "1-3", "--jobs", "2", "--json", "fs", "put", self.add("big", bytes(200000)), ":/big",
                            ports=self.ports)
            for _ in range(2):
                self.assertEqual(json.loads(process.stderr.readline())["event"], "progress")
            process.send_signal(signal.SIGINT)
            out, _ = process.communicate(timeout=PATIENCE)
            self.assertEqual(process.returncode, 130)
            rows = json.loads(out)["handsets"]
            self.assertEqual([row["error"]["name"] for row in rows], ["interrupted"] * 3)
            self.assertEqual(self.verdicts(7, "-p", "1-3", "fs", "stat", ":/big"), {1: 7, 2: 7, 3: 7})

    def test_a_terminal_has_a_line_for_each_that_fits(self):
        with self.fixture(6, "--rate", "20k") as (_, self.ports):
            master, slave = pty.openpty()
            fcntl.ioctl(slave, termios.TIOCSWINSZ, struct.pack("HHHH", 6, 40, 0, 0))
            environment = {**clean_environment(self.ports), "TERM": "xterm"}
            process = subprocess.Popen([tool.KRAL, "--all", "fs", "put", self.add("f", bytes(10000)), ":/f"],
                                       env=environment, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=slave)
            os.close(slave)
            shown = b""
            try:
                while piece := os.read(master, 65536):
                    shown += piece
            except OSError:  # nobody has the terminal any more
                pass
            finally:
                os.close(master)
            out = process.communicate(timeout=PATIENCE)[0]
        self.assertEqual(process.returncode, 0)
        self.assertEqual(out.count(b"copied"), 6)
        frames = re.split("\x1b\\[\\d+A\r\x1b\\[J", shown.decode())
        self.assertGreater(len(frames), 2)
        for frame in frames[:-1]:
            lines = frame.splitlines()
            self.assertLessEqual(len(lines), 5)
            self.assertLessEqual(max(map(len, lines), default=0), 39)
        self.assertIn("6 in all: 6 working", frames[0] + frames[1])
        self.assertRegex("".join(frames), r"(?m)^COM\d 000000\d\d.* \d+ %  .*0:\d\d left\r?$", "of 40 columns, these are kept")
        self.assertIn("6 handsets passed", frames[-1])
