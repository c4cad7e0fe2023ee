"""Finding a handset, and what it tells of itself."""
import fcntl
import json
import os
import termios

from tool import ToolTest, handset, run


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
        self.assertEqual(listed[7]["device"], sim.device)
        self.assertNotIn("handset", listed[7])
        self.assertEqual([probed[number]["handset"] for number in (7, 9)], [True, False])

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
        for number in ("7", "0", "300"):
            with self.subTest(port=number):
                self.assertIn(f"COM{number}", self.expect_json(3, "-p", number, "info")["error"]["text"])

    def test_busy_and_forbidden_ports_are_told_from_missing_ones(self):
        with self.handset() as sim:
            taken = os.open(sim.device, os.O_RDWR | os.O_NOCTTY)
            try:
                fcntl.flock(taken, fcntl.LOCK_EX | fcntl.LOCK_NB)
                fcntl.ioctl(taken, termios.TIOCEXCL)
                self.assertIn("in use", self.ask(4, "info")["error"]["text"])
                fcntl.ioctl(taken, termios.TIOCNXCL)
            finally:
                os.close(taken)
            os.chmod(sim.device, 0)
            done = run("-p", "7", "info", "--json", ports=self.ports, before=without_override())
        self.assertEqual(done.returncode, 4, done.err)
        self.assertIn("may not be opened", json.loads(done.out)["error"]["text"])
