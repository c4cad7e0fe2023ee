"""Factory test mode, the channels of the bands, and the simulated handset itself."""
import os
import signal

from tool import PATIENCE, ToolTest


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

    def test_sim_ends_cleanly_on_request(self):
        for number in (signal.SIGINT, signal.SIGTERM):
            with self.subTest(signal=number), self.handset() as sim:
                sim.send_signal(number)
                self.assertEqual(sim.wait(timeout=PATIENCE), 0)
                self.assertFalse(os.path.exists(sim.device))
