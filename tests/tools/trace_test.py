"""--trace and --trace-on-failure, on verbs that pass and on verbs that do not."""
import os

import pcapng
from tool import ToolTest, fixture, run


class Traces(ToolTest):
    def codes(self, file):
        return [(packet.sent, packet.data[0]) for packet in pcapng.packets(self.content(file))]

    def test_trace_has_the_whole_conversation(self):
        with self.handset():
            self.expect(0, "-p", "7", "--trace", self.path("trace"), "raw", "2F")
            codes = self.codes("trace")
            self.assertEqual(codes[:2], [(True, 0x7B), (False, 0x7B)])
            self.assertEqual(codes[-2:], [(True, 0x2F), (False, 0x2F)])
            # On a verb that fails as well, and one without a handset has nothing to trace.
            self.expect(7, "-p", "7", "--trace", self.path("failed"), "ftm", "chan", "1")
            self.assertIn((False, 24), self.codes("failed"))
            self.expect(0, "--trace", self.path("none"), "band", "ul", "1", "60")
            self.assertFalse(os.path.exists(self.path("none")))

    def test_trace_on_failure_is_written_on_failure_only(self):
        option = ("--trace-on-failure", self.path("trace"))
        with self.handset():
            self.expect(0, "-p", "7", *option, "info")
            self.assertFalse(os.path.exists(self.path("trace")))
            failed = self.expect(7, "-p", "7", *option, "ftm", "chan", "1")
            self.assertIn(self.path("trace"), failed.err)
            self.assertEqual(self.codes("trace")[-1], (False, 24))
        # A handset that never answered: what it was asked is what matters.
        with self.handset("--fault", "lose"):
            os.remove(self.path("trace"))
            self.expect(5, "-p", "7", *option, "info")
            self.assertEqual(self.codes("trace")[0], (True, 0x7B))

    def test_files_that_cannot_be_written_are_told(self):
        with self.handset():
            self.expect_json(10, "-p", "7", "--trace", self.path("no", "folder"), "info")
            self.expect(2, "-p", "7", "--trace", self.path("a"), "--trace-on-failure", self.path("b"), "info")
            for option in ("--trace", "--trace-on-failure"):
                self.expect(2, "-p", "7", option, "", "info")
            failed = self.expect(7, "-p", "7", "--trace-on-failure", self.path("no", "folder"), "ftm", "chan", "1")
            self.assertIn("cannot be written", failed.err)

    def test_nothing_shares_a_file_with_the_text_log(self):
        kept = self.add("kept", b"kept")
        os.symlink(kept, self.path("link"))
        os.link(kept, self.path("other"))
        os.mkdir(self.path("folder"))
        with self.handset():
            for words in (("--trace", "{}", "info"), ("--trace-on-failure", "{}", "info"), ("log", "capture", "{}")):
                for log, file in ((kept, kept), (kept, self.path("link")), (kept, self.path("other")),
                                  (self.path("new"), self.path("folder", "..", "new"))):
                    with self.subTest(words=words, file=file):
                        self.expect(2, "-p", "7", "--log", log, *(word.format(file) for word in words))
            for words in (("nv", "verify", kept), ("nv", "backup", kept), ("fs", "put", kept, ":/x"),
                          ("flash", "write", "2:" + kept), ("-p", "8,9", "nv", "restore", kept)):
                for option in ("--log", "--trace", "--trace-on-failure"):
                    with self.subTest(words=words, option=option):
                        self.expect_json(2, *(() if "-p" in words else ("-p", "7")), option, self.path("link"), *words)
        self.assertEqual(self.content("kept"), b"kept")
        self.assertFalse(os.path.exists(self.path("new")))

    def test_many_handsets_have_a_trace_each(self):
        with fixture(2, self.folder) as (_, self.ports):
            self.expect(2, "-p", "1,2", "--trace", self.path("both"), "info")
            one = self.path("{port}")
            self.assertIn("twice for COM1", self.expect(2, "-p", "1,2", "--trace", one, "--log", one, "info").err)
            done = run("-p", "1,2", "--trace", self.path("{port}.pcapng"), "info", ports=self.ports)
            self.assertEqual(done.returncode, 0, done.err)
            for port in (1, 2):
                self.assertIn((True, 0), self.codes(f"{port}.pcapng"))
