"""Downloads from diagnostic mode and from the boot loader, plans without a handset, and what failures are called."""
import errno
import json
import os
import signal
import struct
import time

from tool import PATIENCE, ToolTest, holds, start, wait_until


class BootLoader(ToolTest):
    PROGRAMMER = b"VHFP" + struct.pack("<I", 9000) + bytes(range(256)) * 35 + bytes(32)
    SOFTWARE = b"VHSW" + b"VHS-2.0.1\0" + bytes(range(256)) * 30

    def revision(self):
        return self.ask(0, "info")["build"]["software_revision"]

    def test_programmer_is_loaded_and_answers(self):
        with self.handset("--boot-loader", "--chip-id", "0x12345678"):
            self.ask(0, "boot", "load", self.add("programmer", self.PROGRAMMER))
            self.assertEqual(self.ask(0, "flash", "info")["state"], "programmer")
        with self.handset("--boot-loader", "--chip-id", "0x12345678"):
            answer = self.ask(0, "boot", "info")
        self.assertEqual((answer["version"], answer["chip_identity"]), (2, "12345678"))

    def test_handset_is_sent_into_its_boot_loader_flashed_and_restarted(self):
        link = self.path("port")
        files = [self.add("programmer", self.PROGRAMMER), self.add("software", self.SOFTWARE)]
        with self.handset("--loader", "boot", "--link", link):
            self.ports = {7: link}
            self.assertEqual(self.revision(), "VHS-1.0.105-R2")
            answer = self.ask(0, "flash", "all", "--enter", "--reset", *files)
            self.assertEqual(answer["bytes"], len(self.SOFTWARE))
            self.assertEqual(self.revision(), "VHS-2.0.1")

    def test_a_plan_looks_at_all_files_and_touches_no_handset(self):
        programmer, image = self.add("programmer", self.PROGRAMMER), self.add("software", self.SOFTWARE)
        flash = ("flash", "all", "--dry-run", "--reset", programmer)
        with self.handset("--boot-loader"):
            self.ports[8] = "/nonexistent/tty"
            for ports, files, code in (("7-8", ("2:" + image,), 0), ("esn:1", (image,), 0), ("7,7", (image,), 2),
                                       ("7", (image, "/nonexistent/image"), 10), ("slot:999", (image,), 2)):
                with self.subTest(ports=ports, files=files):
                    plan = self.expect_json(code, "-p", ports, "--wait=0", *flash, *files)
                    if ports == "7-8":
                        self.assertEqual((plan["dry_run"], plan["bytes"], plan["enter"], plan["reset"], len(plan["ports"]),
                                          plan["images"][0]["type"]), (True, len(self.SOFTWARE), False, True, 2, 2))
            self.expect_json(2, "--all", *flash, image)
            self.assertIn("nothing was written", self.text(*flash, image))
            for bad in ("/nonexistent/programmer", self.add("empty", b"")):
                self.ask(10, "flash", "all", "--dry-run", bad, image)
            self.ask(0, "flash", "all", programmer, image)  # the hello is still there

    def test_failures_say_what_is_wrong(self):
        programmer = self.add("programmer", self.PROGRAMMER)
        nothing = self.add("nothing", b"no programmer")
        self.ports = {7: "/nonexistent/tty"}
        self.ask(3, "boot", "info", "--wait", "0")
        for code, options, words in (
                (6, ["--fault", "wrong=7,nth=1"], ["boot", "info"]),
                (7, [], ["boot", "load", nothing]),
                (9, ["--fault", "hang-up,nth=3"], ["boot", "load", programmer]),
                (9, ["--fault", "hang-up,nth=3"], ["flash", "all", programmer, programmer]),
                (10, [], ["boot", "load", "/nonexistent/programmer"]),
                (10, [], ["flash", "all", "/nonexistent/programmer", programmer]),
                (10, [], ["flash", "all", programmer, "/nonexistent/image"])):
            with self.subTest(words=words), self.handset("--boot-loader", *options):
                self.ask(code, *words)


