#!/usr/bin/env python3
"""The built tool against the handset it simulates, each in a process of its own, joined by a pseudo terminal.

usage: tool_test.py KRAL [unittest arguments]. The last line is "kral_tool: N passed, M failed".
"""
import contextlib
import fcntl
import json
import os
import signal
import struct
import subprocess
import sys
import tempfile
import termios
import time
import unittest

KRAL = None
PATIENCE = 30  # seconds; far more than anything here takes


def clean_environment(ports):
    """An environment in which exactly these COM numbers have devices of ours."""
    env = {name: value for name, value in os.environ.items() if not name.startswith("KRAL_")}
    env["KRAL_PORT_DIR"] = "/nonexistent"
    env.update({f"KRAL_COM{number}": device for number, device in ports.items()})
    return env


def without_override():
    """What goes in front of a command, so that permissions bind it even if we are root."""
    return ["setpriv", "--bounding-set=-dac_override,-dac_read_search"] if os.geteuid() == 0 else []


def start(*words, ports=None, before=()):
    return subprocess.Popen([*before, KRAL, *words], env=clean_environment(ports or {}), stdin=subprocess.DEVNULL,
                            stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)


def run(*words, ports=None, before=()):
    process = start(*words, ports=ports, before=before)
    process.out, process.err = process.communicate(timeout=PATIENCE)
    return process


@contextlib.contextmanager
def handset(*options):
    """A simulated handset; gives its process, whose `device` is where it answers."""
    sim = start("sim", *options)
    try:
        sim.device = sim.stdout.readline().strip()
        if not os.path.exists(sim.device):
            raise AssertionError(f"kral sim {options}: no device: {sim.communicate()[1]}")
        yield sim
    finally:
        if sim.poll() is None:
            sim.terminate()
        sim.communicate(timeout=PATIENCE)


@contextlib.contextmanager
def tool_waiting_for_an_answer(device, *options):
    """The tool, with the request 7C sent and its answer outstanding."""
    with tempfile.TemporaryDirectory() as folder:
        log = os.path.join(folder, "log")
        tool = start("-p", "7", "--time-out", "2000", "--log", log, "raw", "7C", *options, ports={7: device})
        try:
            deadline = time.monotonic() + PATIENCE
            while tool.poll() is None and time.monotonic() < deadline:
                with contextlib.suppress(FileNotFoundError), open(log, encoding="latin-1") as file:
                    if "SEND (1 bytes):7C" in file.read():
                        break
                time.sleep(0.01)
            yield tool
        finally:
            if tool.poll() is None:
                tool.kill()
                tool.communicate()


class ToolTest(unittest.TestCase):
    def expect(self, code, *words, ports=None):
        """Runs the tool and checks its exit code."""
        done = run(*words, ports=ports)
        self.assertEqual(done.returncode, code, f"kral {' '.join(words)}\n{done.out}{done.err}")
        return done

    def expect_json(self, code, *words, ports=None):
        """The same with --json: one object, nothing else, whose error agrees with the exit code."""
        done = self.expect(code, *words, "--json", ports=ports)
        answer = json.loads(done.out)
        self.assertEqual(done.out.count("\n"), 1)
        self.assertEqual(answer["ok"], code == 0)
        if code != 0:
            self.assertEqual(answer["error"]["code"], code)
            for member in ("name", "text", "hint"):
                self.assertTrue(answer["error"][member], member)
        return answer


class Identity(ToolTest):
    OPTIONS = ("--esn", "0x1A2B3C4D", "--model", "TESTER-9", "--software", "R7.1 build 42")

    def test_info_prints_what_the_handset_was_given(self):
        with handset(*self.OPTIONS) as sim:
            text = self.expect(0, "-p", "7", "info", ports={7: sim.device}).out
            answer = self.expect_json(0, "-p", "7", "info", ports={7: sim.device})
        for part in (f"COM7 ({sim.device})", "TESTER-9", "R7.1 build 42", "0x1A2B3C4D", "online"):
            self.assertIn(part, text)
        self.assertEqual(answer["port"], 7)
        self.assertEqual(answer["esn"], "1A2B3C4D")
        self.assertEqual(answer["build"]["model"], "TESTER-9")
        self.assertEqual(answer["build"]["software_revision"], "R7.1 build 42")
        self.assertEqual(answer["mode"], "online")
        self.assertTrue(answer["version"]["compiled"]["date"])

    def test_info_leaves_out_what_the_handset_refuses(self):
        with handset("--fault", "refuse=19,of=7C") as sim:
            done = self.expect(0, "-p", "7", "info", "--json", ports={7: sim.device})
        answer = json.loads(done.out)
        self.assertIsNone(answer["build"])
        self.assertIn("bad command", done.err)
        self.assertTrue(answer["esn"])

    def test_log_holds_every_step(self):
        with handset() as sim, tempfile.TemporaryDirectory() as folder:
            log = os.path.join(folder, "station.log")
            self.expect(0, "info", "-p", "7", "--log", log, "--log-flags", "0x421F", ports={7: sim.device})
            with open(log, encoding="latin-1") as file:
                lines = file.read()
        self.assertRegex(lines, r"(?m)^\d\d:\d\d:\d\d\d\t,LOG_C_HIGH_LEVEL_START,KRAL_DIAG_VERNO_F$")
        self.assertRegex(lines, r"LOG_FN,KRAL_DIAG_EXT_BUILD_ID_F\(\)")
        self.assertRegex(lines, r"LOG_IO,SEND \(1 bytes\):7C ")
        self.assertIn("DIAG_READ_ESN_F() -- completed", lines)

    def test_unwritable_log_is_a_bad_file(self):
        with handset() as sim:
            answer = self.expect_json(10, "-p", "7", "info", "--log", "/nonexistent/x.log", ports={7: sim.device})
        self.assertIn("/nonexistent/x.log", answer["error"]["text"])


