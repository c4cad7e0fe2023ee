#!/usr/bin/env python3
"""The dissector in share/kral/wireshark, as tshark runs it: every field of a known conversation, and damaged packets.

usage: dissector_test.py KRAL TREE [unittest arguments]. Without tshark it fails. The last line is
"dissector: N passed, M failed".
"""
import json
import os
import random
import re
import struct
import subprocess
import sys
import zlib

sys.dont_write_bytecode = True  # nothing is left in the tree

import pcapng
import tool
from tool import ToolTest

TREE = None
SEED = 20
SECTIONS = 1000


def tshark(file, *words, definitions=""):
    """What tshark writes; an error of the dissector is one of the test."""
    script = os.path.join(TREE, "share", "kral", "wireshark", "kral.lua")
    done = subprocess.run(["tshark", "-X", f"lua_script:{script}", "-o", f"kral.definitions:{definitions}", "-r", file,
                           *words], capture_output=True, text=True, errors="replace", timeout=600)
    if done.returncode != 0 or re.search(r"lua.?error|stack traceback", done.stdout + done.stderr, re.IGNORECASE):
        raise AssertionError(f"tshark {words}: {done.returncode}\n{done.stderr[-2000:]}"
                             f"{[line for line in done.stdout.splitlines() if 'rror' in line][:5]}")
    return done.stdout


def dissected(file, definitions=""):
    """Of each packet its fields below kral and kral_bytes by name, each with the list of its values."""
    fields = []

    def gather(node, into):
        for name, value in node.items():
            if isinstance(value, dict):
                gather(value, into)
            elif name.startswith("kral"):
                into.setdefault(name, []).extend(value if isinstance(value, list) else [value])
            elif isinstance(value, list):
                for each in value:
                    if isinstance(each, dict):
                        gather(each, into)

    shown = tshark(file, "-2", "-T", "json", "--no-duplicate-keys", definitions=definitions)
    for packet in json.loads(shown):
        into = {}
        gather(packet["_source"]["layers"], into)
        fields.append(into)
    return fields


KINDS = b"""<CommandDefinition><Family name="KINDS" frame="subsystem" subsystem="251" order="big">
<Command name="ALL" id="1"><Request><Field name="u64" type="u64"/><Field name="s40" type="s40" order="little"/>
<Field name="f64" type="f64"/><Field name="w" type="u40"><Bit name="low" bits="0-3" signed="1"/>
<Bit name="high" bits="36-39"/></Field><Field name="n" type="u16"/><Field name="z" type="zlib" size="n">
<Field name="t" type="text" size="2"/></Field></Request>
<Reply><Field name="status" type="u8" success="0"/></Reply></Command>
<Command name="STATUS" id="2"><Request><Field name="status" type="u8"/></Request>
<Reply><Field name="status" type="u8" success="0"/><Field name="more" type="u32"/></Reply></Command>
<Command name="COUNTS" id="3" doc="none is sent"><Request><Field name="n" type="s8" min="0" max="3"/>
<Field name="a" type="u8" count="n"/><Field name="m" type="u8"/><Field name="t" type="text" size="m" max_size="2"/>
<Field name="r" type="u8" count="*" max_count="2"/></Request></Command>
</Family></CommandDefinition>"""
# A flash programmer of 32 bytes for the loader, as text records.
HEX = (b":020000040002F8\n:10000000000102030405060708090A0B0C0D0E0F78\n"
       b":10001000101112131415161718191A1B1C1D1E1F68\n:0400000500020000F5\n:00000001FF\n")


