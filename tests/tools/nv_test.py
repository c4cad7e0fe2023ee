"""NV items by their definitions, and to and from PKV files."""
import os
import subprocess

from tool import PATIENCE, ToolTest


class NvItems(ToolTest):
    """The definitions are those of the examples folder."""
    DEFS = ("--defs", os.path.join(os.path.dirname(os.path.abspath(__file__)), "../../examples/nv_definitions.xml"))

    def test_items_are_written_and_read_by_id_name_and_path(self):
        with self.handset():
            written = self.ask(0, "nv", "write", "PREFERRED_MODE", "1,513", *self.DEFS)
            self.assertEqual(written["item"], {"id": 10, "name": "PREFERRED_MODE", "value": {"nam": 1, "mode": 513}})
            self.ask(0, "nv", "write", "20002", "-77", *self.DEFS)
            self.ask(0, "nv", "write", "6000", "AABB")
            text = self.text("nv", "read", "10", "WCDMA_TX_LIMIT", "6000", *self.DEFS)
            self.assertRegex(text, r"10 PREFERRED_MODE\n  nam +1\n  mode +513\n")
            self.assertRegex(text, r"/nv/item_files/rfnv/00020002 WCDMA_TX_LIMIT\n  limit +-77\n")
            self.assertRegex(text, r"6000\n0000 +AA BB 00")
            # The handset's word on what it will not do, and the tool's on what makes no sense.
            for code, text, *words in ((7, "5, never written", "read", "453", "7000"),
                                       (7, "/nv/none (there is no such file)", "read", "/nv/none"),
                                       (7, "7, read-only", "write", "0", "AA"),
                                       (2, "out of the range of mode", "write", "10", "1,70000", *self.DEFS),
                                       (2, "", "read", "NO_SUCH_ITEM", *self.DEFS), (2, "", "dump"),
                                       (10, "", "read", "10", "--defs", "/nonexistent")):
                with self.subTest(words=words):
                    self.assertIn(text, self.ask(code, "nv", *words)["error"]["text"])
            done = self.expect(7, "-p", "7", "nv", "read", "10", "453", "7000", *self.DEFS)
            self.assertRegex(done.out, r"10 PREFERRED_MODE\n  nam +1\n", "what was found before the failure")

    def test_dump_makes_files_that_compare_and_validate(self):
        pkv = [self.path("first.pkv"), self.path("second.pkv")]
        source, page = self.path("source.xml"), self.path("page.html")
        with self.handset():
            self.ask(0, "nv", "dump", *self.DEFS, "--pkv", pkv[0])
            self.ask(0, "nv", "write", "FTM_MODE", "1", *self.DEFS)
            answer = self.ask(0, "nv", "dump", *self.DEFS, "--pkv", pkv[1], "--source", source)
            self.assertEqual([item["name"] for item in answer["items"]], ["ESN", "FTM_MODE"])
            self.assertEqual(len(self.ask(0, "nv", "dump", "--items", "450-460")["items"]), 1)
        self.assertEqual(self.expect_json(8, "nv", "diff", *pkv, page, *self.DEFS)["counts"],
                         {"equal": 1, "different": 1, "only-in-first": 0, "only-in-second": 0})
        self.assertIn(b"enabled: 0 to 1", self.content("page.html"))
        subprocess.run(["xmllint", "--noout", source, self.DEFS[1]], check=True, timeout=PATIENCE)
        self.assertIn("2 equal, 0 different", self.expect(0, "nv", "diff", pkv[0], pkv[0], page).out)
        text = self.expect_json(10, "nv", "diff", pkv[0], pkv[1], self.path("no", "page.html"))["error"]["text"]
        self.assertNotIn("items differ", text)
        for file in (source, self.path("none.pkv")):
            self.assertEqual(self.expect_json(10, "nv", "diff", pkv[0], file, page)["error"]["text"].count(file), 1)
        self.assertEqual(len(self.expect_json(0, "nv", "defs", self.DEFS[1])["definitions"]), 29)
        self.assertIn("3101 CHANNEL_OFFSET [0-3]\n", self.expect(0, "nv", "defs", self.DEFS[1]).out)

    def test_elements_of_an_array_keep_their_values(self):
        with self.handset("--array", "3101:4"):
            for index, value in (("1", "1,5"), ("3", "-2,9"), ("0", "7,7")):
                self.ask(0, "nv", "write", "CHANNEL_OFFSET", value, "--index", index, *self.DEFS)
            read = self.ask(0, "nv", "read", "CHANNEL_OFFSET", *self.DEFS)
            self.assertEqual([(each["index"], [*each["value"].values()]) for each in read["items"][0]["elements"]],
                             [(0, [7, 7]), (1, [1, 5]), (3, [-2, 9])])
        self.expect(2, "sim", "--array", "3101:0")

    def test_dump_keeps_items_without_definition(self):
        source = self.path("source.xml")
        with self.handset("--fault", "hang-up,nth=9,of=26"):
            answer = self.ask(0, "nv", "dump", "--items", "0-2", "--source", source)
            kept = self.content("source.xml")
            self.assertIn(answer["items"][0]["bytes"].encode(), kept)
            self.assertEqual((kept.count(b"<NvItem"), answer["without_value"], answer["refused"]), (1, 2, []))
            # Without a value there is nothing to write, and what was read is told when the handset goes away.
            self.assertIn("no value", self.ask(7, "nv", "dump", "--items", "1-2", "--source", source)["error"]["text"])
            answer = self.ask(9, "nv", "dump", "--items", "0-99", "--time-out", "200")
            self.assertEqual([item["id"] for item in answer["items"]], [0])
            self.assertEqual(self.content("source.xml"), kept)

    def test_members_are_named_by_the_form_of_the_value(self):
        definitions = self.add("types.xml", b"""<NvDefinition>
            <NvItem id="6001" name="SIGNED"><DataType variantType="255"><Member name="kind" typeid="word8" signed="1"/>
            <Member name="rest" typeid="word8"/></DataType></NvItem>
            <NvItem id="6002" name="SAME"><DataType><Member name="a" typeid="word8"/>
            <Member name="a" typeid="word8" num_of_element="2"/></DataType></NvItem></NvDefinition>""")
        with self.handset():
            for name, value, expected in (("SIGNED", "-1,7", {"kind": -1, "rest": 7}), ("SAME", "1,2,3", [1, [2, 3]])):
                answer = self.ask(0, "nv", "write", name, value, "--defs", definitions)
                self.assertEqual(answer["item"]["value"], expected)