class Ports(ToolTest):
    def test_ports_are_listed_with_their_devices_and_probed_on_request(self):
        with handset() as sim, handset("--fault", "ignore") as mute:
            ports = {7: sim.device, 9: mute.device}
            listed = {row["port"]: row for row in self.expect_json(0, "ports", ports=ports)["ports"]}
            probed = {row["port"]: row for row in self.expect_json(0, "ports", "--probe", ports=ports)["ports"]}
        self.assertEqual(listed[7]["device"], sim.device)
        self.assertNotIn("handset", listed[7])
        self.assertTrue(probed[7]["handset"])
        self.assertFalse(probed[9]["handset"])

    def test_only_port_with_a_handset_needs_no_number(self):
        with handset() as sim, handset("--fault", "ignore") as mute:
            ports = {12: sim.device, 13: mute.device}
            self.assertEqual(self.expect_json(0, "info", ports=ports)["port"], 12)

    def test_several_handsets_are_listed_and_none_is_chosen(self):
        with handset() as one, handset() as two:
            error = self.expect_json(2, "info", ports={12: one.device, 13: two.device})["error"]
        self.assertIn("COM12", error["text"])
        self.assertIn("COM13", error["text"])
        self.assertIn("-p", error["hint"])

    def test_missing_and_impossible_ports_are_no_port(self):
        for number, ports in (("7", {7: "/nonexistent/tty"}), ("0", {}), ("300", {})):
            with self.subTest(port=number):
                self.assertIn(f"COM{number}", self.expect_json(3, "-p", number, "info", ports=ports)["error"]["text"])

    def test_busy_port_is_told_from_a_missing_one(self):
        with handset() as sim:
            taken = os.open(sim.device, os.O_RDWR | os.O_NOCTTY)
            try:
                fcntl.flock(taken, fcntl.LOCK_EX | fcntl.LOCK_NB)
                fcntl.ioctl(taken, termios.TIOCEXCL)
                error = self.expect_json(4, "-p", "7", "info", ports={7: sim.device})["error"]
            finally:
                os.close(taken)
        self.assertIn("in use", error["text"])

    def test_port_that_is_not_permitted_says_so(self):
        with handset() as sim:
            os.chmod(sim.device, 0)
            done = run("-p", "7", "info", "--json", ports={7: sim.device}, before=without_override())
        self.assertEqual(done.returncode, 4, done.err)
        self.assertIn("may not be opened", json.loads(done.out)["error"]["text"])


class Failures(ToolTest):
    def test_silent_handset_gives_no_answer(self):
        with handset("--fault", "ignore") as sim:
            error = self.expect_json(5, "-p", "7", "info", ports={7: sim.device})["error"]
        self.assertIn("COM7", error["text"])

    def test_request_without_answer_is_told_from_a_dead_handset(self):
        with handset("--fault", "lose,of=7C") as sim:
            error = self.expect_json(5, "-p", "7", "--time-out", "300", "raw", "7C", ports={7: sim.device})["error"]
        self.assertIn("command 7C", error["text"])
        self.assertIn("still answers", error["hint"])

    def test_handset_that_vanishes_is_lost(self):
        with handset("--fault", "lose,of=7C") as sim, tool_waiting_for_an_answer(sim.device) as tool:
            sim.kill()
            _, err = tool.communicate(timeout=PATIENCE)
            self.assertEqual(tool.returncode, 9, err)

    def test_handset_that_comes_back_is_served_again(self):
        with tempfile.TemporaryDirectory() as folder:
            link = os.path.join(folder, "port")
            with handset("--fault", "hang-up,nth=1,of=7C", "--back-after", "300", "--link", link):
                self.expect_json(9, "-p", "7", "--time-out", "200", "raw", "7C", ports={7: link})
                deadline = time.monotonic() + PATIENCE
                while not os.path.lexists(link) and time.monotonic() < deadline:
                    time.sleep(0.01)
                self.expect_json(0, "-p", "7", "raw", "7C", ports={7: link})

    def test_refusal_names_its_reason(self):
        with handset("--fault", "refuse=24,of=29") as sim:
            ports = {7: sim.device}
            answer = self.expect_json(7, "-p", "7", "raw", "29 05 00", ports=ports)
            self.assertEqual(answer["reply"][:2], "18")
            self.assertIn("invalid for the current mode", answer["error"]["text"])

    def test_foreign_answer_is_a_link_error(self):
        with handset("--fault", "wrong=0x55,of=7C") as sim:
            self.expect_json(6, "-p", "7", "raw", "7C", ports={7: sim.device})

    def test_mistakes_on_the_command_line_are_usage(self):
        for words in (["frobnicate"], ["info", "--frobnicate"], [], ["raw", "4B0"], ["raw", "xyz"],
                      ["-p", "seven", "info"], ["mode", "sideways"], ["--time-out", "0", "info"]):
            with self.subTest(words=words):
                self.expect_json(2, *words)

    def test_result_that_cannot_be_written_is_not_a_success(self):
        with handset() as sim, open("/dev/full", "w", encoding="ascii") as full:
            done = subprocess.run([KRAL, "-p", "7", "info"], env=clean_environment({7: sim.device}), stdout=full,
                                  stderr=subprocess.PIPE, text=True, timeout=PATIENCE, check=False)
        self.assertEqual(done.returncode, 1, done.stderr)

    def test_interrupted_verb_disconnects_and_says_so(self):
        with handset("--fault", "lose,of=7C") as sim, tool_waiting_for_an_answer(sim.device, "--json") as tool:
            tool.send_signal(signal.SIGINT)
            out, _ = tool.communicate(timeout=PATIENCE)
            self.assertEqual(tool.returncode, 130)
            self.assertEqual(json.loads(out)["error"]["name"], "interrupted")


class Requests(ToolTest):
    def test_raw_shows_the_reply_as_it_came(self):
        with handset("--switches", "0x1234") as sim:
            ports = {7: sim.device}
            self.assertEqual(self.expect(0, "-p", "7", "raw", "2F", ports=ports).out.split()[:4],
                             ["0000", "2F", "34", "12"])
            for words in (["30", "78", "56"], ["307856"], ["0x30,0x78,0x56"]):
                self.assertEqual(self.expect_json(0, "-p", "7", "raw", *words, ports=ports)["request"], "30 78 56")
            self.assertEqual(self.expect_json(0, "-p", "7", "raw", "2f", ports=ports)["reply"], "2F 78 56")

    def test_modes_are_switched_and_read_back(self):
        with handset() as sim:
            ports = {7: sim.device}
            self.assertEqual(self.expect(0, "-p", "7", "mode", "get", ports=ports).out, "online\n")
            for mode in ("ftm", "lpm", "online"):
                self.assertEqual(self.expect_json(0, "-p", "7", "mode", mode, ports=ports)["mode"], mode)
                self.assertEqual(self.expect(0, "-p", "7", "mode", "get", ports=ports).out, f"{mode}\n")


