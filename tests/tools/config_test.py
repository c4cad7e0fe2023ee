"""What is settled for all verbs, and what goes in front of what."""
import unittest.mock

import tool
from tool import ToolTest, fixture


class Config(ToolTest):
    def settings(self, text, **variables):
        """As long as it is entered, the tool finds these in its folder and in the environment."""
        self.add("kral/config.toml", text.encode())
        return unittest.mock.patch.dict(tool.EXTRA_ENVIRONMENT, {"XDG_CONFIG_HOME": self.folder, **variables})

    def held(self, *words):
        return {row["name"]: (row["value"], row["source"]) for row in self.expect_json(0, *words, "config")["settings"]}

    def test_the_command_line_goes_in_front_of_the_environment_and_this_of_the_file(self):
        text = "# of the station\nport = 7\ntime_out = 0x1000\nlog = 'a/b.log'\ndefinitions = [\n '/x.xml', 'y.xml']\n"
        with self.settings(text, KRAL_TIME_OUT="900", KRAL_COMMANDS="c.xml"):
            file = self.path("kral/config.toml")
            self.assertEqual(self.held("--log", "mine"), {
                "port": ("7", f"{file}, line 2"), "time_out": ("900", "KRAL_TIME_OUT"),
                "log": ("mine", "the command line"), "log_flags": (None, "default"),
                "definitions": (["/x.xml", self.path("kral/y.xml")], f"{file}, line 5"),
                "types": ([], "default"), "commands": (["c.xml"], "KRAL_COMMANDS")})
            self.assertEqual(self.held()["log"], (self.path("kral/a/b.log"), f"{file}, line 4"))
            self.assertEqual(self.held("--all")["port"], ("all", "the command line"))
            self.assertRegex(self.expect(0, "config").out, rf"(?m)^port +7 +{file}, line 2\n")

    def test_verbs_use_what_is_settled(self):
        with fixture(2, self.path("ports"), "--esn", "0x10", "--fault-at", "2:ignore") as (_, self.ports):
            with self.settings("port = 'slot:4'\nlog = 'com{port}.log'\n", KRAL_SLOTS=self.path("slots")):
                self.assertIn("slot 4 is not", self.expect_json(2, "info")["error"]["text"])
                self.expect(0, "band", "list")  # which needs no handset
                self.expect(0, "ports", "assign", "4", "1")
                self.assertEqual(self.expect_json(0, "info")["port"], 1)
                self.assertIn(b"KRAL_DIAG_VERNO_F", self.content("kral", "com1.log"))
                self.assertEqual(self.expect_json(5, "-p", "2", "info")["port"], 2)
                self.assertEqual([row["port"] for row in self.expect_json(0, "--all", "info")["handsets"]], [1])
            with self.settings("definitions = 'nowhere.xml'\nport = 1\n"):
                for words, file in ((("nv", "read", "10"), self.path("kral/nowhere.xml")),
                                    (("nv", "read", "10", "--defs", "mine.xml"), "mine.xml")):
                    self.assertIn(file, self.expect_json(10, *words)["error"]["text"])

    def test_settings_that_cannot_be_used_name_their_place(self):
        for text, problem in (("port = 7\ntime_out = 0\n", "line 2: --time-out takes a number from 1 to 3600000 ms"),
                              ("time_out = 'long'\n", "line 1: time_out takes a number"), ("\nlog = 5\n", "line 2: log"),
                              ("\n\nport = [7]\n", "line 3: port"), ("prot = 7\n", "line 1: there is no setting prot; did"),
                              ("port = 7\nport = 8\n", "line 2"), ("port = \n", "line 1"), ("port = '\xff\n", "line 1")):
            with self.subTest(text=text), self.settings(text):
                for words in (("config",), ("info",)):
                    self.assertIn("kral/config.toml, " + problem, self.expect_json(10, *words)["error"]["text"])
                self.expect(0, "help", "config")
        with self.settings("", KRAL_TIME_OUT="x"):
            self.assertIn("KRAL_TIME_OUT: --time-out takes", self.expect_json(2, "info")["error"]["text"])
        with self.settings("port = 7\n", KRAL_CONFIG=self.path("other.toml")):
            self.assertIn("other.toml", self.expect_json(10, "config")["error"]["text"])
