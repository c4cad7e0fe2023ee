"""Commands that a definition file describes."""
import json
import os
import subprocess

from tool import ToolTest

TREE = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
EXAMPLE = os.path.join(TREE, "examples", "commands.xml")
RF = os.path.join(TREE, "share", "kral", "commands", "rf.xml")

# Calls each kind of function that a header has.
PROGRAM = """#include "made.h"
int main(void) {
  WLAN_TX_START_REPLY reply;
  const uint8_t channels[2] = {1, 2};
  const int16_t powers[2] = {-5, 5};
  return WLAN_TX_START(0, 6, (uint8_t)WLAN_TX_START_RATE_11M, 1, 0, &reply) != 0 ||
         WLAN_SET_TABLE(0, channels, 2, powers, NULL, NULL) != 0 || RF_SET_TX_ON(0) != 0 || reply.status != 0;
}
"""

# Names that mean something to a compiler, to headers or to the text of a made header.
WORDS = """and_eq or_eq xor_eq not_eq char8_t char16_t char32_t const_cast static_cast dynamic_cast reinterpret_cast
thread_local co_await co_return co_yield consteval constinit asm typeof _Bool __func__ __LINE__ NULL uint8_t uint32_t
int64_t size_t memset strlen INT8_MAX errno linux unix KRAL_API KRAL_HANDLE KRAL_CMD_Send kral_cmd_integer F_WORDS
F_WORDS_REPLY F_CHOICE_F_W call done handle i reply a A _ __ done_""".split()
ENUMERATIONS = """<Enumeration name="One"><Value name="w" value="1"/></Enumeration>
<Enumeration name="Two"><Value name="a-b" value="1"/><Value name="a_b" value="2"/></Enumeration>"""
LONG = "n" * 60


