"""The Python module against kyn-sim over real HTTPS: blocking and asyncio commands, the log, refusals."""

import asyncio
import json
import logging
import os
import subprocess
import tempfile
import unittest

from kyn_assistant import ON_DEPARTURE, KynError, Plugin

PERSON = "P-2000001"
TOKEN = "tok-python-7c1d"
FRIENDS = {"friends": {"ada@example.com": {
    "location": {"latitude": 45.5152, "longitude": -122.6784, "labels": [{"label": "Work"}]}, "ageSeconds": 300}}}
ADA = ("BEGIN:VCARD\r\nVERSION:3.0\r\nUID:ada-1\r\nFN:Ada Marlowe\r\nN:Marlowe;Ada;;;\r\n"
       "EMAIL:ada@example.com\r\nPHOTO;ENCODING=b;TYPE=PGM:UDUKMiAxCjI1NQoQ8A==\r\nEND:VCARD\r\n")


def write(path, text, mode=0o644):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "w", encoding="utf-8") as out:
        out.write(text)
    os.chmod(path, mode)


class PluginAgainstSim(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.work = tempfile.TemporaryDirectory()
        root = cls.work.name
        write(f"{root}/sim/token", TOKEN, 0o600)
        write(f"{root}/sim/friends.json", json.dumps(FRIENDS))
        cls.sim = subprocess.Popen([os.environ["KYN_SIM"], "--person", PERSON, "--token-file", f"{root}/sim/token",
                                    "--data", f"{root}/sim/friends.json", "--ca-out", f"{root}/sim/ca.pem"],
                                   stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True)
        port = cls.sim.stdout.readline().rsplit(":", 1)[-1].strip()  # "... listening on https://HOST:PORT"
        cls.config = f"{root}/config"
        write(f"{cls.config}/account.json",
              json.dumps({"personId": PERSON, "username": "sam@example.com", "serviceHost": f"localhost:{port}"}))
        write(f"{cls.config}/token", TOKEN, 0o600)
        write(f"{cls.config}/config.json", json.dumps({"caFile": f"{root}/sim/ca.pem"}))
        write(f"{cls.config}/contacts/ada.vcf", ADA)
        cls.plugin = Plugin(cls.config, language="en-US")
        cls.plugin.set_log_level(logging.DEBUG)

    @classmethod
    def tearDownClass(cls):
        cls.plugin.close()
        cls.sim.terminate()
        cls.sim.wait()
        cls.sim.stdout.close()
        cls.work.cleanup()

    def test_a_search_names_the_friend_and_forwards_the_log(self):
        with self.assertLogs("kyn_assistant", logging.DEBUG) as log:
            reply = self.plugin.search(friends=["ada@example.com"], here=(45.5231, -122.6765))
        self.assertEqual(reply["class"], "AXKynSearchCompleted", reply)
        described = self.plugin.describe(reply["kynLocations"][0])
        self.assertEqual(described["name"], "Ada Marlowe")
        self.assertEqual(described["place"], "Work")
        self.assertTrue(self.plugin.describe(reply["kynLocations"][0], here=(45.5231, -122.6765))["distance"]
                        .endswith(" away"))
        self.assertEqual(self.plugin.picture(reply["kynLocations"][0]), (b"P5\n2 1\n255\n\x10\xf0", 2, 1))
        self.assertTrue(any("getlocations" in line for line in log.output), log.output)
        self.assertFalse(any(TOKEN in line for line in log.output))

    def test_concurrent_async_searches_are_each_answered(self):
        async def many():
            return await asyncio.gather(*(self.plugin.search_async(friends=["Ada"]) for _ in range(6)))

        replies = asyncio.run(many())
        self.assertEqual([r["class"] for r in replies], ["AXKynSearchCompleted"] * 6)

    def test_my_location_is_hidden_and_shown_again(self):
        for visible in (False, True):
            self.assertEqual(self.plugin.set_visibility(visible)["class"], "AXKynVisibilitySetCompleted")

    def test_failures_come_back_as_replies_or_errors(self):
        self.assertEqual(self.plugin.search(), {"class": "AXCommandFailed",
                                                "reason": "Need at least emails or current location"})
        with self.assertRaises(KynError):
            self.plugin.search(friends=["Nobody Known"])
        with self.assertRaises(KynError):
            Plugin(os.path.join(self.work.name, "missing"))

    def test_set_geofence_where_ada_is_and_at_an_unknown_address(self):
        # Nothing names a place: the fence goes where Ada is now.
        command = self.plugin.geofence_command("ada@example.com", trigger=ON_DEPARTURE)
        self.assertNotIn("requestedLocation", command)
        reply = self.plugin.perform(command)
        self.assertEqual(reply["class"], "AXKynGeoFenceSetCompleted", reply)
        self.assertEqual((reply["geoFence"]["location"]["latitude"], reply["geoFence"]["trigger"]),
                         (45.5152, ON_DEPARTURE))
        self.assertEqual(reply["geoFence"]["friend"]["data"], "ada@example.com")
        unknown = self.plugin.set_geofence("Ada", address={"street": "9 Nowhere Road", "city": "Atlantis"},
                                           notify_them=True)
        self.assertEqual(unknown, {"class": "AXCommandFailed", "errorCode": 1010})


class AccountAndClosedPlugin(unittest.TestCase):
    def test_sign_in_show_and_out_then_a_closed_plugin_refuses_commands(self):
        with tempfile.TemporaryDirectory() as config:
            plugin = Plugin(config)
            with self.assertRaises(ValueError):
                plugin.sign_in("P-1", "sam", "https://example.com/", "t0k")
            self.assertIsNone(plugin.account())
            plugin.sign_in("P-1", "sam", "example.com:8443", "t0k")
            account = plugin.account()
            self.assertEqual(account, {"personId": "P-1", "username": "sam", "serviceHost": "example.com:8443",
                                       "provisioned": True, "restricted": False, "token": "readable"})
            self.assertTrue(plugin.sign_out())
            plugin.close()
            with self.assertRaises(KynError):
                plugin.search(here=(1.0, 2.0))


if __name__ == "__main__":
    unittest.main()
