"""Logs and events: switched, shown, captured, played and counted."""
import array
import fcntl
import json
import os
import re
import signal
import struct
import termios
import time

import pcapng
from tool import PATIENCE, ToolTest, run, start, wait_until


class Traffic(ToolTest):
    PAGE_ROW = re.compile(r"<tr><td>([^<]*)</td><td>[^<]*</td><td class=\"count\">(\d+)</td>")
    RATES = ("--logs", "2000", "--events", "200", "--messages", "200", "--burst", "5")

    def stream(self, *words):
        """The NDJSON objects of a verb, the result last."""
        objects = [json.loads(line) for line in self.expect(0, *words, "--json").out.splitlines()]
        self.assertTrue(objects[-1]["ok"])
        return objects

    def test_logs_are_switched_captured_played_and_counted(self):
        file, names = self.path("capture"), self.add("names", b"# logs\n0x1001 Paging\n")
        with self.handset(*self.RATES):
            self.ask(0, "log", "on", "0x1001", "0x4001-0x4003", "--category", "5")
            rows = self.ask(0, "log", "list", "--names", names)["equipment_ids"]
            self.assertEqual({row["equipment_id"]: row["on"] for row in rows}[1], [{"code": 4097, "name": "Paging"}])
            self.assertEqual([code["code"] for row in rows for code in row["on"]], [0x1001, 0x4001, 0x4002, 0x4003])
            done = self.ask(0, "log", "capture", file, "--count", "300")
            self.assertGreaterEqual(done["packets"], 300)
            self.assertEqual(done["lost"], 0)
            played = self.stream("log", "play", file)
            self.assertEqual(len(played) - 1, done["packets"])
            kinds = {packet["what"] for packet in played[:-1]}
            self.assertLessEqual(kinds, {"log 0x1001", "log 0x4001", "log 0x4002", "log 0x4003", "message 5"})
            self.assertTrue(all(len(packet["bytes"].split()) > 2 for packet in played[:-1]))
            self.assertTrue(all(abs(packet["microseconds"] / 1e6 - time.time()) < 600 for packet in played[:-1]))
            today = time.strftime("%Y-%m-%dT", time.gmtime(played[0]["microseconds"] / 1e6))
            first = self.expect(0, "log", "play", file).out.split("\n")[0]
            self.assertRegex(first, rf"^{today}\d\d:\d\d:\d\d\.\d{{6}}Z  (log 0x|message )")
            rows = self.expect_json(0, "log", "stats", file, "--names", names)["rows"]
            self.assertEqual(sum(row["packets"] for row in rows), done["packets"])
            self.assertIn("Paging", [row.get("name") for row in rows])
            self.assertIn("Paging", self.expect(0, "log", "stats", file, "--names", names).out)
            page = self.path("page.html")
            self.expect_json(0, "log", "stats", file, "--names", self.add("evil", b"0x1001 <b>Paging\n"), "--html", page)
            drawn = self.content(page).decode()
            self.assertEqual([(what, int(count)) for what, count in self.PAGE_ROW.findall(drawn)],
                             [(row["what"], row["packets"]) for row in rows])
            self.assertIn("&lt;b>Paging", drawn)
            self.assertNotRegex(drawn, r"<b>|https?:|NaN|class=\"dropped\"")
            self.assertGreaterEqual(len(re.findall(r"M\d+ 28v-28(?!\d)", drawn)), len(rows))  # the fullest column of each row
            self.expect_json(10, "log", "stats", file, "--html", "/nonexistent/page")
            before = self.content(file)
            os.symlink(file, self.path("link"))
            self.expect_json(2, "log", "stats", file, "--html", self.path("link"))
            self.assertEqual(self.content(file), before)
            live = self.ask(0, "log", "stats", "--count", "100", "--html", page)
            self.assertIn("(" + self.ports[7] + ")", self.content(page).decode())
            self.assertGreaterEqual(live["counters"]["collected"], 100)
            self.assertGreaterEqual(live["counters"]["most_waiting"], 1)
            self.assertGreater(live["rows"][0]["per_second"], 0)
            self.ask(0, "log", "off", "--all", "--category", "5")
            rows = self.ask(0, "log", "list")["equipment_ids"]
            self.assertEqual([code for row in rows for code in row["on"]], [])
        os.truncate(file, os.path.getsize(file) - 1)
        cut = self.stream("log", "play", file)
        self.assertEqual((len(cut) - 1, cut[-1]["cut"]), (done["packets"] - 1, True))

    def test_a_capture_goes_on_in_file_after_file_and_may_be_compressed(self):
        plain, small = self.path("plain"), self.path("small")
        with self.handset("--logs", "20000"):
            self.ask(0, "log", "on", "0x1001")
            self.ask(0, "log", "capture", plain, "--count", "3000")
            packets = self.ask(0, "log", "capture", small, "--count", "3000", "--compress")["packets"]
            done = self.ask(0, "log", "capture", self.path("night.cap"), "--count", "9000", "--rotate", "64K,1h")
            kept = self.ask(0, "log", "capture", self.path("last.cap"), "--count", "9000", "--rotate", "64K", "--keep",
                            "2", "--compress")
            for wrong in (("--rotate", "100m"), ("--rotate", "0K"), ("--rotate", "1h,2h"), ("--rotate", "K"),
                          ("--rotate", "10"), ("--rotate", "1K"), ("--keep", "3")):
                self.ask(2, "log", "capture", self.path("wrong"), "--count", "1", *wrong)
            self.assertFalse(os.path.exists(self.path("wrong")))
        parts = sorted(name for name in os.listdir(self.folder) if name.startswith("night-"))
        self.assertEqual(parts, [f"night-{number + 1:05}.cap" for number in range(len(parts))])
        self.assertGreater(len(parts), 3)
        self.assertEqual(sum(self.stream("log", "play", self.path(part))[-1]["packets"] for part in parts),
                         done["packets"])
        self.assertLessEqual(max(os.path.getsize(self.path(part)) for part in parts), 65536)
        self.assertLessEqual(len([name for name in os.listdir(self.folder) if name.startswith("last-")]), 2)
        self.assertGreaterEqual(kept["packets"], 9000)

        self.assertLess(os.path.getsize(small), os.path.getsize(plain) / 2)
        played = self.stream("log", "play", small)
        self.assertEqual(len(played) - 1, packets)
        since = time.strftime("%Y-%m-%dT%H:%M:%S", time.gmtime(played[1000]["microseconds"] // 1000000))
        since += f".{played[1000]['microseconds'] % 1000000:06}Z"
        later = [each for each in played[:-1] if each["microseconds"] >= played[1000]["microseconds"]]
        self.assertEqual(self.stream("log", "play", small, "--from", since)[:-1], later)
        again = self.path("again")
        self.assertEqual(self.expect_json(0, "log", "export", small, self.path("small.pcapng"))["packets"], packets)
        self.assertEqual(self.expect_json(0, "log", "import", self.path("small.pcapng"), again)["packets"], packets)
        self.assertEqual(self.stream("log", "play", again)[:-1], played[:-1])
        os.truncate(small, os.path.getsize(small) * 3 // 4)
        cut = self.expect(0, "log", "stats", small)
        self.assertIn("is cut or damaged behind its last whole packet", cut.err)
        rest = self.expect_json(0, "log", "stats", small)
        self.assertTrue(rest["cut"])
        self.assertGreater(sum(row["packets"] for row in rest["rows"]), packets // 10)

    def test_part_of_a_capture_is_played(self):
        # Two packets on each side of a midnight, ten seconds apart.
        midnight = 20000 * 86400
        file = self.add("capture", b"KRALCAP\x1A" + struct.pack("<2HI", 1, 16, 0) + b"".join(
            struct.pack("<Q2H2B", (midnight + at) * 1000000, 2, 0xFFFD, 16, at & 0xFF) for at in (-20, -10, 0, 10)))
        day = time.strftime("%Y-%m-%d", time.gmtime(midnight))
        for words, packets in (((), 4), (("--from", "23:59:50"), 3), (("--from", "23:59:45", "--to", f"{day}T00:00:05"), 2),
                               (("--to", "23:59:50"), 2), (("--to", "12:00"), 0), (("--to", f"{day}T00:00"), 3), (("--from", f"{day}T00:00:00.5Z"), 1),
                               (("--from", "12:00"), 4), (("--from", f"{day} 01:00"), 0)):
            with self.subTest(words=words):
                self.assertEqual(self.stream("log", "play", file, *words)[-1]["packets"], packets)
        self.assertIn("23:59:40", self.expect(0, "log", "play", file, "--to", "12:00").err)
        refused = self.expect_json(2, "log", "play", file, "--from", "23:59:45", "--to", "00:00:05")
        self.assertIn(f"--to {day}T00:00:05", refused["error"]["hint"])
        for wrong in ("", "24:00", "1:2", "12:60", "12:00:0", "2026-02-30T01:00", "noon", "12:00x"):
            self.expect_json(2, "log", "play", file, "--from", wrong)

    def test_captures_become_pcapng_files_and_captures_again(self):
        capture, file, again = self.path("capture"), self.path("capture.pcapng"), self.path("again")
        with self.handset(*self.RATES):
            packets = self.ask(0, "log", "capture", capture, "--on", "0x1001", "--count", "50")["packets"]
            self.expect(0, "-p", "7", "--trace", self.path("trace"), "log", "capture", self.path("x"), "--count", "20")
        self.expect_json(2, "log", "export", capture, "-")
        self.assertEqual(self.expect_json(0, "log", "export", capture, file)["packets"], packets)
        self.assertEqual(len(pcapng.packets(self.content(file))), packets)
        done = self.expect_json(0, "log", "import", file, again)
        self.assertEqual((done["packets"], done["skipped"], done["cut"]), (packets, 0, False))
        self.assertEqual(self.content(again), self.content(capture))
        # What a trace has of logs is a capture, too.
        done = self.expect_json(0, "log", "import", self.path("trace"), again)
        self.assertGreaterEqual(done["packets"], 20)
        self.assertGreaterEqual(done["skipped"], 2)
        os.truncate(capture, os.path.getsize(capture) - 1)
        cut = self.expect(0, "log", "export", capture, file)
        self.assertIn("is cut or damaged", cut.err)
        self.assertEqual(len(pcapng.packets(self.content(file))), packets - 1)
        # Foreign files and places that cannot be written leave what was there.
        before = self.content(file)
        self.expect_json(10, "log", "export", self.add("foreign", b"nothing"), file)
        self.expect_json(10, "log", "import", capture, file)
        self.expect_json(10, "log", "export", capture, self.path("no", "folder"))
        self.assertEqual(self.content(file), before)
        # A file is not made of itself, by whatever name.
        for verb, source in (("export", capture), ("import", file)):
            before = self.content(source)
            for link, make in (("symbolic", os.symlink), ("hard", os.link)):
                make(source, self.path(verb + link))
            for target in (source, self.path(verb + "symbolic"), self.path(verb + "hard")):
                with self.subTest(target=target):
                    self.assertIn("is being read", self.expect_json(10, "log", verb, source, target)["error"]["text"])
                    self.assertEqual(self.content(source), before)

    def test_events_are_shown_as_they_come_and_from_a_file(self):
        file, names = self.path("capture"), self.add("names", b"291,Band change\n")
        with self.handset(*self.RATES):
            tail = ("-p", "7", "event", "tail")
            shown = self.stream(*tail, "--on", "291", "7", "--names", names, "--count", "20")
            self.assertEqual({(event["id"], event["name"]) for event in shown[:-1]}, {(291, "Band change"), (7, "")})
            self.assertEqual(len(shown), 21)
            for event in shown[:-1]:
                self.assertIn(len(event["time_stamp"].split()), (2, 8))
            self.assertLessEqual({1, 2}, {len(event["payload"].split()) for event in shown[:-1]})
            self.ask(0, "log", "capture", file, "--count", "20")
            self.assertGreaterEqual(self.stream("event", "tail", "--file", file)[-1]["events"], 160)
            self.ask(0, "event", "off", "291")
            self.assertEqual({event["id"] for event in self.stream(*tail, "--count", "20")[:-1]}, {7})
            self.ask(0, "event", "off", "--all")
            self.assertEqual(len(self.stream(*tail, "--seconds", "0.2")), 1)

    def test_interrupt_is_the_ordinary_end_of_a_capture_and_a_lost_handset_is_not(self):
        file = self.path("capture")
        for end, code in ((lambda sim, process: process.send_signal(signal.SIGINT), 0),
                          (lambda sim, process: self.unplug(sim), 9)):
            with self.subTest(code=code), self.plugged_handset(*self.RATES) as sim:
                process = start("-p", "7", "--json", "log", "capture", file, "--on", "0x1001", ports=self.ports)
                wait_until(lambda: os.path.exists(file) and os.path.getsize(file) > 1000)
                end(sim, process)
                out, err = process.communicate(timeout=PATIENCE)
                self.assertEqual(process.returncode, code, err)
                packets = len(self.stream("log", "play", file)) - 1
                self.assertGreater(packets, 0)
                if code == 0:
                    self.assertEqual(packets, json.loads(out)["packets"])
            os.remove(file)

    def test_a_handset_whose_answers_stand_behind_its_logs_is_told_as_such(self):
        with self.handset("--logs", "2000", "--rate", "20k"):
            late = r"COM7 .* sends [0-9]+ packets/s and answers late"
            error = self.ask(5, "log", "on", "--all", "--time-out", "300")["error"]
            self.assertRegex(error["hint"], late)
            error = self.ask(5, "info", "--time-out", "300")["error"]
            self.assertRegex(error["text"], f"^{late}$")
            self.assertIn("kral log off --all", error["hint"])
            port = next(row for row in self.expect_json(0, "ports", "--probe")["ports"] if row["port"] == 7)
            self.assertEqual(port["state"], "handset")
            error = self.expect_json(5, "-p", "esn:12345678", "info")["error"]
            self.assertRegex(error["text"], r"COM7 .* did not answer in time$")
            self.assertRegex(self.ask(5, "doctor", "--seconds", "0", "--time-out", "300")["error"]["text"], f"^{late}$")

    def test_reader_may_be_slow_and_may_leave(self):
        def waiting(stream):
            count = array.array("i", [0])
            fcntl.ioctl(stream, termios.FIONREAD, count)
            return count[0]

        with self.handset("--events", "5000", "--burst", "50"):
            tail = ("-p", "7", "--json", "event", "tail", "--on", "7")
            slow = start(*tail, ports=self.ports)
            wait_until(lambda: waiting(slow.stdout) > 60000)  # of 65,536 that a pipe holds
            time.sleep(0.2)
            slow.send_signal(signal.SIGINT)
            out, err = slow.communicate(timeout=PATIENCE)
            self.assertEqual((slow.returncode, json.loads(out.splitlines()[-1])["ok"]), (0, True), err)
            gone = start(*tail, ports=self.ports)
            gone.stdout.readline()
            gone.stdout.close()
            err = gone.stderr.read()
            gone.stderr.close()
            self.assertEqual(gone.wait(timeout=PATIENCE), 1, err)

    def test_files_that_cannot_be_used_are_bad_files(self):
        foreign = self.add("foreign", b"not a capture file at all")
        with self.handset(*self.RATES):
            self.expect_json(10, "log", "play", foreign)
            self.expect_json(10, "log", "play", "/nonexistent/capture")
            kept = self.add("kept", b"old recording")
            self.ask(2, "log", "capture", kept, "--on", "0x1FFF")
            self.assertEqual(self.content("kept"), b"old recording")
            self.ask(10, "log", "capture", "/nonexistent/capture")
            self.ask(10, "log", "capture", "/dev/full")
            error = self.ask(10, "log", "list", "--names", foreign)["error"]
            self.assertEqual((error["function"], error["line"]), ("KRAL_LoadNameTable", 1))
            error = self.ask(10, "log", "list", "--names", "/nonexistent/names")["error"]
            self.assertGreater(error["system_error"], 0)
            self.ask(2, "log", "on")
            self.ask(2, "event", "on", "0x10-0x0F")
            self.ask(2, "event", "on", "0-65535")
            for ignored in (("--count", "1"), ("--seconds", "1"), ("--on", "7"), ("--all",)):
                self.expect_json(2, "event", "tail", "--file", foreign, *ignored)
            self.expect_json(2, "log", "stats", foreign, "--count", "1")
