"""The handset's files: copied both ways, changed, and what is told when that cannot be."""
import json
import os
import signal
import subprocess
import time

import tool
from tool import PATIENCE, ToolTest, clean_environment, start, wait_until


class Files(ToolTest):
    def fs(self, code, *words):
        return self.ask(code, "fs", *words)

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
            tree = self.text("fs", "tree", "/to")
            self.assertEqual(self.text("fs", "cat", ":/to/one"), "2\n\0")
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
                                (("mkdir", "/none/x"), "no such file"), (("put", local, ":/none/x/y"), "no directory /none on"),
                                (("mkdir", "/file"), "exists already")):
                with self.subTest(words=words):
                    error = self.fs(7, *words)["error"]
                    self.assertIn(text, error["text"])
                    self.assertEqual(error["status"]["kind"], "efs")
            self.fs(0, "mkdir", "--parents", ":/tree/sub/deep")
            self.fs(0, "put", local, ":/tree/sub/f")
            self.fs(0, "ln", "/d", "/tree/link")
            self.fs(0, "ln", "/tree", "/totree")
            self.fs(0, "put", local, ":/d/stays")
            self.assertEqual(self.fs(0, "rm", "-r", "/totree")["done"], ["/totree"])
            answer = self.fs(7, "rm", "/none", "/file", "/tree", "/none2")
            self.assertEqual(answer["done"], ["/file"])
            self.assertRegex(answer["error"]["text"], r"^no such file /none on COM7 .*, and 2 more$")
            answer = self.fs(0, "rm", "-r", "/tree")
            self.assertEqual(sorted(answer["done"]),
                             ["/tree", "/tree/link", "/tree/sub", "/tree/sub/deep", "/tree/sub/f"])
            self.fs(2, "rm", "-r", "/")
            for code, target in ((0, ":/piped"), (7, ":/d")):
                process = start("-p", "7", "fs", "put", "-", target, ports=self.ports, stdin=subprocess.PIPE)
                err = process.communicate("from a pipe", timeout=PATIENCE)[1]
                self.assertEqual(process.returncode, code, err)
            self.assertEqual(self.text("fs", "cat", ":/piped"), "from a pipe")
            self.assertEqual(self.text("fs", "get", ":/d/stays", "-"), "x" * 700)
            self.fs(0, "put", local, ":/file")
            for words in (("cat", ":/nope"), ("stat", "/nope"), ("get", ":/nope"), ("ls", "/nope"), ("rm", "/nope")):
                with self.subTest(words=words):
                    error = self.fs(7, *words)["error"]
                    self.assertIn("no such file /nope on COM7", error["text"])
                    self.assertTrue(error["function"].startswith("KRAL_E"))

    def test_mistakes_are_found_before_anything_is_copied(self):
        with self.handset():
            self.fs(0, "mkdir", "/d")
            self.assertEqual(self.fs(0, "put", self.add("f", b"1"), self.add("h", b"2"), ":/d")["copied"], 2)
            error = self.ask(2, "fs", "mkdir", "-p", ":/a/b")["error"]
            self.assertIn("fs mkdir --parents", error["text"])
            for code, *words in ((2, "put", self.add("f", b"1"), self.add("h", b"2"), ":/x"),
                                 (2, "put", self.add("f", b"1"), "-", ":/d"),
                                 (2, "put", self.add("f", b"1"), self.add("sub/f", b"2"), ":/d"),
                                 (10, "put", self.add("f", b"1"), self.path("none"), ":/d"),
                                 (2, "get", "f", ":/f"), (2, "put", ":/f", "f"), (2, "get", ":/d"), (2, "cat", "/d"),
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
            error = self.fs(7, "put", local, ":/f")["error"]
            self.assertIn("no room", error["text"])
            self.assertIn("kral fs df", error["hint"])

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
            self.fs(0, "mkdir", ":/c1")
            self.fs(0, "put", local, ":/c1/\x9b31m\x7f\u00e4")
            self.assertEqual([entry["name"] for entry in self.fs(0, "ls", ":/c1")["entries"]], ["\x9b31m\x7f\u00e4"])
            self.assertIn(" \\xC2\\x9B31m\\x7F\u00e4\n", self.text("fs", "ls", ":/c1"))
            # What is no text can be told apart, and given back.
            self.fs(0, "put", local, os.fsdecode(b":/c1/n\xff\xfe"))
            given = {entry.get("name_bytes") for entry in self.fs(0, "ls", ":/c1")["entries"]}
            self.assertEqual(given, {None, "6E FF FE"})
            self.assertIn(r"c1/n\xFE", self.fs(7, "stat", os.fsdecode(b":/c1/n\xfe"))["error"]["text"])
            for path in (":/.", ":.", "://./", ":/x/..", ":/..", ":/"):
                self.fs(2, "rm", "-r", path)
        # "." and ".." are the directory itself and the one above, in any listing.
        self.assertEqual(len(answer["left_out"]), len(names) - 1)
        self.assertEqual(len(tree), len(names))
        self.assertEqual(sorted(os.listdir(self.folder)), ["f", "x"])
        self.assertEqual(os.listdir(self.path("x")), ["good"])

    def test_interrupted_copy_tells_how_far_it_got_and_leaves_nothing(self):
        local = self.add("f", bytes(200000))
        # A terminal that is closed says so twice: by the system, and by its shell.
        for signals in ((signal.SIGINT,), (signal.SIGHUP, signal.SIGHUP)):
            with self.subTest(signals=signals), self.handset("--fault", "delay=20,of=4B1305"):
                process = start("-p", "7", "--json", "fs", "put", local, ":/f", ports=self.ports)
                event = json.loads(process.stderr.readline())
                for number in signals:
                    process.send_signal(number)
                    time.sleep(0.02)
                out, _ = process.communicate(timeout=PATIENCE)
                self.assertEqual((process.returncode, json.loads(out)["error"]["name"]), (130, "interrupted"))
                self.assertEqual(self.fs(0, "ls")["entries"], [])
                log = self.path("log")
                process = start("-p", "7", "--log", log, "fs", "put", "-", ":/f", ports=self.ports, stdin=subprocess.PIPE)
                wait_until(lambda: tool.holds(log, "SEND"))
                process.send_signal(signals[0])
                self.assertEqual(process.wait(timeout=PATIENCE), 130, "while nothing comes to put")
                process.communicate()
                os.remove(log)
        self.assertEqual((event["event"], event["subject"], event["total"]), ("progress", local, 400000))
        self.assertGreater(event["done"], 0)
        self.assertGreater(event["seconds_left"], 0)

    def test_copy_goes_on_when_nobody_reads_its_progress(self):
        local = self.add("f", bytes(30000))
        with self.handset("--fault", "delay=20,of=4B1305"):
            process = start("-p", "7", "--json", "fs", "put", local, ":/f", ports=self.ports)
            process.stderr.readline()
            process.stderr.close()
            self.assertTrue(json.loads(process.stdout.read())["ok"])
            process.stdout.close()
            self.assertEqual(process.wait(timeout=PATIENCE), 0)

    def test_terminal_gets_a_bar(self):
        local = self.add("f", bytes(12000))
        ours, theirs = os.openpty()
        with self.handset("--fault", "delay=20,of=4B1305"):
            subprocess.run([tool.KRAL, "-p", "7", "fs", "--packet-size", "524", "put", local, ":/f"],
                           env=clean_environment(self.ports), stderr=theirs, stdout=subprocess.DEVNULL, check=True, timeout=PATIENCE)
        os.close(theirs)
        shown = os.read(ours, 65536).decode()
        os.close(ours)
        self.assertRegex(shown, r"\rput .*f  \[#+-+\]  \d+ %  [\d.]+ KiB/s  0:\d\d left")
        self.assertRegex(shown, r"\r *\r$")

    def test_handset_that_vanishes_while_copying_is_lost(self):
        local = self.add("f", bytes(5000))
        with self.handset("--fault", "hang-up,nth=2,of=4B1304"):
            self.fs(0, "put", "--no-verify", local, ":/f")
            answer = self.ask(9, "--time-out", "200", "fs", "get", ":/f", self.path("back"))
            self.assertIn("went away", answer["error"]["text"])
        self.assertEqual(os.listdir(self.folder), ["f"])
