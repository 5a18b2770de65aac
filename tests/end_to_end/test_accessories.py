"""Paired audio accessories are registered with whoever takes real-time messages, from BlueZ on a bus of the test's own."""

import importlib.util
import json
import pathlib
import re
import shutil
import subprocess
import sys
import time
import unittest

from tal_harness import PLAYBACK, START, DaemonTest

STORED = {"settings/org.vantle.talsys.rtc.toml": "store = true\n"}
STATE_SETTINGS = "state/settings/org.vantle.talsys.talreporting.toml"
SETUP_CATEGORY, SETUP_TYPE, ROUTE_CHANGE = 8, 5, 10
NOT_REGISTERED = "accessories are not registered: "


def uuid(number):
    return f"0000{number}-0000-1000-8000-00805f9b34fb"


def device(address, **properties):
    return {"org.bluez.Device1": {"Address": ["s", address], "Paired": ["b", True], **properties}}


HEADPHONES = "/org/bluez/hci0/dev_38_18_4C_00_00_01"
OBJECTS = {
    "/org/bluez": {"org.bluez.AgentManager1": {}},
    "/org/bluez/hci0": {"org.bluez.Adapter1": {"Address": ["s", "00:00:00:00:00:01"], "Class": ["u", 0x400]}},
    HEADPHONES: {**device("38:18:4C:00:00:01", Name=["s", "Headphones ♪"], Alias=["s", "Anna's"],
                          Class=["u", 0x240404], Modalias=["s", "usb:v054Cp0CD3d0204"], Connected=["b", True],
                          Icon=["s", "audio-headset"]),
                 "org.bluez.Battery1": {"Percentage": ["y", 70]}},
    HEADPHONES + "/service0001/char0002": {
        "org.bluez.GattCharacteristic1": {"UUID": ["s", uuid("2a26")], "Value": ["ay", "2.1.0\0"]}},
    "/org/bluez/hci0/dev_2": device("AA:00:00:00:00:02", Alias=["s", "Speaker"], UUIDs=["as", [uuid("110b")]]),
    "/org/bluez/hci0/dev_3": device("AA:00:00:00:00:03", Name=["s", "Phone"], UUIDs=["as", [uuid("110a")]]),
    "/org/bluez/hci0/dev_4": {"org.bluez.Device1": {"Address": ["s", "AA:00:00:00:00:04"], "Class": ["u", 0x240404],
                                                    "Paired": ["b", False]}},
    # Nothing of this is what it should be.
    "/org/bluez/hci0/dev_5": device("AA:00:00:00:00:05", Name=["u", 5], Class=["u", 0x240404], UUIDs=["s", "x"],
                                    Modalias=["as", ["x"]], Connected=["s", "yes"]),
    "/org/bluez/hci0/dev_6": device("AA:00:00:00:00:06", Name=["s", "♪" * 1000], Class=["i", 0x240404],
                                    UUIDs=["as", [uuid("110b")] * 1000]),
}


