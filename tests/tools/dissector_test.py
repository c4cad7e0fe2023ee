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

sys.dont_write_bytecode = True  # nothing is left in the tree

import pcapng
import tool
from tool import ToolTest

TREE = None
SEED = 20
SECTIONS = 1000


def tshark(file, *words):
    """What tshark writes; an error of the dissector is one of the test."""
    script = os.path.join(TREE, "share", "kral", "wireshark", "kral.lua")
    done = subprocess.run(["tshark", "-X", f"lua_script:{script}", "-r", file, *words], capture_output=True, text=True,
                          errors="replace", timeout=600)
    if done.returncode != 0 or re.search(r"lua.?error|stack traceback", done.stdout + done.stderr, re.IGNORECASE):
        raise AssertionError(f"tshark {words}: {done.returncode}\n{done.stderr[-2000:]}"
                             f"{[line for line in done.stdout.splitlines() if 'rror' in line][:5]}")
    return done.stdout


def dissected(file):
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

    for packet in json.loads(tshark(file, "-2", "-T", "json", "--no-duplicate-keys")):
        into = {}
        gather(packet["_source"]["layers"], into)
        fields.append(into)
    return fields


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
