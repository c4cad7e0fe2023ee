"""Finding a handset, and what it tells of itself."""
import fcntl
import json
import os
import termios
import unittest.mock

import tool
from tool import ToolTest, command, fixture, handset, run, start


def without_override():
    """What goes in front of a command, so that permissions bind it even if we are root."""
    return ["setpriv", "--bounding-set=-dac_override,-dac_read_search"] if os.geteuid() == 0 else []


class Info(ToolTest):
    def test_info_prints_what_the_handset_was_given(self):
        with self.handset("--esn", "0x1A2B3C4D", "--model", "TESTER-9", "--software", "R7.1 build 42") as sim:
            text = self.text("info")
            answer = self.ask(0, "info")
        for part in (f"COM7 ({sim.device})", "TESTER-9", "R7.1 build 42", "0x1A2B3C4D", "online"):
            self.assertIn(part, text)
        self.assertEqual((answer["port"], answer["esn"], answer["mode"]), (7, "1A2B3C4D", "online"))
        build = answer["build"]
        self.assertEqual((build["model"], build["software_revision"]), ("TESTER-9", "R7.1 build 42"))
        self.assertTrue(answer["version"]["compiled"]["date"])

    def test_info_leaves_out_what_the_handset_refuses(self):
        with self.handset("--fault", "refuse=19,of=7C"):
            done = self.expect(0, "-p", "7", "info", "--json")
        answer = json.loads(done.out)
        self.assertIsNone(answer["build"])
        self.assertIn("refused command 124 with 19", done.err)
        self.assertTrue(answer["esn"])

    def test_log_holds_every_step(self):
        with self.handset():
            self.ask(0, "info", "--log", self.path("station.log"), "--log-flags", "0x421F")
            answer = self.ask(10, "info", "--log", "/nonexistent/x.log")
        self.assertIn("/nonexistent/x.log", answer["error"]["text"])
        lines = self.content("station.log").decode("latin-1")
        self.assertRegex(lines, r"(?m)^\d\d:\d\d:\d\d\d\t,LOG_C_HIGH_LEVEL_START,KRAL_DIAG_VERNO_F\r?$")
        self.assertRegex(lines, r"LOG_FN,KRAL_DIAG_EXT_BUILD_ID_F\(\)")
        self.assertRegex(lines, r"LOG_IO,SEND \(1 bytes\):7C ")
        self.assertIn("DIAG_READ_ESN_F() -- completed", lines)