@unittest.skipUnless(shutil.which("dbus-daemon"), "no dbus-daemon")
@unittest.skipUnless(importlib.util.find_spec("dbus") and importlib.util.find_spec("gi"), "no python3-dbus or -gi")
class Accessories(DaemonTest):
    @classmethod
    def setUpClass(cls):
        """Each case has a bus and a daemon of its own."""

    def start_bluez(self, root, objects):
        address = self.start_bus(root)
        (pathlib.Path(root) / "bluez.json").write_text(json.dumps(objects))
        bluez = self.start_process(sys.executable, pathlib.Path(__file__).with_name("stand_in_bluez.py"), address,
                                   f"{root}/bluez.json", stdout=subprocess.PIPE)
        self.assertEqual(bluez.stdout.readline(), b"ready\n")
        return address, bluez

    def start_on(self, address, root, **options):
        return self.start_daemon("--log-level", "info", root=root, config=STORED,
                                 environment={"DBUS_SYSTEM_BUS_ADDRESS": address}, **options)

    def start_session(self, daemon, reporter=7):
        client = self.connect(daemon)
        client.create_reporting_session(reporter)
        client.start_reporting_session(reporter)
        return client

    def inventories(self, daemon):
        """Whole inventories, in the order of recording."""
        return [json.loads(payload) for (payload,) in daemon.rows(
            "SELECT payload FROM rtc_messages WHERE category = ? AND type = ? AND payload LIKE '%accessories%' "
            "ORDER BY id", SETUP_CATEGORY, SETUP_TYPE)]

    def first_inventory(self, daemon):
        daemon.eventually(lambda: self.inventories(daemon), "the inventory is stored")
        (inventory,) = self.inventories(daemon)
        return inventory

    def test_the_inventory_is_published_with_addresses_hashed(self):
        root = self.make_root(self.addCleanup)
        address, _ = self.start_bluez(root, OBJECTS)
        daemon = self.start_on(address, root)
        self.start_session(daemon)
        inventory = self.first_inventory(daemon)
        units = {unit.get("name", "")[:12]: unit for unit in inventory["accessories"]}
        self.assertEqual((inventory["accessory_count"], sorted(units)), (4, ["", "Headphones ♪", "Speaker", "♪" * 12]))
        hashes = [unit.pop("address_hash") for unit in inventory["accessories"]]
        self.assertTrue(all(re.fullmatch("[0-9a-f]{64}", each) for each in hashes), hashes)
        self.assertEqual(len(set(hashes)), 4)
        self.assertEqual(units["Headphones ♪"], {
            "connected": True, "name": "Headphones ♪", "vendor_source": "usb", "vendor_id": 0x054C,
            "product_id": 0x0CD3, "product_version": 0x0204, "battery_percent": 70, "firmware": "2.1.0"})
        self.assertEqual(units["Speaker"], {"connected": False, "name": "Speaker"})
        self.assertEqual(units[""], {"connected": False})
        self.assertLessEqual(len(units["♪" * 12]["name"].encode()), 248)
        self.assertEqual((pathlib.Path(root) / "state/accessory-salt").stat().st_mode & 0o777, 0o600)
        self.assertNotIn("38:18:4C", str(daemon.rows("SELECT payload FROM rtc_messages")) + daemon.log())

    def test_it_is_published_once_in_24_hours_and_hashes_stay(self):
        root = self.make_root(self.addCleanup)
        address, bluez = self.start_bluez(root, OBJECTS)
        first = self.start_on(address, root)
        self.start_session(first)
        before = self.first_inventory(first)
        client = self.start_session(first, 8)
        client.send_message({"route": "headphones"}, ROUTE_CHANGE, START, [8])
        self.assertEqual(first.terminate(), 0)

        again = self.start_on(address, root)
        self.start_session(again)
        again.settle()
        self.assertEqual(again.terminate(), 0)
        self.assertEqual(self.inventories(again), [before])

        settings = pathlib.Path(root) / STATE_SETTINGS
        published = float(re.search(r"audio_registration_published_at = ([\d.e+]+)", settings.read_text())[1])
        self.assertLess(abs(time.time() - published), 3600)
        settings.write_text(f"audio_registration_published_at = {time.time() - 86401}\n")
        later = self.start_on(address, root)
        self.start_session(later)
        later.eventually(lambda: len(self.inventories(later)) == 2, "a day later there is another")
        self.assertEqual(self.inventories(later), [before, before])
        bluez.kill()
        self.assertEqual(bluez.stdout.read().count(b"asked"), 2)

    def test_without_bluez_or_bus_there_is_one_line_and_nothing_else(self):
        root = self.make_root(self.addCleanup)
        for address, why in ((self.start_bus(root), "no BlueZ: "), (f"unix:path={root}/nowhere", "no system bus: ")):
            with self.subTest(why):
                daemon = self.start_on(address, root, log=f"{why[3:6]}.log")
                for reporter in (7, 8, 9):
                    self.start_session(daemon, reporter)
                daemon.eventually(lambda: NOT_REGISTERED in daemon.log(), "the line")
                self.assertEqual(daemon.terminate(), 0)
                (line,) = [line for line in daemon.log().splitlines() if NOT_REGISTERED in line]
                self.assertRegex(line, r"talrz info +.*" + NOT_REGISTERED + why)
                self.assertEqual(self.inventories(daemon), [])

    def test_a_silent_bluez_holds_nothing_up(self):
        root = self.make_root(self.addCleanup)
        address, bluez = self.start_bluez(root, None)
        daemon = self.start_on(address, root)
        client = self.start_session(daemon)
        self.assertEqual(bluez.stdout.readline(), b"asked\n")
        client.send_message({"n": 1}, PLAYBACK, START, [7])
        daemon.eventually(lambda: NOT_REGISTERED in daemon.log(), "the question is given up")
        self.assertEqual(daemon.terminate(), 0)


if __name__ == "__main__":
    unittest.main()