class Traffic(ToolTest):
    RATES = ("--logs", "2000", "--events", "200", "--messages", "200", "--burst", "5")

    def stream(self, *words, ports=None):
        """The NDJSON objects of a verb, the result last."""
        objects = [json.loads(line) for line in self.expect(0, *words, "--json", ports=ports).out.splitlines()]
        self.assertTrue(objects[-1]["ok"])
        return objects

    def test_logs_are_switched_captured_played_and_counted(self):
        with handset(*self.RATES) as sim, tempfile.TemporaryDirectory() as folder:
            ports = {7: sim.device}
            file, names = os.path.join(folder, "capture"), os.path.join(folder, "names")
            with open(names, "w", encoding="ascii") as table:
                table.write("# logs\n0x1001 Paging\n")
            self.expect(0, "-p", "7", "log", "on", "0x1001", "0x4001-0x4003", "--category", "5", ports=ports)
            rows = self.expect_json(0, "-p", "7", "log", "list", "--names", names, ports=ports)["equipment_ids"]
            self.assertEqual({row["equipment_id"]: row["on"] for row in rows}[1], [{"code": 4097, "name": "Paging"}])
            self.assertEqual([code["code"] for row in rows for code in row["on"]], [0x1001, 0x4001, 0x4002, 0x4003])
            done = self.expect_json(0, "-p", "7", "log", "capture", file, "--count", "300", ports=ports)
            self.assertGreaterEqual(done["packets"], 300)
            self.assertEqual(done["lost"], 0)
            played = self.stream("log", "play", file)
            self.assertEqual(len(played) - 1, done["packets"])
            kinds = {packet["what"] for packet in played[:-1]}
            self.assertLessEqual(kinds, {"log 0x1001", "log 0x4001", "log 0x4002", "log 0x4003", "message 5"})
            self.assertTrue(all(len(packet["bytes"].split()) > 2 for packet in played[:-1]))
            self.assertTrue(all(abs(packet["microseconds"] / 1e6 - time.time()) < 600 for packet in played[:-1]))
            today = time.strftime("%Y-%m-%dT", time.gmtime(played[0]["microseconds"] / 1e6))
            self.assertRegex(self.expect(0, "log", "play", file).out, rf"^{today}\d\d:\d\d:\d\d\.\d{{6}}Z  log 0x")
            rows = self.expect_json(0, "log", "stats", file, "--names", names)["rows"]
            self.assertEqual(sum(row["packets"] for row in rows), done["packets"])
            self.assertIn("Paging", [row.get("name") for row in rows])
            self.assertIn("Paging", self.expect(0, "log", "stats", file, "--names", names).out)
            live = self.expect_json(0, "-p", "7", "log", "stats", "--count", "100", ports=ports)
            self.assertGreaterEqual(live["counters"]["collected"], 100)
            self.assertGreaterEqual(live["counters"]["most_waiting"], 1)
            self.assertGreater(live["rows"][0]["per_second"], 0)
            self.expect(0, "-p", "7", "log", "off", "--all", "--category", "5", ports=ports)
            rows = self.expect_json(0, "-p", "7", "log", "list", ports=ports)["equipment_ids"]
            self.assertEqual([code for row in rows for code in row["on"]], [])
            with open(file, "r+b") as capture:
                capture.truncate(os.path.getsize(file) - 1)
            cut = self.stream("log", "play", file)
            self.assertEqual((len(cut) - 1, cut[-1]["cut"]), (done["packets"] - 1, True))

    def test_events_are_shown_as_they_come_and_from_a_file(self):
        with handset(*self.RATES) as sim, tempfile.TemporaryDirectory() as folder:
            ports = {7: sim.device}
            file, names = os.path.join(folder, "capture"), os.path.join(folder, "names")
            with open(names, "w", encoding="ascii") as table:
                table.write("291,Band change\n")
            shown = self.stream("-p", "7", "event", "tail", "--on", "291", "7", "--names", names, "--count", "20",
                                ports=ports)
            self.assertEqual({(event["id"], event["name"]) for event in shown[:-1]}, {(291, "Band change"), (7, "")})
            self.assertEqual(len(shown), 21)
            for event in shown[:-1]:
                self.assertIn(len(event["time_stamp"].split()), (2, 8))
            self.assertLessEqual({1, 2}, {len(event["payload"].split()) for event in shown[:-1]})
            self.expect(0, "-p", "7", "log", "capture", file, "--count", "20", ports=ports)
            self.assertGreaterEqual(self.stream("event", "tail", "--file", file)[-1]["events"], 160)
            self.expect(0, "-p", "7", "event", "off", "291", ports=ports)
            shown = self.stream("-p", "7", "event", "tail", "--count", "20", ports=ports)
            self.assertEqual({event["id"] for event in shown[:-1]}, {7})
            self.expect(0, "-p", "7", "event", "off", "--all", ports=ports)
            self.assertEqual(len(self.stream("-p", "7", "event", "tail", "--seconds", "0.2", ports=ports)), 1)

    def capturing(self, device, file):
        """The tool, with packets in the file already."""
        tool = start("-p", "7", "--json", "log", "capture", file, "--on", "0x1001", ports={7: device})
        deadline = time.monotonic() + PATIENCE
        while time.monotonic() < deadline and not (os.path.exists(file) and os.path.getsize(file) > 1000):
            time.sleep(0.01)
        return tool

    def test_interrupt_is_the_ordinary_end_of_a_capture(self):
        with handset(*self.RATES) as sim, tempfile.TemporaryDirectory() as folder:
            file = os.path.join(folder, "capture")
            tool = self.capturing(sim.device, file)
            tool.send_signal(signal.SIGINT)
            out, err = tool.communicate(timeout=PATIENCE)
            self.assertEqual(tool.returncode, 0, err)
            self.assertEqual(len(self.stream("log", "play", file)) - 1, json.loads(out)["packets"])

    def test_handset_that_vanishes_ends_a_capture(self):
        with handset(*self.RATES) as sim, tempfile.TemporaryDirectory() as folder:
            file = os.path.join(folder, "capture")
            tool = self.capturing(sim.device, file)
            sim.kill()
            _, err = tool.communicate(timeout=PATIENCE)
            self.assertEqual(tool.returncode, 9, err)
            self.assertGreater(len(self.stream("log", "play", file)), 1)

    def test_files_that_cannot_be_used_are_bad_files(self):
        with handset(*self.RATES) as sim, tempfile.NamedTemporaryFile() as foreign:
            ports = {7: sim.device}
            foreign.write(b"not a capture file at all")
            foreign.flush()
            self.expect_json(10, "log", "play", foreign.name)
            self.expect_json(10, "log", "play", "/nonexistent/capture")
            self.expect_json(10, "-p", "7", "log", "capture", "/nonexistent/capture", ports=ports)
            self.expect_json(10, "-p", "7", "log", "capture", "/dev/full", ports=ports)
            self.expect_json(10, "-p", "7", "log", "list", "--names", foreign.name, ports=ports)
            self.expect_json(2, "-p", "7", "log", "on", ports=ports)
            self.expect_json(2, "-p", "7", "event", "on", "0x10-0x0F", ports=ports)
            self.expect_json(2, "-p", "7", "event", "on", "0-65535", ports=ports)
            for ignored in (("--count", "1"), ("--seconds", "1"), ("--on", "7"), ("--all",)):
                self.expect_json(2, "event", "tail", "--file", foreign.name, *ignored)
            self.expect_json(2, "log", "stats", foreign.name, "--count", "1")


