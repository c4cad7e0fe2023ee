"""Factory test mode, the channels of the bands, and the simulated handset itself."""
import os
import signal
import time

from tool import PATIENCE, ToolTest, command, fixture, wait_until


class Simulation(ToolTest):
    def test_ftm_commands_need_factory_test_mode_and_answer_in_it(self):
        with self.handset():
            self.ask(7, "ftm", "chan", "9612")
            self.ask(0, "mode", "ftm")
            answer = self.ask(0, "ftm", "mode", "10")
            self.assertEqual((answer["rf_mode"], answer["mode_id"]), (10, 2))
            self.ask(0, "ftm", "chan", "9750", "--rf-mode", "9")
            self.ask(0, "ftm", "tx", "on")
            self.ask(0, "ftm", "cmd", "SET_TX_POWER_DBM", "D0", "07")
            self.assertEqual(len(self.ask(0, "ftm", "cmd", "GET_HDET_FROM_TX_SWEEP_CAL")["response"].split()), 2)
            self.ask(0, "ftm", "--code", "59", "cmd", "53")
            self.ask(2, "ftm", "cmd", "NO_SUCH_COMMAND")
            for most, *options in ((6137,), (6133, "--form", "1"), (253, "--code", "59")):
                error = self.ask(2, "ftm", "cmd", "53", "00" * (most + 1), *options)["error"]
                self.assertIn(f"at most {most}", error["text"])
            self.ask(0, "ftm", "cmd", "53", "00" * 253, "--code", "59")
            self.ask(2, "ftm", "mode", "9", "--code", "60")

    def test_ftm_list_and_bands_need_no_handset(self):
        commands = self.expect_json(0, "ftm", "list")["commands"]
        self.assertIn({"id": 53, "name": "GET_RX_AGC"}, commands)
        bands = self.expect_json(0, "band", "list")["bands"]
        egsm = [row for row in bands if row["band"] == 0 and row["direction"] == "uplink"]
        self.assertEqual([(row["first"], row["last"]) for row in egsm], [(0, 124), (975, 1023)])
        self.assertEqual([row["direction"] for row in bands if row["band"] == 700], ["any"])
        self.assertEqual(self.expect(0, "band", "ul", "0", "1000").out, "885.2000 MHz\n")
        self.assertAlmostEqual(self.expect_json(0, "band", "dl", "0", "1000")["mhz"], 930.2)
        self.expect(2, "band", "ul", "101", "100")

    def test_sim_simulates_a_fixture_of_many(self):
        with self.handset():
            self.text("nv", "write", "10", "0A")
            backup = self.path("phone.pkv")
            self.text("nv", "backup", "--items", "1-20", backup)
        with fixture(3, self.path("ports"), "--esn", "0x100", "--pkv", backup, "--fault-at", "2:refuse=19,of=7C",
                     "--rate", "20k") as (sim, self.ports):
            self.assertEqual([row["esn"] for row in sim.handsets], ["00000100", "00000101", "00000102"])
            for port, build in ((1, True), (2, False)):
                answer = self.expect_json(0, "-p", str(port), "info")
                self.assertEqual((answer["esn"], answer["build"] is not None), (f"{0xFF + port:08X}", build))
            self.expect(0, "-p", "3", "nv", "verify", backup)
            command(sim, "unplug 3")
            wait_until(lambda: not os.path.lexists(self.ports[3]))
            self.expect(3, "-p", "3", "info")
            self.expect(0, "-p", "1", "info")
            command(sim, "plug all")
            wait_until(lambda: os.path.lexists(self.ports[3]))
            self.expect(0, "-p", "3", "info")
            begin = time.monotonic()
            self.expect(0, "-p", "1", "fs", "put", self.add("file", bytes(10000)), ":/file")
            self.assertGreater(time.monotonic() - begin, 0.9, "10,000 bytes there and back, at 20,000 a second")
        self.assertEqual(os.listdir(self.path("ports")), [])

    def test_sim_ends_cleanly_on_request(self):
        for number in (signal.SIGINT, signal.SIGTERM):
            with self.subTest(signal=number), self.plugged_handset() as sim:
                sim.send_signal(number)
                self.assertEqual(sim.wait(timeout=PATIENCE), 0)
                self.assertFalse(os.path.lexists(self.path("plug")))