class Dissector(ToolTest):
    def converse(self):
        """A conversation of every kind; gives its files."""
        self.add("item", bytes(range(64)))
        talks = (
            ("identity", 0, "info"),
            ("refused", 7, "ftm", "chan", "9750"),
            ("mode", 0, "mode", "ftm"),
            ("channel", 0, "ftm", "chan", "9750", "--rf-mode", "9"),
            ("legacy", 0, "ftm", "chan", "9750", "--code", "59"),
            ("put", 0, "fs", "put", self.path("item"), ":/probe"),
            ("get", 0, "fs", "get", ":/probe", self.path("back")),
            ("none", 7, "fs", "cat", "/none"),
            ("write", 0, "nv", "write", "10", "1,2,3"),
            ("read", 0, "nv", "read", "10"),
            ("switches", 0, "raw", "2F"),
            ("levels", 0, "log", "on", "--category", "5"),
            ("logs", 0, "log", "capture", self.path("capture"), "--on", "0x1001", "--count", "60"),
            ("events", 0, "event", "tail", "--on", "291", "7", "--count", "20"),
        )
        files = {}
        for name, code, *words in talks:
            files[name] = self.path(name + ".pcapng")
            done = tool.run("-p", "7", "--trace", files[name], *words, ports=self.ports)
            self.assertEqual(done.returncode, code, f"{words}: {done.err}")
        return files

    def agrees(self, packet, fields):
        """What the bytes say by themselves, against what tshark shows."""
        data, one = packet.data, lambda name: fields[name][0]
        self.assertEqual(one("kral.direction"), "sent" if packet.sent else "received")
        if packet.interface == 1:
            self.assertEqual(one("kral.noise"), ":".join(f"{byte:02x}" for byte in data))
            return
        self.assertEqual(int(one("kral.code")), data[0])
        self.assertEqual(int(one("kral.fcs"), 0), struct.unpack("<H", data[-2:])[0])
        self.assertIn(one("kral.fcs.good"), ("1", "True"))
        body = data[:-2]
        if data[0] == 75 and data[1] == 11:
            self.assertEqual((int(one("kral.ftm.mode")), int(one("kral.ftm.command"))),
                             struct.unpack_from("<2H", body, 2))
        elif data[0] == 59:
            self.assertEqual(int(one("kral.ftm.command")), struct.unpack_from("<H", body, 5)[0])
        elif data[0] == 75:
            self.assertEqual((int(one("kral.subsystem")), int(one("kral.subsystem.command"))),
                             struct.unpack_from("<BH", body, 1))
        elif data[0] in (38, 39):
            self.assertEqual(int(one("kral.nv.item")), struct.unpack_from("<H", body, 1)[0])
            if not packet.sent:
                self.assertEqual(int(one("kral.nv.status")), struct.unpack_from("<H", body, len(body) - 2)[0])
        elif data[0] == 16:
            length, code, stamp = struct.unpack_from("<HHQ", body, 4)
            self.assertEqual([int(one("kral.log." + name), 0) for name in ("length", "code", "equipment_id", "item")],
                             [length, code, code >> 12, code & 0xFFF])
            self.assertEqual(int(one("kral.log.stamp"), 16), stamp)
        elif data[0] == 96:
            self.assertEqual([int(each) for each in fields["kral.event.id"]], list(self.events_of(body)))
        elif data[0] == 121:
            line, category, level, argument = struct.unpack_from("<2H2I", body, 12)
            self.assertEqual([int(one("kral.message." + name)) for name in ("line", "category", "level", "argument")],
                             [line, category, level, argument])
            self.assertEqual(body[24:], f"{one('kral.message.text')}\0{one('kral.message.file')}\0".encode())

    @staticmethod
    def events_of(report):
        at, end = 3, 3 + struct.unpack_from("<H", report, 1)[0]
        while at < end:
            head, = struct.unpack_from("<H", report, at)
            at += 4 if head & 0x8000 else 10
            form = head >> 13 & 3
            at += report[at] + 1 if form == 3 else form
            yield head & 0xFFF

    def answered(self, packets, shown):
        """Requests and answers find each other, with the time between them."""
        open_request = None
        for number, (packet, fields) in enumerate(zip(packets, shown), 1):
            if packet.interface != 0 or packet.data[0] in (16, 96, 121):
                self.assertNotIn("kral.request_in", fields)
            elif packet.sent:
                open_request = number
            else:
                self.assertEqual(fields["kral.request_in"], [str(open_request)], number)
                self.assertEqual(shown[open_request - 1]["kral.reply_in"], [str(number)])
                passed = packet.microseconds - packets[open_request - 1].microseconds
                self.assertAlmostEqual(float(fields["kral.time"][0]), passed / 1e6, places=6)

    def test_conversation_is_shown_field_by_field(self):
        with self.handset("--logs", "500", "--events", "100", "--messages", "100"):
            files = self.converse()
        commands = {}
        kinds = set()
        for name, file in files.items():
            with self.subTest(name=name):
                packets = pcapng.packets(self.content(file))
                shown = dissected(file)
                self.assertEqual(len(packets), len(shown))
                for packet, fields in zip(packets, shown):
                    self.agrees(packet, fields)
                    kinds.add(packet.data[0])
                self.answered(packets, shown)
                commands[name] = [fields["kral.command"][0] for fields in shown]
                fields = {key: value for each in shown for key, value in each.items()}
                if name == "refused":
                    self.assertEqual((fields["kral.refusal"], fields["kral.refused"]), (["Bad mode"], ["75"]))
                elif name in ("put", "get"):
                    self.assertIn(["/probe"], [each.get("kral.efs.path") for each in shown])
                    self.assertIn(":".join(f"{byte:02x}" for byte in range(64)),
                                  [value for each in shown for value in each.get("kral.efs.data", ())])
                elif name == "none":
                    self.assertIn(["2"], [each.get("kral.efs.errno") for each in shown])
        self.assertLessEqual({0, 16, 38, 39, 47, 59, 75, 96, 115, 121, 123}, kinds)
        for name, command in (("refused", "Refused: Bad mode (FTM FTM_MODE_ID_WCDMA SET_CHAN)"), ("identity", "Version"),
                              ("channel", "FTM FTM_MODE_ID_WCDMA SET_MODE"), ("legacy", "FTM SET_CHAN"),
                              ("get", "EFS Read"), ("read", "NV read 10"), ("logs", "Log 0x1001")):
            self.assertIn(command, commands[name])

    def traced(self, name, *words, code=0):
        file = self.path(name + ".pcapng")
        done = tool.run("-p", "7", "--trace", file, *words, ports=self.ports)
        self.assertEqual(done.returncode, code, f"{words}: {done.err}")
        return file

    def defined_calls(self):
        """Traces of commands by definition, with what tshark is to show of request and answer."""
        example = os.path.join(TREE, "examples", "commands.xml")
        kinds = self.add("kinds.xml", KINDS)
        script = self.add("script", b"set 1 WLAN.version=2\nset 1 WLAN.packed.points[0].channel=14\n"
                                    b"set 1 SENSOR.name=T1\nset 1 SENSOR.raw=ab\nset 1 SENSOR.value=-70000\n")
        calls = (
            (["WLAN.TX_START", "channel=6", "rate=54M", "flags.antenna=2"], 0,
             ["channel=6", "rate=54M", "flags.preamble=1", "flags.antenna=2"], ["status=0", "power=0"]),
            (["WLAN.SET_TABLE", "points[1].channel=3", "points[1].power=-5", "points[0].channel=1", "points[0].power=7",
              "label=a b"], 0,
             ["count=2", "points[0].channel=1", "points[0].power=7", "points[1].channel=3", "points[1].power=-5",
              "label=a b"], ["status=0"]),
            (["SENSOR.READ", "sensor=1", "kind=11M", "limit=-2"], 0, ["sensor=1", "kind=11M", "limit=-2"],
             ["value=-70000", "name=T1", "raw_size=2", "raw=6162"]),
            (["KINDS.ALL", "u64=18446744073709551615", "s40=-2", "f64=0.1", "w.low=-3", "w.high=9", "z.t=ab"], 0,
             ["u64=18446744073709551615", "s40=-2", "f64=0.1", "w.low=-3", "w.high=9", "n=*", "z.t=ab"], ["status=0"]),
            (["KINDS.STATUS", "status=3"], 7, ["status=3"], ["status=3"]),
        )
        with self.handset("--commands", example, "--commands", kinds, "--script", script):
            tool.run("-p", "7", "mode", "ftm", ports=self.ports)
            return f"{example};{kinds}", [
                (self.traced(f"call{number}", "cmd", "call", *words, "--defs", example, "--defs", kinds, code=code),
                 words[0], request, reply) for number, (words, code, request, reply) in enumerate(calls)]

    def test_commands_by_definition_are_shown_with_their_fields(self):
        definitions, calls = self.defined_calls()
        for file, name, request, reply in calls:
            shown = [fields for fields in dissected(file, definitions) if "kral.defined" in fields]
            with self.subTest(name=name):
                self.assertEqual([fields["kral.defined"] for fields in shown], [[name], [name]])
                for fields, wanted in zip(shown, (request, reply)):
                    listed = [re.sub("^n=[0-9]+$", "n=*", field) for field in fields["kral.defined.field"]]
                    self.assertEqual(listed, wanted)
                    self.assertNotIn("kral.defined.wrong", str(fields))
        self.assertIn("KINDS.STATUS, status=3", [fields["kral.command"][0] for fields in shown])
        self.assertFalse([fields for fields in dissected(calls[0][0]) if "kral.defined" in fields])
        many = []
        chance = random.Random(SEED)
        seeds = [packet for file, *_ in calls for packet in pcapng.packets(self.content(file))]
        with open(calls[0][0], "rb") as file:
            many += [pcapng.block(kind, body) for kind, body in pcapng.blocks(file.read())
                     if kind in (pcapng.SECTION, pcapng.INTERFACE)]
        many += [pcapng.packet_block(packet, self.damaged(chance, packet.data))
                 for packet in chance.choices(seeds, k=4000)]
        damaged = self.add("damaged.pcapng", b"".join(many))
        self.assertEqual(tshark(damaged, "-V", definitions=definitions).count("\nFrame ") + 1, 4000)

    def test_what_is_not_as_defined_is_marked(self):
        definitions, calls = self.defined_calls()
        with open(calls[3][0], "rb") as file:
            content = file.read()
        sent = next(packet for packet in pcapng.packets(content) if packet.sent and packet.data[1:4] == b"\xFB\x01\0")
        heads = b"".join(pcapng.block(kind, body) for kind, body in pcapng.blocks(content)
                         if kind in (pcapng.SECTION, pcapng.INTERFACE))
        head, stream = sent.data[:4] + bytes(8 + 5 + 8 + 5), zlib.compress(b"ab")
        counts = b"\x4B\xFB\x03\0"

        def all_kinds(stream):
            return head + struct.pack(">H", len(stream)) + stream

        rows = (("whole", all_kinds(stream), None),
                ("cut in its checksum", all_kinds(stream[:-2]), "zlib stream"),
                ("another checksum", all_kinds(stream[:-1] + b"x"), "zlib stream"),
                ("behind the stream", all_kinds(stream + b"x"), "zlib stream"),
                ("more than defined in it", all_kinds(zlib.compress(b"abc")), "z holds more than defined"),
                ("behind the fields", all_kinds(stream) + b"x", "longer than defined"),
                ("counted", counts + b"\x01\x07\x01tr", None),
                ("a negative count", counts + b"\x80" + bytes(40), "n=-128 is no count"),
                ("beyond the range of the count", counts + b"\x04" + bytes(40), "n=4 is no count"),
                ("beyond the size", counts + b"\0\x03" + bytes(3), "m=3 is no count"),
                ("too many", counts + b"\0\0" + bytes(3), "r has too many elements"))
        file = self.add("rows.pcapng", heads + b"".join(pcapng.packet_block(sent, row[1] + b"\0\0") for row in rows))
        messages = tshark(file, "-T", "fields", "-e", "_ws.expert.message", definitions=definitions).splitlines()
        for (name, _, wrong), fields, message in zip(rows, dissected(file, definitions), messages, strict=True):
            with self.subTest(name=name):
                self.assertIn("kral.defined", fields)
                self.assertEqual("kral.defined.wrong" in fields, wrong is not None)
                self.assertIn(wrong or "", message)

    def test_definition_files_are_taken_as_the_library_takes_them(self):
        _, calls = self.defined_calls()
        file = calls[3][0]
        wanted = [fields.get("kral.defined.field") for fields in dissected(file, self.path("kinds.xml"))]
        text = KINDS.decode().replace("none is sent", "&#228;&#x1F4F1; \u00e4 \u20ac").replace(
            "<Command name", "&#32;<![CDATA[ \n]]>&#x9;<Command name").replace('name="u64"', 'name="&#117;64" unit="&#181;s"')
        narrow = text.replace("\u20ac", "")
        for name, content in (("utf8", text.encode("utf-8-sig")), ("utf16", text.encode("utf-16")),
                              ("utf16be", b"\xFE\xFF" + text.encode("utf-16-be")),
                              ("latin", b"<?xml version='1.0' encoding='ISO-8859-1'?>" + narrow.encode("latin-1"))):
            with self.subTest(name=name):
                definitions = self.add(name + ".xml", content)
                self.expect(0, "cmd", "list", "--defs", definitions)
                shown = dissected(file, definitions)
                self.assertEqual([fields.get("kral.defined.field") for fields in shown], wanted)
                self.assertIn("18446744073709551615 \u00b5s", tshark(file, "-V", definitions=definitions))

    def test_hostile_definitions_cost_the_view_nothing_else(self):
        definitions, calls = self.defined_calls()
        example = definitions.split(";")[0]
        head = (b"<CommandDefinition><Family name='F' frame='subsystem' subsystem='250'>"
                b"<Command name='C' id='3'><Request>")
        tail = b"</Request></Command></Family></CommandDefinition>"
        for text in (b"", b"<", b"\xFF" * 100, b"<!DOCTYPE a [<!ENTITY b 'c'>]><CommandDefinition/>", b"<a>" * 100000,
                     b"<CommandDefinition>" + b"<a/>" * 300000, b"<CommandDefinition a='", b"<a></b>", head,
                     b"<CommandDefinition/>text", b"<CommandDefinition a='&b;'/>", b"<Other/>",
                     head + b"<Field/>" + tail, head + b"<Field name='a' type='u99'/>" + tail,
                     head + b"<Field type='R'/>" + tail.replace(
                         b"</CommandDefinition>", b"<Record name='R'><Field type='R'/></Record></CommandDefinition>"),
                     head + b"<Field name='a' type='u8' count='65536'/>" + tail,
                     head + b"<Field name='a' type='record' count='*'><Field name='b' type='u8' when='c=1'/></Field>" +
                     tail,
                     head + b"<Field name='a' type='u8'><Bit name='b' bits='7-3'/><Bit bits='99'/></Field>" + tail):
            with self.subTest(text=text[:200]):
                hostile = self.add("hostile.xml", text)
                self.assertIn("kral.code", str(dissected(calls[2][0], f"{hostile};/nonexistent")))
        shown = dissected(calls[2][0], f"{hostile};/nonexistent;{example}")
        self.assertIn("kral.defined", str(shown), "what is wrong with one file is no matter of another's")

    def test_loader_programmer_and_boot_packets_are_named(self):
        programmer = self.add("programmer", b"VHFP" + struct.pack("<I", 9000) + bytes(8992))
        software = self.add("software", b"VHSW" + b"VHS-2.0.1\0" + bytes(5000))
        with self.handset("--boot-loader"):
            boot = dissected(self.traced("boot", "boot", "load", programmer))
        with self.plugged_handset("--loader", "boot"):
            stream = dissected(self.traced("stream", "flash", "all", "--enter", programmer, software))
        loader = self.add("programmer.hex", HEX)
        with self.handset():
            load = dissected(self.traced("load", "flash", "load", loader))
        commands = [[fields["kral.command"][0] for fields in shown if "kral.command" in fields]
                    for shown in (boot, stream, load)]
        for wanted in ("Boot hello", "Boot hello response", "Boot read data", "Boot end of transfer", "Boot done"):
            self.assertIn(wanted, commands[0])
        self.assertEqual(sum(int(size) for fields in boot for size in fields.get("kral.boot.size", ())), 9000)
        for wanted in ("Programmer no operation", "Programmer hello", "Programmer open image",
                       "Programmer image opened", "Programmer write 0x00000000", "Programmer wrote 0x00000000",
                       "Programmer closed"):
            self.assertIn(wanted, commands[1])
        for wanted in ("Loader write", "Loader go", "Loader acknowledged"):
            self.assertIn(wanted, commands[2])
        for number, fields in enumerate(stream, 1):
            if fields.get("kral.protocol") == ["programmer"] and fields["kral.direction"] == ["sent"]:
                self.assertIn("kral.reply_in", fields, number)

    def test_damaged_packets_are_shown_as_far_as_they_go(self):
        with self.handset("--logs", "500", "--events", "100", "--messages", "100"):
            files = self.converse()
        seeds = [packet for file in files.values() for packet in pcapng.packets(self.content(file))]
        chance = random.Random(SEED)
        many = []
        for _ in range(SECTIONS):  # files one behind the other: tshark takes them as one
            with open(files["identity"], "rb") as file:
                many += [pcapng.block(kind, body) for kind, body in pcapng.blocks(file.read())
                         if kind in (pcapng.SECTION, pcapng.INTERFACE)]
            for packet in chance.sample(seeds, 8):
                many.append(pcapng.packet_block(packet, self.damaged(chance, packet.data)))
        damaged = self.add("damaged.pcapng", b"".join(many))
        self.assertEqual(tshark(damaged, "-V").count("\nFrame ") + 1, SECTIONS * 8)

    @staticmethod
    def damaged(chance, data):
        data = bytearray(data)
        for _ in range(chance.randint(1, 4)):
            at = chance.randrange(len(data) + 1)
            what = chance.randrange(5)
            if what == 0:
                del data[at:]
            elif what == 1:
                data[at:at] = chance.randbytes(chance.randint(1, 40))
            elif what == 2:
                data[at:at + 2] = b"\xFF\xFF"
            elif what == 3 and data:
                data[chance.randrange(len(data))] ^= 1 << chance.randrange(8)
            elif data:
                data[0] = chance.choice((2, 16, 19, 38, 39, 41, 47, 59, 75, 96, 115, 121, 128))
        return bytes(data)

    def test_names_are_the_library_s(self):
        with open(os.path.join(TREE, "share", "kral", "wireshark", "kral.lua"), encoding="utf-8") as file:
            script = file.read()

        def shown(table):
            rows = script.split(f"local {table} = {{")[1].split("\n}")[0]
            return dict(re.findall(r'\[(\d+)\] = "([^"]+)"', rows))

        listed = {}
        for row in self.ask(0, "ftm", "list")["commands"]:
            listed.setdefault(str(row["id"]), []).append(row["name"])
        self.assertEqual(shown("ftm_commands"), {number: " / ".join(names) for number, names in listed.items()})
        self.assertEqual(len(shown("ftm_modes")), 39)


if __name__ == "__main__":
    tool.KRAL, TREE = os.path.abspath(sys.argv[1]), os.path.abspath(sys.argv[2])
    tool.run_tests("dissector", sys.argv[3:])