class Backups(ToolTest):
    def nv(self, code, verb, *options):
        return self.ask(code, "nv", verb, self.path("phone.pkv"), *options)

    def results(self, answer):
        return {row.get("id", row.get("path")): row["result"] for row in answer["items"]}

    def test_a_backup_is_restored_to_another_handset(self):
        with self.handset():
            for item, value in ((1, "11"), (2, "22")):
                self.ask(0, "nv", "write", str(item), value)
            self.assertEqual(self.nv(0, "backup", "--items", "0-20")["counts"]["read"], 3)
            self.assertEqual(self.text("nv", "verify", self.path("phone.pkv")), "3 equal\n")
        with self.handset("--esn", "0x5678"):
            self.ask(0, "nv", "write", "1", "11")
            expected = {0: "would-be-written", 1: "equal-already", 2: "would-be-written"}
            self.assertEqual(self.results(self.nv(0, "restore", "--dry-run")), expected)
            self.assertEqual(self.results(self.nv(8, "verify"))[2], "different")
            self.assertEqual(self.results(self.nv(7, "restore")), {0: "refused", 1: "written", 2: "written"})
            done = self.expect(7, "-p", "7", "nv", "restore", self.path("phone.pkv"))
            self.assertEqual(done.out, "item 0: refused, status 7\n2 written, 1 refused\n")
            self.assertIn("is of the handset 80C0FFEE", done.err)
        with self.handset("--model", "OTHER"):
            text = self.nv(11, "restore")["error"]["text"]
            self.assertIn("is of the model VH-1", text)
            self.assertIn("is OTHER", text)
            self.assertEqual(self.results(self.nv(0, "restore", "--dry-run"))[1], "would-be-written")
            self.assertEqual(self.results(self.nv(0, "restore", "--force"))[1], "written")
        with self.handset("--fault", "hang-up,nth=9,of=26"):
            self.assertEqual(self.nv(9, "backup", "--items", "0-20")["counts"]["not-reached"], 21 - 7)

    def test_mistakes_are_told(self):
        with self.handset():
            self.assertIn("phone.pkv", self.nv(10, "restore")["error"]["text"])
            for items in ("9-1", "x", "0-70000", ""):
                self.nv(2, "backup", "--items", items)
            self.nv(2, "backup", "--subscriptions", "0")
            self.assertIn("no item", self.nv(7, "backup", "--items", "5")["error"]["text"])
            self.assertRegex(self.nv(10, "verify")["error"]["text"], r"phone\.pkv: \w+")
        with self.handset("--fault", "refuse=20,of=26"):
            self.assertIn("refused 4", self.nv(7, "backup", "--items", "0-3")["error"]["text"])

    def test_definitions_name_items_beyond_the_range(self):
        with self.handset():
            self.ask(0, "nv", "write", "FTM_MODE", "1", *NvItems.DEFS)
            self.assertEqual(self.nv(0, "backup", "--items", "1", *NvItems.DEFS)["counts"]["read"], 2)  # and item 0
            self.assertEqual(self.nv(0, "verify", *NvItems.DEFS)["counts"]["equal"], 2)