def make_file(folder, name, content):
    path = os.path.join(folder, name)
    with open(path, "wb") as file:
        file.write(content)
    return path


class BootLoader(ToolTest):
    PROGRAMMER = b"VHFP" + struct.pack("<I", 9000) + bytes(range(256)) * 35 + bytes(32)
    SOFTWARE = b"VHSW" + b"VHS-2.0.1\0" + bytes(range(256)) * 30

    def revision(self, ports):
        return self.expect_json(0, "-p", "7", "info", ports=ports)["build"]["software_revision"]

    def test_info_tells_who_waits_for_an_image(self):
        with handset("--boot-loader", "--chip-id", "0x12345678") as sim:
            answer = self.expect_json(0, "-p", "7", "boot", "info", ports={7: sim.device})
        self.assertEqual((answer["version"], answer["chip_identity"]), (2, "12345678"))

    def test_programmer_is_loaded_and_answers(self):
        with handset("--boot-loader") as sim, tempfile.TemporaryDirectory() as folder:
            ports = {7: sim.device}
            self.expect(0, "-p", "7", "boot", "load", make_file(folder, "programmer", self.PROGRAMMER), ports=ports)
            self.assertEqual(self.expect_json(0, "-p", "7", "flash", "info", ports=ports)["state"], "programmer")

    def test_handset_is_sent_into_its_boot_loader_flashed_and_restarted(self):
        with tempfile.TemporaryDirectory() as folder:
            link = os.path.join(folder, "port")
            files = [make_file(folder, "programmer", self.PROGRAMMER), make_file(folder, "software", self.SOFTWARE)]
            ports = {7: link}
            with handset("--loader", "boot", "--link", link):
                self.assertEqual(self.revision(ports), "VHS-1.0.105-R2")
                answer = self.expect_json(0, "-p", "7", "flash", "all", "--enter", "--reset", *files, ports=ports)
                self.assertEqual(answer["bytes"], len(self.SOFTWARE))
                self.assertEqual(self.revision(ports), "VHS-2.0.1")

    def test_failures_say_what_is_wrong(self):
        with tempfile.TemporaryDirectory() as folder:
            programmer = make_file(folder, "programmer", self.PROGRAMMER)
            nothing = make_file(folder, "nothing", b"no programmer")
            for code, options, words in (
                    (3, None, ["boot", "info", "--wait", "0"]),
                    (6, ["--fault", "wrong=7,nth=1"], ["boot", "info"]),
                    (7, [], ["boot", "load", nothing]),
                    (9, ["--fault", "hang-up,nth=3"], ["boot", "load", programmer]),
                    (9, ["--fault", "hang-up,nth=3"], ["flash", "all", programmer, programmer]),
                    (10, [], ["boot", "load", "/nonexistent/programmer"]),
                    (10, [], ["flash", "all", "/nonexistent/programmer", programmer]),
                    (10, [], ["flash", "all", programmer, "/nonexistent/image"])):
                with self.subTest(words=words):
                    if options is None:
                        self.expect_json(code, "-p", "7", *words, ports={7: "/nonexistent/tty"})
                        continue
                    with handset("--boot-loader", *options) as sim:
                        self.expect_json(code, "-p", "7", *words, ports={7: sim.device})