class Flash(ToolTest):
    PROGRAMMER = (b":020000040002F8\n:10000000000102030405060708090A0B0C0D0E0F78\n"
                  b":10001000101112131415161718191A1B1C1D1E1F68\n:0400000500020000F5\n:00000001FF\n")

    def setUp(self):
        super().setUp()
        self.programmer = self.add("programmer.hex", self.PROGRAMMER)

    def flash(self, code, *words):
        return self.ask(code, "--time-out", "2000", "flash", *words)

    def test_from_diagnostic_mode_to_images_in_flash(self):
        image = self.add("image.bin", os.urandom(70000))
        tables = [self.add(f"table{i}", b"\x01NAME" + bytes([i])) for i in (1, 2)]
        with self.handset("--flash-block", "4096", "--flash-window", "8"):
            self.assertEqual(self.flash(0, "info")["state"], "diagnostic")
            self.assertIn("diagnostic mode", self.flash(7, "write", image)["error"]["text"])
            loaded = self.flash(0, "load", self.programmer)
            self.assertEqual((loaded["bytes"], loaded["block_size"], loaded["window"]), (32, 4096, 8))
            self.assertEqual(self.flash(0, "info")["state"], "programmer")
            written = self.flash(0, "write", "--type", "2", "--security", "1", "--partition", tables[0], image,
                                 "9:" + self.programmer)
            self.assertEqual(written["bytes"], 70032)
            self.assertEqual([row.get("type") for row in written["written"]], [None, 9])
            self.assertIn("--override", self.flash(7, "write", "--partition", tables[1], image)["error"]["hint"])
            self.flash(0, "write", "--partition", tables[1], "--override", image)
            self.flash(10, "write", "--partition", self.add("long", bytes(513)), image)
            self.assertIn("runs a flash programmer", self.ask(7, "info")["error"]["text"])
            self.flash(0, "write", "--reset", image)
            self.assertEqual(self.flash(0, "info")["state"], "diagnostic")
            self.flash(7, "reset")
            self.flash(0, "load", self.programmer)
            self.flash(0, "reset")
            self.ask(0, "info")

    def test_a_handset_that_answers_slowly_is_in_diagnostic_mode(self):
        with self.handset("--fault", "lag=150"):
            self.assertEqual(self.ask(0, "flash", "info")["state"], "diagnostic")
            self.assertEqual(self.ask(0, "flash", "load", self.programmer)["bytes"], 32)

    def test_a_loader_is_told(self):
        with self.handset():
            self.ask(0, "raw", "3A")
            self.assertIn("runs the loader", self.ask(7, "info")["error"]["text"])
            self.assertEqual(self.flash(0, "info")["state"], "loader")

    def test_broken_pipelines_tell_what_happened(self):
        image = self.add("image.bin", os.urandom(20000))
        for fault, code, name in (("wrong=13,nth=3,of=08", 6, "link"), ("hang-up,nth=5,of=08", 9, "lost")):
            with self.subTest(fault), self.handset("--fault", fault):
                self.flash(0, "load", self.programmer)
                self.assertEqual(self.flash(code, "write", image)["error"]["name"], name)

    def test_interrupted_write_ends_at_once_while_the_handset_is_silent(self):
        image, log = self.add("image.bin", bytes(20000)), self.path("log")
        with self.handset("--fault", "lose,from=3,of=08"):
            self.flash(0, "load", self.programmer)
            process = start("-p", "7", "--json", "--log", log, "flash", "write", image, ports=self.ports)
            wait_until(lambda: holds(log, "Streaming start"))
            process.send_signal(signal.SIGINT)
            began = time.monotonic()
            out, _ = process.communicate(timeout=PATIENCE)
            self.assertEqual((process.returncode, json.loads(out)["error"]["name"]), (130, "interrupted"))
            self.assertLess(time.monotonic() - began, 3)

    def test_files_are_checked_and_planned_without_a_handset(self):
        binary = self.add("image.bin", b"x" * 40000)
        plan = self.expect_json(0, "flash", "write", "--dry-run", "--block-size", "1000", binary,
                                "3:" + self.programmer)
        self.assertEqual((plan["bytes"], plan["blocks"]), (40032, 41))
        self.assertEqual(plan["images"][1]["regions"], [{"base": 0x20000, "size": 32}])
        for packet, writes in (("20", 4), ("65535", 1)):
            plan = self.expect_json(0, "flash", "load", "--dry-run", "--packet", packet, self.programmer)
            self.assertEqual(plan["writes"], writes)
        self.assertIn("0x00020000 to 0x0002001F", self.expect(0, "flash", "verify-image", self.programmer).out)
        startless = self.add("startless.hex", self.PROGRAMMER.replace(b":0400000500020000F5\n", b""))
        broken = self.add("broken.hex", self.PROGRAMMER.replace(b"F78", b"F79"))
        for words in (("load", startless), ("load", binary), ("write", broken), ("write", self.add("empty", b"")),
                      ("verify-image", self.path("missing")), ("hex", broken, "x"),
                      ("write", "--dry-run", "--header", self.add("long", bytes(513)), binary),
                      ("write", "--dry-run", "--partition", self.path("missing"), binary)):
            self.expect_json(10, "flash", *words)
        error = self.expect_json(10, "flash", "verify-image", self.path("missing"))["error"]
        self.assertEqual((error["function"], error["system_error"]), ("KRAL_IMAGE_GetInfo", errno.ENOENT))
        error = self.expect_json(10, "flash", "write", broken)["error"]
        self.assertEqual((error["function"], error["line"]), ("KRAL_IMAGE_GetInfo", 2))

    def test_files_that_lose_data_or_are_too_large_are_refused(self):
        lossy = self.add("lossy.hex", b":020000040002F8\n:02001000AABB89\n:00000001FF\n")
        double = self.add("double.hex", b":020000040000FA\n:0400000001020304F2\n:0400000005060708E2\n:00000001FF\n")
        large = self.add("large.bin", b"")
        os.truncate(large, 5 << 30)
        readers = (("verify-image",), ("write", "--dry-run"), ("load", "--dry-run"), ("hex",))
        for file, reason, verbs in (
                (lossy, f"line 2 of the file {lossy} holds data that have no place in the image: 2 bytes", readers),
                (double, f"line 3 of the file {double} holds other data for addresses that have some: 4 bytes", readers),
                (large, "4 GiB", (("verify-image",), ("write", "--dry-run"), ("hex",)))):
            for verb, *more in verbs:
                words = ["flash", verb, *more, file] + ([self.path("output")] if verb == "hex" else [])
                with self.subTest(words=words):
                    self.assertIn(reason, self.expect_json(10, *words)["error"]["text"])
        self.assertFalse(os.path.exists(self.path("output")))
        full = self.add("full.bin", bytes(65537))
        self.expect_json(2, "flash", "hex", "--base", "0xFFFF0000", full, self.path("output"))

    def test_hex_files_become_binaries_and_back(self):
        content = os.urandom(5000)
        binary, hexfile, back = self.add("a.bin", content), self.path("a.hex"), self.path("b.bin")
        self.expect(0, "flash", "hex", "--base", "0x30000", binary, hexfile)
        answer = self.expect_json(0, "flash", "hex", hexfile, back)
        self.assertEqual((answer["base"], answer["bytes"]), (0x30000, 5000))
        self.assertEqual(self.content("b.bin"), content)
        self.expect_json(2, "flash", "hex", "--base", "0x100", binary, hexfile)
        self.expect_json(2, "flash", "hex", "--base", "0x30000", hexfile, back)