class Ports(ToolTest):
    def test_ports_are_listed_and_the_only_handset_needs_no_number(self):
        with handset() as sim, handset("--fault", "ignore") as mute:
            self.ports = {7: sim.device, 9: mute.device}
            listed = {row["port"]: row for row in self.expect_json(0, "ports")["ports"]}
            probed = {row["port"]: row for row in self.expect_json(0, "ports", "--probe")["ports"]}
            self.assertEqual(self.expect_json(0, "info")["port"], 7)
        self.assertEqual((listed[7]["device"], listed[7]["state"]), (sim.device, "free"))
        self.assertNotIn("handset", listed[7])
        self.assertEqual([(probed[number]["handset"], probed[number]["state"], probed[number]["answers"])
                          for number in (7, 9)], [(True, "handset", "diagnostics"), (False, "silent", "nothing")])

    def test_ports_are_found_by_device_serial_number_and_slot(self):
        slots = {"KRAL_SLOTS": self.path("slots")}
        with unittest.mock.patch.dict(tool.EXTRA_ENVIRONMENT, slots), handset() as unnumbered, \
                fixture(4, self.path("ports"), "--esn", "0x10", "--fault-at", "4:ignore") as (_, self.ports):
            for words in (("1", "esn:11"), ("2", "/dev/../" + os.path.realpath(self.ports[3])), ("30", "3"), ("4", "1")):
                self.expect(0, "ports", "assign", *words)
            for name, ports in (("esn:00000012", [3]), (os.path.realpath(self.ports[1]), [1]), ("slot:1", [2]),
                                ("slot:1-2", [2, 3]), ("1,slot:1,esn:12", [1, 2, 3])):
                with self.subTest(name=name):
                    answer = self.expect_json(0, "-p", name, "info")
                    self.assertEqual([row["port"] for row in answer.get("handsets", [answer])], ports)
            answer = self.expect_json(0, "-p", unnumbered.device, "info")
            self.assertEqual(answer["esn"], "80C0FFEE")
            self.expect(0, "-p", "slot:2", "nv", "backup", self.path("{slot}.pkv"), "--items", "0-1")
            self.expect(0, "-p", "slot:1-2", "nv", "backup", self.path("many{slot}.pkv"), "--items", "0-1")
            self.assertLess({"2.pkv", "many1.pkv", "many2.pkv"}, set(os.listdir(self.folder)))
            for code, text, name in ((3, "no port esn:00000099", "esn:00000099"), (3, "no port usb:9-9", "usb:9-9"),
                                     (3, "no port /dev/nothing", "/dev/nothing"), (2, "slot 7 is not", "slot:7"),
                                     (2, "slot:2 and slot:30 are both COM3", "slot:2,slot:30"),
                                     (2, "slot:1 and esn:11 are both COM2", "slot:1,esn:11"),
                                     (2, "slot:2 and 3 are both COM3", "slot:2,3"),
                                     (2, "is no serial number", "esn:xyz"), (2, "is no slot", "slot:2-1")):
                with self.subTest(name=name):
                    self.assertIn(text, self.expect_json(code, "-p", name, "info")["error"]["text"])
            self.assertIn(r"no port /dev/\x1b[1mü", self.expect(3, "-p", "/dev/\x1b[1mü", "info").err.replace("1B", "1b"))
            for words in (("5", "esn:11"), ("5", "esn:00000011"), ("5", "COM3"), ("5", "003"), ("5", "65535"), ("5", "usb:"),
                          ("5", "esn:zz"), ("5", "/dev/\x1b[1m"), ("5", "slot:1"), ("5", "7,8"), ("5", "7-8"), ("5",), ("0", "7"),
                          ("5", "x"), ("5", "--remove"), ("--remove",)):
                self.expect_json(2, "ports", "assign", *words)
            self.expect(0, "ports", "assign", "1", "--remove")
            slots = self.expect_json(0, "ports", "assign")["slots"]
            self.assertEqual([row["slot"] for row in slots], [2, 4, 30])
            self.add("slots", b"1 7\n1 8\n")
            self.assertIn("line 2", self.expect_json(10, "-p", "slot:1", "info")["error"]["text"])

    def test_the_doctor_names_what_is_wrong_and_what_mends_it(self):
        def findings(code, *words):
            answer = self.expect_json(code, *words, "doctor", "--seconds", "0.2")
            return answer, {row["level"]: row["text"] + " | " + row["mend"] for row in answer["findings"]
                            if "ModemManager" not in row["text"]}
        with fixture(4, self.path("ports"), "--fault-at", "2:corrupt,every=20,of=7B", "--fault-at", "3:ignore",
                     "--fault-at", "4:delay=30,of=7B") as (_, self.ports):
            answer, found = findings(0, "-p", "1")
            self.assertEqual(found, {})
            trips = answer["ports"][0]["round_trips"]
            self.assertGreater(trips["count"], 10)
            self.assertGreater(trips["p99_us"], 0)
            self.assertLessEqual(trips["p50_us"], trips["p99_us"])
            self.assertEqual((trips["lost"], trips["garbled"]), (0, 0))
            answer, found = findings(6, "-p", "1-2")
            self.assertRegex(found["problem"], r"loopbacks on COM2 .* were lost and .*try another cable")
            self.assertIn("nothing answers on COM3", findings(5, "-p", "3")[1]["problem"])
            self.assertIn("round trips on COM4", findings(0, "-p", "4")[1]["warning"])
            self.assertIn("no port COM99", findings(3, "-p", "99")[1]["problem"])
            text = self.expect(6, "-p", "2", "doctor", "--seconds", "0.2")
            self.assertRegex(text.out, r"COM2 .* round trips: p50 .*\nproblem: ")
            os.chmod(self.ports[1], 0)
            words = ("-p", "1", "doctor", "--seconds", "0", "--json")
            done = run(*words, ports=self.ports, before=without_override())
            self.assertEqual(done.returncode, 4)
            self.assertIn("sudo ", json.loads(done.out)["findings"][-1]["mend"])

    def test_a_verb_waits_for_a_handset_that_comes(self):
        with fixture(1, self.path("ports"), "--esn", "0x10") as (sim, self.ports):
            command(sim, "unplug 1")
            for name, code in (("1", 3), ("esn:10", 3)):
                self.expect_json(code, "-p", name, "--wait=0", "info")
                waiting = start("-p", name, "info", "--wait", ports=self.ports)
                command(sim, "plug 1")
                out, err = waiting.communicate(timeout=tool.PATIENCE)
                self.assertEqual(waiting.returncode, 0, err)
                self.assertIn("00000010", out)
                command(sim, "unplug 1")

    def test_several_handsets_are_listed_and_none_is_chosen(self):
        with handset() as one, handset() as two:
            self.ports = {12: one.device, 13: two.device}
            error = self.expect_json(2, "info")["error"]
        self.assertIn("COM12", error["text"])
        self.assertIn("COM13", error["text"])
        self.assertIn("-p", error["hint"])

    def test_log_that_does_not_hold_all_lines_is_told(self):
        with self.handset():
            done = self.expect(0, "-p", "7", "info", "--log", "/dev/full")
            self.assertRegex(done.err, "^kral: Text log: lines are lost, /dev/full cannot be written: .*\n$")

    def test_missing_and_impossible_ports_are_no_port(self):
        self.ports = {7: "/nonexistent/tty"}
        for number in ("7", "0", "256", "65534", "65535"):
            with self.subTest(port=number):
                self.assertIn(f"COM{number}", self.expect_json(3, "-p", number, "info")["error"]["text"])

    def test_busy_and_forbidden_ports_are_told_from_missing_ones(self):
        with self.handset() as sim:
            taken = os.open(sim.device, os.O_RDWR | os.O_NOCTTY)
            try:
                fcntl.flock(taken, fcntl.LOCK_EX | fcntl.LOCK_NB)
                fcntl.ioctl(taken, termios.TIOCEXCL)
                self.assertIn(f"process {os.getpid()})", self.ask(4, "info")["error"]["text"])
                for words in (("ports",), ("ports", "--probe")):
                    row = next(row for row in self.expect_json(0, *words)["ports"] if row["port"] == 7)
                    self.assertEqual((row["state"], row["process"]["id"]), ("in-use", os.getpid()))
                self.assertIn("in use by", self.expect_json(3, "info")["error"]["text"])
                self.assertEqual(self.ask(4, "info")["port"], 7)
                fcntl.ioctl(taken, termios.TIOCNXCL)
            finally:
                os.close(taken)
            os.chmod(sim.device, 0)
            listed = run("ports", ports=self.ports, before=without_override())
            self.assertRegex(listed.out, r"(?m)^COM7 .*  not permitted$")
            done = run("-p", "7", "info", "--json", ports=self.ports, before=without_override())
        self.assertEqual(done.returncode, 4, done.err)
        self.assertIn("may not be opened", json.loads(done.out)["error"]["text"])