class Simulation(ToolTest):
    def test_ftm_commands_need_factory_test_mode_and_answer_in_it(self):
        with handset() as sim:
            ports = {7: sim.device}
            self.expect(7, "-p", "7", "ftm", "chan", "9612", ports=ports)
            self.expect(0, "-p", "7", "mode", "ftm", ports=ports)
            answer = self.expect_json(0, "-p", "7", "ftm", "mode", "10", ports=ports)
            self.assertEqual((answer["rf_mode"], answer["mode_id"]), (10, 2))
            self.expect(0, "-p", "7", "ftm", "chan", "9750", "--rf-mode", "9", ports=ports)
            self.expect(0, "-p", "7", "ftm", "tx", "on", ports=ports)
            self.expect(0, "-p", "7", "ftm", "cmd", "SET_TX_POWER_DBM", "D0", "07", ports=ports)
            answer = self.expect_json(0, "-p", "7", "ftm", "cmd", "GET_HDET_FROM_TX_SWEEP_CAL", ports=ports)
            self.assertEqual(len(answer["response"].split()), 2)
            self.expect(0, "-p", "7", "ftm", "--code", "59", "cmd", "53", ports=ports)
            self.expect(2, "-p", "7", "ftm", "cmd", "NO_SUCH_COMMAND", ports=ports)
            self.expect(2, "-p", "7", "ftm", "mode", "9", "--code", "60", ports=ports)

    def test_ftm_list_and_bands_need_no_handset(self):
        commands = self.expect_json(0, "ftm", "list")["commands"]
        self.assertIn({"id": 53, "name": "GET_RX_AGC"}, commands)
        self.assertEqual(commands, sorted(commands, key=lambda row: row["id"]))
        bands = self.expect_json(0, "band", "list")["bands"]
        egsm = [row for row in bands if row["band"] == 0 and row["direction"] == "uplink"]
        self.assertEqual([(row["first"], row["last"]) for row in egsm], [(0, 124), (975, 1023)])
        self.assertEqual([row["direction"] for row in bands if row["band"] == 700], ["any"])
        self.assertEqual(self.expect(0, "band", "ul", "0", "1000").out, "885.2000 MHz\n")
        self.assertAlmostEqual(self.expect_json(0, "band", "dl", "0", "1000")["mhz"], 930.2)
        self.expect(2, "band", "ul", "101", "100")

    def test_sim_ends_cleanly_on_request(self):
        for number in (signal.SIGINT, signal.SIGTERM):
            with self.subTest(signal=number), handset() as sim:
                sim.send_signal(number)
                self.assertEqual(sim.wait(timeout=PATIENCE), 0)
                self.assertFalse(os.path.exists(sim.device))

    def test_mistyped_faults_are_usage(self):
        self.expect_json(2, "sim", "--fault", "frobnicate")


class Backups(ToolTest):
    """NV items to and from PKV files; an item is given its value by a write request of the raw verb."""

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.file = os.path.join(folder.name, "phone.pkv")
        self.ports = {}

    @contextlib.contextmanager
    def handset(self, *options, values=()):
        with handset(*options) as sim:
            self.ports = {7: sim.device}
            for item, value in values:
                self.expect(0, "-p", "7", "raw", f"27{item:02X}00{value:02X}" + "00" * 127, ports=self.ports)
            yield sim

    def nv(self, code, verb, *options):
        return self.expect_json(code, "-p", "7", "nv", verb, self.file, *options, ports=self.ports)

    def results(self, answer):
        return {row.get("id", row.get("path")): row["result"] for row in answer["items"]}

    def test_a_backup_is_restored_to_another_handset(self):
        with self.handset(values=[(1, 0x11), (2, 0x22)]):
            counts = self.nv(0, "backup", "--items", "0-20")["counts"]
            self.assertEqual((counts["read"], counts["without-value"]), (3, 18))
            self.assertEqual(self.results(self.nv(0, "verify")), {0: "equal", 1: "equal", 2: "equal"})
        with self.handset(values=[(1, 0x11)]):
            expected = {0: "equal-already", 1: "equal-already", 2: "would-be-written"}
            self.assertEqual(self.results(self.nv(0, "restore", "--dry-run")), expected)
            answer = self.nv(8, "verify")
            self.assertEqual(self.results(answer)[2], "different")
            self.assertEqual(answer["items"][2]["status"], 5)
            self.assertEqual(self.results(self.nv(0, "restore")), {0: "skipped", 1: "written", 2: "written"})
            text = self.expect(0, "-p", "7", "nv", "verify", self.file, ports=self.ports).out
            self.assertEqual(text, "3 equal\n")

    def test_refused_items_do_not_keep_the_others_from_being_written(self):
        with self.handset("--esn", "0x1234", values=[(1, 0x11), (2, 0x22)]):
            self.nv(0, "backup", "--items", "0-20")
        with self.handset("--esn", "0x5678"):
            answer = self.nv(7, "restore")
            self.assertEqual(self.results(answer), {0: "refused", 1: "written", 2: "written"})
            done = self.expect(7, "-p", "7", "nv", "restore", self.file, ports=self.ports)
            self.assertIn("item 0: refused, status 7\n2 written, 1 refused\n", done.err)

    def test_a_lost_handset_leaves_the_file_as_it_was(self):
        with open(self.file, "w", encoding="ascii") as file:
            file.write("precious")
        with self.handset("--fault", "hang-up,nth=9,of=26"):
            answer = self.nv(9, "backup", "--items", "0-20")
            self.assertEqual(answer["counts"]["not-reached"], 21 - 7)
        with open(self.file, encoding="ascii") as file:
            self.assertEqual(file.read(), "precious")
        self.assertEqual(os.listdir(os.path.dirname(self.file)), ["phone.pkv"])

    def test_mistakes_are_told(self):
        with self.handset():
            self.assertIn("phone.pkv", self.nv(10, "restore")["error"]["text"])
            for items in ("9-1", "x", "0-70000", ""):
                self.nv(2, "backup", "--items", items)
            self.nv(2, "backup", "--subscriptions", "0")
            self.assertIn("no item", self.nv(7, "backup", "--items", "5")["error"]["text"])