class DefinedCommands(ToolTest):
    @staticmethod
    def read(path):
        with open(path, "rb") as file:
            return file.read()

    def test_commands_are_listed_and_shown_without_a_handset(self):
        listed = self.expect_json(0, "cmd", "list", "--defs", EXAMPLE, "--defs", RF)["commands"]
        self.assertEqual(len(listed), 4 + 104)
        self.assertEqual(listed[0], {"name": "WLAN.TX_START", "id": 5, "doc": "Starts to transmit"})
        shown = self.expect_json(0, "cmd", "show", "WLAN.TX_START", "--defs", EXAMPLE)["command"]
        self.assertEqual([field["name"] for field in shown["request"]], ["channel", "rate", "flags"])
        self.assertEqual(shown["request"][1]["enum"], {"1M": 0, "11M": 3, "54M": 12})
        text = self.text("cmd", "show", "WLAN.SET_TABLE", "--defs", EXAMPLE)
        self.assertIn("    power  s16  -4000 to 3000 0.01 dBm\n", text)
        self.assertIn("did you mean WLAN.TX_START?", self.expect(2, "cmd", "show", "WLAN.TX_STRT", "--defs", EXAMPLE).err)
        error = self.expect_json(10, "cmd", "list", "--defs", self.add("bad.xml", b"<CommandDefinition>\n<Familie/>"
                                                                      b"</CommandDefinition>"))["error"]
        self.assertIn("<Familie> is not expected", error["text"])

    def test_a_call_sends_its_fields_and_prints_the_reply(self):
        with self.handset():
            self.expect(0, "-p", "7", "mode", "ftm")
            answer = self.ask(0, "cmd", "call", "RF.SET_LNA_RANGE", "payload=A1 B2", "--mode-id", "2", "--defs", RF)
            self.assertEqual(answer["reply"], {"response": "A1B2"})
            text = self.text("cmd", "call", "RF.GET_RX_AGC", "--defs", RF)
            self.assertEqual(len(json.loads(text)["response"]), 4)
            error = self.ask(2, "cmd", "call", "WLAN.TX_START", "channel=15", "--defs", EXAMPLE)["error"]
            self.assertIn("channel=15 is out of range: 1 to 14", error["text"])

    def test_a_simulated_handset_answers_defined_commands(self):
        script = self.add("script", b"set 1 WLAN.version=0x1\nset 1 WLAN.power=-12.5 # dBm\n")
        with self.handset("--commands", EXAMPLE, "--script", script):
            self.expect(0, "-p", "7", "mode", "ftm")
            def call(*words, code=0):
                return self.ask(code, "cmd", "call", *words, "--defs", EXAMPLE)
            self.assertEqual(call("WLAN.TX_START", "channel=6")["reply"], {"status": 0, "power": -12.5})
            call("WLAN.SET_TABLE", "points[0].channel=3", "points[0].power=-5", "label=a b")
            self.assertEqual(call("WLAN.GET_TABLE")["reply"]["points"], [{"channel": 3, "power": -5}])
            self.assertEqual(call("SENSOR.READ", "sensor=1")["reply"],
                             {"value": 0, "name": "", "raw_size": 0, "raw": ""})
            narrow = self.add("wide.xml", self.read(EXAMPLE).replace(b'name="sensor" type="u8" max="7"',
                                                                     b'name="sensor" type="u8"'))
            error = self.ask(7, "cmd", "call", "SENSOR.READ", "sensor=8", "--defs", narrow)["error"]
            self.assertIn("with 20: a parameter is wrong", error["text"])
        self.expect(10, "sim", "--commands", self.add("none.xml", b"<x"))
        for wrong in ("WLAM.power=1", "WLAN.powr=1", "WLAN.version=256", "WLAN.version=-1", "WLAN.version=1x",
                      "WLAN.power=1e39", "WLAN.version[0]=1", "WLAN.points=1", "WLAN.points[0]=1",
                      "WLAN.points[1a].power=1", "WLAN.points[0].power=32768", "SENSOR.name=" + "x" * 33):
            with self.subTest(wrong=wrong):
                script = self.add("script", f"set 1 {wrong}\nquit\n".encode())
                self.assertIn(wrong, self.expect(2, "sim", "--commands", EXAMPLE, "--script", script).err)

    def test_the_header_compiles_as_c89_and_as_cpp(self):
        made = self.expect_json(0, "cmd", "header", EXAMPLE, RF, "--output", self.path("made.h"))
        self.assertEqual(made["left_out"], ["SENSOR.READ"])
        self.check_compiles(PROGRAM)

    def check_compiles(self, program):
        self.add("program.c", program.encode())
        for compiler, standard in (("gcc", "c89"), ("gcc", "gnu89"), ("gcc", "c11"), ("g++", "c++98"),
                                   ("g++", "c++20")):
            language = "c++" if compiler == "g++" else "c"
            built = subprocess.run([compiler, "-x", language, f"-std={standard}", "-Wall", "-Wextra", "-Werror",
                                    "-pedantic", "-Wno-long-long", "-fsyntax-only", "-I", os.path.join(TREE, "include"),
                                    self.path("program.c")], capture_output=True, text=True, check=False)
            self.assertEqual((standard, built.returncode, built.stderr), (standard, 0, ""))

    def test_the_header_never_replaces_its_definitions(self):
        file = self.add("own.xml", self.read(EXAMPLE))
        self.expect_json(2, "cmd", "header", RF, file, "--output", os.path.join(self.folder, ".", "own.xml"))
        self.assertEqual(self.content("own.xml"), self.read(EXAMPLE))

    def test_names_in_the_header_meet_nothing_and_nothing_is_cut(self):
        ids = iter(range(1000))

        def fields(*names):
            return "".join(f'<Field name="{name}" type="u8"/>' for name in names)

        def group(name, kind, *inner, more=""):
            return f'<Field name="{name}" type="{kind}" {more}>{"".join(inner)}</Field>'

        def command(name, request="", reply=""):
            return (f'<Command name="{name}" id="{next(ids)}"><Request>{request}</Request><Reply>{reply}</Reply>'
                    "</Command>")

        def family(name, *commands):
            return f'<Family name="{name}" frame="subsystem" subsystem="250">{"".join(commands)}</Family>'

        def choice(enumeration):
            return f'<Field name="f" type="u8" enum="{enumeration}"/>'

        deep = group(LONG + "a", "record", group(LONG + "b", "record", fields(LONG + "c1", LONG + "c2")))
        packed = group("z", "zlib", '<Field name="b" type="bytes" size="20000"/>',
                       '<Field name="l" type="u16" count="8000"/>', more='size="*"')
        blocks = "".join(f'<Field name="b{i}" type="bytes" size="n"/>' for i in range(5))
        definitions = ENUMERATIONS + family(
            "F", command("WORDS", fields(*WORDS), fields(*WORDS)),
            command("COUNTS", fields("points_count") + group("points", "record", fields("a", "count"),
                                                             more='count="*" max_count="4"')),
            command("X", "", fields("a")), command("X_REPLY"), command("CHOICE", choice("One")), command("CHOICE_F_W"),
            command("TWO", choice("Two")), command("DEEP", deep, deep), command("PACKED", "", packed),
            command("HUGE", "", group("z", "zlib", '<Field name="n" type="u16"/>', blocks, more='size="*"')),
        ) + "".join(family(name, command(only)) for name, only in (
            ("A_B", "C"), ("A", "B_C"), ("KRAL", "ConnectServer"), ("static", "cast"), ("int8", "t")))
        file = self.add("names.xml", f"<CommandDefinition>{definitions}</CommandDefinition>".encode())
        made = self.expect_json(0, "cmd", "header", file)
        self.assertEqual(made["left_out"], ["F.X_REPLY", "F.CHOICE_F_W", "F.TWO", "F.HUGE", "A.B_C",
                                            "KRAL.ConnectServer", "static.cast", "int8.t"])
        for part in ("uint8_t z_b[20000];", "uint16_t z_l[8000];", f'"{LONG}a.{LONG}b.{LONG}c2"'):
            self.assertIn(part, made["header"])
        self.add("made.h", made["header"].encode())
        self.check_compiles('#include "made.h"\nint main(void) { return 0; }\n')
