"""What an internal build does for engineers beside its events."""

import unittest

import talreporting
from tal_harness import DaemonTest, PLAYBACK

IO, ERROR_TYPE = 7, 6
WORKER_SETTINGS = "settings/org.vantle.talsys.talreporting.toml"
OVERLOAD = {"smallest_buffer_frame_size": 512, "io_cycle": 9}


class CustomerBuild(DaemonTest):
    config = {WORKER_SETTINGS: "enable_flutter = true\n"}

    def test_an_overload_is_an_event_and_nothing_else(self):
        client = self.connect()
        client.create_reporting_session(7)
        client.start_reporting_session(7)
        client.send_message(OVERLOAD, IO, ERROR_TYPE, [7])
        self.assertEqual(len(self.daemon.events("org.vantle.talsys.IO.Error")), 1)
        self.assertFalse((self.daemon.root / "run/notify/org.vantle.talsys.dropped-flutter").exists())


class InternalBuild(DaemonTest):
    config = {"device.toml": "InternalBuild = true\n",
              WORKER_SETTINGS: "enable_flutter = true\nio_buffer_size = 256\nwait_time = 1000.0\n"}

    def started(self, reporter, service="generic"):
        client = self.connect()
        client.create_reporting_session(reporter)
        client.set_service_type(reporter, talreporting.SERVICE_TYPES[service])
        client.start_reporting_session(reporter)
        return client

    def test_an_overload_asks_for_a_hang_trace_and_announces_it(self):
        client = self.started(7)
        announced = self.daemon.root / "run/notify/org.vantle.talsys.dropped-flutter"
        client.send_message({**OVERLOAD, "smallest_buffer_frame_size": 255}, IO, ERROR_TYPE, [7])
        client.send_message(OVERLOAD, PLAYBACK, ERROR_TYPE, [7])
        self.assertFalse(announced.exists())
        client.send_message(OVERLOAD, IO, ERROR_TYPE, [7])
        self.assertEqual(announced.read_text(), "0")


if __name__ == "__main__":
    unittest.main()