class Files(ToolTest):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = folder.name
        self.ports = {}

    def path(self, *names):
        return os.path.join(self.folder, *names)

    def add(self, name, content):
        os.makedirs(os.path.dirname(self.path(name)), exist_ok=True)
        with open(self.path(name), "wb") as file:
            file.write(content)
        return self.path(name)

    def content(self, *names):
        with open(self.path(*names), "rb") as file:
            return file.read()

    def fs(self, code, *words):
        return self.expect_json(code, "-p", "7", "fs", *words, ports=self.ports)

    @contextlib.contextmanager
    def handset(self, *options):
        with handset(*options) as sim:
            self.ports = {7: sim.device}
            yield sim

    def test_folders_travel_both_ways_and_equal_files_stay(self):
        contents = {"one": b"1\r\n\0", "sub/empty": b"", "sub/deep/large": bytes(range(256)) * 12}
        for name, content in contents.items():
            self.add("from/" + name, content)
        with self.handset():
            answer = self.fs(0, "put", "-r", self.path("from"), ":/to")
            self.assertEqual((answer["copied"], answer["equal"], answer["verified"]), (3, 0, True))
            self.add("from/one", b"2\r\n\0")
            answer = self.fs(0, "put", "-r", self.path("from") + "/.", ":/to")
            self.assertEqual({row["from"].rsplit("/", 1)[1]: row["result"] for row in answer["files"]},
                             {"one": "copied", "empty": "equal", "large": "equal"})
            self.assertEqual(self.fs(0, "get", "-r", ":/to", self.path("back"))["copied"], 3)
            self.add("back/to/one", b"3\r\n\0")
            self.fs(0, "get", "-r", ":/to", self.path("back"))
            tree = self.expect(0, "-p", "7", "fs", "tree", "/to", ports=self.ports).out
            self.assertEqual(self.expect(0, "-p", "7", "fs", "cat", ":/to/one", ports=self.ports).out, "2\n\0")
        self.assertEqual(tree, "/to\n|-- one\n`-- sub/\n    |-- deep/\n    |   `-- large\n    `-- empty\n")
        for name, content in contents.items():
            expected = b"2\r\n\0" if name == "one" else content
            self.assertEqual(self.content("back", name), expected)
            self.assertEqual(self.content("back", "to", name), expected)

    def test_names_are_changed_and_told(self):
        local = self.add("f", b"x" * 700)
        with self.handset():
            self.fs(0, "mkdir", "--parents", ":/a/b/c", "/d")
            self.fs(0, "put", local, ":/a/b")
            self.fs(0, "put", "--item", local, ":/item")
            self.fs(0, "put", self.add("g", b"other"), ":/item")
            self.assertEqual(self.fs(0, "stat", "/item")["type"], "item")
            self.fs(0, "mv", "/a/b/f", "/d")
            self.fs(0, "ln", "/d/f", "/link")
            status = self.fs(0, "stat", "/link")
            self.assertEqual((status["type"], status["size"]), ("file", 700))
            self.assertEqual([(row["name"], row["type"]) for row in self.fs(0, "ls")["entries"]],
                             [("a", "directory"), ("d", "directory"), ("item", "item"), ("link", "link")])
            self.assertEqual(self.fs(0, "df")["used"], 1024 + 512)
            self.fs(0, "sync")
            self.fs(0, "rm", "/link", "/d/f", "/item")
            self.fs(0, "rmdir", "/a/b/c", "/a/b")
            self.fs(0, "put", local, ":/file")
            for words, text in ((("rmdir", "/"), "invalid"), (("rm", "/none"), "no such file"),
                                (("get", ":/none"), "no such file"), (("ls", "/none"), "no such file"),
                                (("mkdir", "/none/x"), "no such file"), (("put", local, ":/none/x"), "no such file"),
                                (("mkdir", "/file"), "exists already")):
                with self.subTest(words=words):
                    self.assertIn(text, self.fs(7, *words)["error"]["text"])

    def test_mistakes_are_found_before_anything_is_copied(self):
        with self.handset():
            self.fs(0, "mkdir", "/d")
            self.fs(0, "put", self.add("f", b"1"), ":/d")
            for code, *words in ((2, "get", "f", ":/f"), (2, "put", ":/f", "f"), (2, "get", ":/d"), (2, "cat", "/d"),
                                 (2, "put", self.folder, ":/x"), (10, "put", self.path("none"), ":/x"),
                                 (2, "put", self.add("f", b"1"), ":/" + "n" * 300),
                                 (10, "put", "--item", self.add("g", b"1" * 1025), ":/x"),
                                 (10, "get", "-r", ":/d", self.path("no", "where")),
                                 (10, "get", ":/d/f", os.devnull)):
                with self.subTest(words=words):
                    self.fs(code, *words)
            self.assertEqual([row["name"] for row in self.fs(0, "ls")["entries"]], ["d"])

    def test_changed_bytes_and_a_full_handset_are_noticed(self):
        local = self.add("f", bytes(1200))
        with self.handset("--efs-bad-offset", "1000"):
            self.assertEqual(self.fs(8, "put", local, ":/f")["mismatch"]["offset"], 1000)
            self.fs(0, "put", "--no-verify", local, ":/f")
        with self.handset("--efs-blocks", "2"):
            self.assertIn("no room", self.fs(7, "put", local, ":/f")["error"]["text"])

    def test_names_of_the_handset_stay_inside_the_target(self):
        names = ("..", ".", "../../out", "/etc", "a\\b", "C:x", "con", "Lpt1.txt", "dot.", "new\nline", "del\x7f")
        shown = [word for number, name in enumerate(names) for word in ("--efs-show", f"n{number}", name)]
        local = self.add("f", b"1")
        with self.handset(*shown, "--efs-show", "twin", "good"):
            for name in ("good", "twin", *(f"n{number}" for number in range(len(names)))):
                self.fs(0, "put", "--no-verify", local, f":/{name}")
            os.mkdir(self.path("x"))
            answer = self.fs(11, "get", "-r", ":/", self.path("x"))
            tree = self.fs(0, "tree")["entries"]
        # "." and ".." are the directory itself and the one above, in any listing.
        self.assertEqual(len(answer["left_out"]), len(names) - 1)
        self.assertEqual(len(tree), len(names))
        self.assertEqual(sorted(os.listdir(self.folder)), ["f", "x"])
        self.assertEqual(os.listdir(self.path("x")), ["good"])

    def test_interrupted_copy_tells_how_far_it_got_and_leaves_nothing(self):
        local = self.add("f", bytes(200000))
        with self.handset("--fault", "delay=20,of=4B1305"):
            tool = start("-p", "7", "--json", "fs", "put", local, ":/f", ports=self.ports)
            event = json.loads(tool.stderr.readline())
            tool.send_signal(signal.SIGINT)
            out, _ = tool.communicate(timeout=PATIENCE)
            self.assertEqual((tool.returncode, json.loads(out)["error"]["name"]), (130, "interrupted"))
            self.assertEqual(self.fs(0, "ls")["entries"], [])
        self.assertEqual((event["event"], event["subject"], event["total"]), ("progress", local, 400000))
        self.assertGreater(event["done"], 0)
        self.assertGreater(event["seconds_left"], 0)

    def test_terminal_gets_a_bar(self):
        local = self.add("f", bytes(12000))
        ours, theirs = os.openpty()
        with self.handset("--fault", "delay=20,of=4B1305"):
            subprocess.run([KRAL, "-p", "7", "fs", "put", local, ":/f"], env=clean_environment(self.ports), stderr=theirs,
                           stdout=subprocess.DEVNULL, check=True, timeout=PATIENCE)
        os.close(theirs)
        shown = os.read(ours, 65536).decode()
        os.close(ours)
        self.assertRegex(shown, r"\rput .*f  \[#+-+\]  \d+ %  [\d.]+ KiB/s  0:\d\d left")
        self.assertRegex(shown, r"\r *\r$")

    def test_handset_that_vanishes_while_copying_is_lost(self):
        local = self.add("f", bytes(5000))
        with self.handset("--fault", "hang-up,nth=4,of=4B1304"):
            self.fs(0, "put", "--no-verify", local, ":/f")
            answer = self.expect_json(9, "-p", "7", "--time-out", "200", "fs", "get", ":/f", self.path("back"),
                                      ports=self.ports)
            self.assertIn("went away", answer["error"]["text"])
        self.assertEqual(os.listdir(self.folder), ["f"])


class NvItems(ToolTest):
    """NV items by their definitions: those of the examples folder."""
    DEFS = ("--defs", os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../examples/nv_definitions.xml"))

    def test_items_are_written_and_read_by_id_name_and_path(self):
        with handset() as sim:
            ports = {7: sim.device}
            nv = ("-p", "7", "nv")
            written = self.expect_json(0, *nv, "write", "PREFERRED_MODE", "1,513", *self.DEFS, ports=ports)
            self.assertEqual(written["item"], {"id": 10, "name": "PREFERRED_MODE", "value": {"nam": 1, "mode": 513}})
            self.expect(0, *nv, "write", "20002", "-77", *self.DEFS, ports=ports)
            self.expect(0, *nv, "write", "6000", "AABB", ports=ports)
            text = self.expect(0, *nv, "read", "10", "WCDMA_TX_LIMIT", "6000", *self.DEFS, ports=ports).out
            self.assertRegex(text, r"10 PREFERRED_MODE\n  nam +1\n  mode +513\n")
            self.assertRegex(text, r"/nv/item_files/rfnv/00020002 WCDMA_TX_LIMIT\n  limit +-77\n")
            self.assertRegex(text, r"6000\n0000 +AA BB 00")
            self.assertEqual(self.expect_json(0, *nv, "read", "6000", ports=ports)["items"][0]["bytes"][:8], "AA BB 00")
            # The handset's word on what it will not do, and the tool's on what makes no sense.
            self.assertIn("5, never written", self.expect_json(7, *nv, "read", "453", "7000", ports=ports)["error"]["text"])
            self.assertIn("7, read-only", self.expect_json(7, *nv, "write", "0", "AA", ports=ports)["error"]["text"])
            self.assertIn("out of the range of mode",
                          self.expect_json(2, *nv, "write", "10", "1,70000", *self.DEFS, ports=ports)["error"]["text"])
            self.expect_json(2, *nv, "read", "NO_SUCH_ITEM", *self.DEFS, ports=ports)
            self.expect_json(2, *nv, "dump", ports=ports)
            self.expect_json(10, *nv, "read", "10", "--defs", "/nonexistent", ports=ports)

    def test_dump_makes_files_that_compare_and_validate(self):
        with handset() as sim, tempfile.TemporaryDirectory() as folder:
            ports = {7: sim.device}
            nv = ("-p", "7", "nv")
            pkv = [os.path.join(folder, name) for name in ("first.pkv", "second.pkv")]
            source, page = os.path.join(folder, "source.xml"), os.path.join(folder, "page.html")
            self.expect(0, *nv, "dump", *self.DEFS, "--pkv", pkv[0], ports=ports)
            self.expect(0, *nv, "write", "FTM_MODE", "1", *self.DEFS, ports=ports)
            answer = self.expect_json(0, *nv, "dump", *self.DEFS, "--pkv", pkv[1], "--source", source, ports=ports)
            self.assertEqual([item["name"] for item in answer["items"]], ["ESN", "FTM_MODE"])
            self.assertEqual(len(self.expect_json(0, *nv, "dump", "--items", "450-460", ports=ports)["items"]), 1)
            self.expect(0, "nv", "diff", *pkv, page, *self.DEFS)
            with open(page, encoding="utf-8") as file:
                self.assertIn("enabled: 0 to 1", file.read())
            subprocess.run(["xmllint", "--noout", source, self.DEFS[1]], check=True, timeout=PATIENCE)
            self.expect_json(10, "nv", "diff", pkv[0], source, page)

    def test_defs_need_no_handset(self):
        answer = self.expect_json(0, "nv", "defs", self.DEFS[1])
        by_name = {item["name"]: item for item in answer["definitions"]}
        self.assertEqual(len(by_name), 29)
        self.assertEqual(by_name["CHANNEL_OFFSET"]["max_index"], 3)
        self.assertEqual([form.get("variant") for form in by_name["SERVER_ADDRESS"]["forms"]], ["4", "6", None])
        self.assertEqual(by_name["WCDMA_TX_LIMIT"]["forms"][0]["members"],
                         [{"name": "limit", "type": "signed word16", "count": 1}])
        self.assertIn("3101 CHANNEL_OFFSET [0-3]\n", self.expect(0, "nv", "defs", self.DEFS[1]).out)


class Flash(ToolTest):
    PROGRAMMER = (b":020000040002F8\n:10000000000102030405060708090A0B0C0D0E0F78\n"
                  b":10001000101112131415161718191A1B1C1D1E1F68\n:0400000500020000F5\n:00000001FF\n")

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = folder.name
        self.programmer = self.add("programmer.hex", self.PROGRAMMER)

    def path(self, name):
        return os.path.join(self.folder, name)

    def add(self, name, content):
        with open(self.path(name), "wb") as file:
            file.write(content)
        return self.path(name)

    def flash(self, code, sim, *words):
        return self.expect_json(code, "-p", "7", "--time-out", "2000", "flash", *words, ports={7: sim.device})

    def test_from_diagnostic_mode_to_images_in_flash(self):
        image = self.add("image.bin", os.urandom(70000))
        with handset("--flash-block", "4096", "--flash-window", "8") as sim:
            self.assertEqual(self.flash(0, sim, "info")["state"], "diagnostic")
            self.assertIn("diagnostic mode", self.flash(7, sim, "write", image)["error"]["text"])
            loaded = self.flash(0, sim, "load", self.programmer)
            self.assertEqual((loaded["bytes"], loaded["block_size"], loaded["window"]), (32, 4096, 8))
            self.assertEqual(self.flash(0, sim, "info")["state"], "programmer")
            written = self.flash(0, sim, "write", "--type", "2", image, "9:" + self.programmer)
            self.assertEqual(written["bytes"], 70032)
            self.assertEqual([row.get("type") for row in written["written"]], [None, 9])

    def test_partition_tables_and_refusals(self):
        tables = [self.add(f"table{i}", b"\x01NAME" + bytes([i])) for i in (1, 2)]
        image = self.add("image.bin", bytes(100))
        with handset() as sim:
            self.flash(0, sim, "load", self.programmer)
            self.flash(0, sim, "write", "--security", "1", "--partition", tables[0], image)
            refusal = self.flash(7, sim, "write", "--partition", tables[1], image)["error"]
            self.assertIn("--override", refusal["hint"])
            self.flash(0, sim, "write", "--partition", tables[1], "--override", image)
            self.flash(10, sim, "write", "--partition", self.add("long", bytes(513)), image)

    def test_broken_pipelines_tell_what_happened(self):
        image = self.add("image.bin", os.urandom(20000))
        for fault, code, name in (("wrong=13,nth=3,of=08", 6, "link"), ("hang-up,nth=5,of=08", 9, "lost")):
            with self.subTest(fault), handset("--fault", fault) as sim:
                self.flash(0, sim, "load", self.programmer)
                self.assertEqual(self.flash(code, sim, "write", image)["error"]["name"], name)

    def test_interrupted_write_ends_at_once_while_the_handset_is_silent(self):
        image = self.add("image.bin", bytes(20000))
        with handset("--fault", "lose,from=3,of=08") as sim:
            self.flash(0, sim, "load", self.programmer)
            log = self.path("log")
            tool = start("-p", "7", "--json", "--log", log, "flash", "write", image, ports={7: sim.device})
            deadline = time.monotonic() + PATIENCE
            while time.monotonic() < deadline:
                with contextlib.suppress(FileNotFoundError), open(log, encoding="latin-1") as file:
                    if "Streaming start" in file.read():
                        break
                time.sleep(0.01)
            tool.send_signal(signal.SIGINT)
            began = time.monotonic()
            out, _ = tool.communicate(timeout=PATIENCE)
            self.assertEqual((tool.returncode, json.loads(out)["error"]["name"]), (130, "interrupted"))
            self.assertLess(time.monotonic() - began, 3)

    def test_files_are_checked_and_planned_without_a_handset(self):
        binary = self.add("image.bin", b"x" * 40000)
        plan = self.expect_json(0, "flash", "write", "--dry-run", "--block-size", "1000", binary, "3:" + self.programmer)
        self.assertEqual((plan["bytes"], plan["blocks"]), (40032, 41))
        self.assertEqual(plan["images"][1]["regions"], [{"base": 0x20000, "size": 32}])
        plan = self.expect_json(0, "flash", "load", "--dry-run", "--packet", "20", self.programmer)
        self.assertEqual(plan["writes"], 4)
        large = self.expect_json(0, "flash", "load", "--dry-run", "--packet", "65535", self.programmer)
        self.assertEqual(large["writes"], 1)
        self.assertIn("0x00020000 to 0x0002001F", self.expect(0, "flash", "verify-image", self.programmer).out)
        startless = self.add("startless.hex", self.PROGRAMMER.replace(b":0400000500020000F5\n", b""))
        broken = self.add("broken.hex", self.PROGRAMMER.replace(b"F78", b"F79"))
        two = self.add("two.hex", b":020000040001F9\n:0100000055AA\n:020000040800F2\n:0100000055AA\n:00000001FF\n")
        for words in (("load", startless), ("load", binary), ("write", broken), ("write", two),
                      ("write", self.add("empty", b"")), ("verify-image", self.path("missing")), ("hex", two, "x"),
                      ("write", "--dry-run", "--header", self.add("long", bytes(513)), binary),
                      ("write", "--dry-run", "--partition", self.path("missing"), binary)):
            self.expect_json(10, "flash", *words)

    def test_hex_files_become_binaries_and_back(self):
        content = os.urandom(5000)
        binary, hexfile, back = self.add("a.bin", content), self.path("a.hex"), self.path("b.bin")
        self.expect(0, "flash", "hex", "--base", "0x30000", binary, hexfile)
        answer = self.expect_json(0, "flash", "hex", hexfile, back)
        self.assertEqual((answer["base"], answer["bytes"]), (0x30000, 5000))
        with open(back, "rb") as file:
            self.assertEqual(file.read(), content)
        self.expect_json(2, "flash", "hex", "--base", "0x100", binary, hexfile)
        self.expect_json(2, "flash", "hex", "--base", "0x30000", hexfile, back)


class Counting(unittest.TextTestResult):
    passed = 0

    def addSuccess(self, test):
        super().addSuccess(test)
        self.passed += 1


if __name__ == "__main__":
    KRAL = os.path.abspath(sys.argv[1])
    suite = unittest.main(argv=[sys.argv[0], *sys.argv[2:]], exit=False,
                          testRunner=unittest.TextTestRunner(resultclass=Counting, verbosity=1))
    bad = len(suite.result.failures) + len(suite.result.errors)
    print(f"kral_tool: {suite.result.passed} passed, {bad} failed")
    sys.exit(0 if suite.result.passed > 0 and bad == 0 else 1)
