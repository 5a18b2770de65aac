"""The life of sessions as clients see it: replies held back and repeated, several clients, broadcasts, lost clients."""

import subprocess
import sys
import unittest

import talreporting
from tal_harness import PLAYBACK, START, STOP, DaemonTest

NAME = "org.vantle.talsys.Playback.Start"


def service_event(service):
    return f"org.vantle.{service}.Playback.Start"


class Sessions(DaemonTest):
    def setUp(self):
        self.wait_for_no_sessions()

    def session(self, client, reporter, service="longformaudio", **configuration):
        client.create_reporting_session(reporter)
        client.set_service_type(reporter, talreporting.SERVICE_TYPES[service])
        client.set_configuration(reporter, configuration)
        return client.start_reporting_session(reporter)

    def test_a_whole_life(self):
        client = self.connect()
        self.assertIs(client.create_reporting_session(7), True)
        self.assertEqual(client.get_service_name(7), talreporting.NO_SERVICE_TYPE)
        self.assertIs(client.set_service_type(7, 7), True)
        self.assertIs(client.set_configuration(7, {"RvHostApplicationDisplayID": "org.example.player"}), True)
        self.assertIs(client.set_configuration(7, None), True)
        self.assertEqual(client.validate_reporter(7), {"reporterID": 7, "serviceType": 7})
        self.assertEqual(client.get_all_reporters(), [7])

        started, again = client.start_reporting_session(7), client.start_reporting_session(7)
        self.assertIsNone(client.send_message({"case": "life", "two words": 1}, PLAYBACK, START, [7]))
        self.assertFalse(client.has_reply(started), "a start is answered at the stop")
        self.assertIs(client.stop_reporting_session(7), True)
        self.assertIs(client.result(started), True)

        second = client.start_reporting_session(7)
        client.stop_reporting_session(7)
        self.assertIs(client.result(second), True)
        self.assertIs(client.destroy_reporting_session(7), True)
        self.assertEqual(client.validate_reporter(7), {"reporterID": 0, "serviceType": 65535})
        self.assertFalse(client.has_reply(again), "a start of a started session is never answered")

        for name in (NAME, service_event("longformaudio")):
            (payload,) = self.daemon.events(name, case="life")
            self.assertIsInstance(payload.pop("talreporting_timestamp"), float)
            self.assertEqual(payload, {"case": "life", "two_words": 1, "audiotag": "PlaybackStart",
                                       "invalid_timestamp": "nil", "HostApplicationDisplayID": "org.example.player"})

    def test_unknown_and_zero_ids_are_answered_at_once(self):
        client = self.connect()
        for reporter in (0, 12345, -5):
            self.assertIs(client.result(client.start_reporting_session(reporter)), True)
            self.assertIs(client.stop_reporting_session(reporter), True)
            self.assertIs(client.destroy_reporting_session(reporter), True)
            self.assertIs(client.set_service_type(reporter, 3), True)
            self.assertIs(client.set_configuration(reporter, {"a": 1}), True)
            self.assertIsNone(client.send_message({"case": "nobody"}, PLAYBACK, START, [reporter]))
        self.assertEqual(self.daemon.events(NAME, case="nobody"), [])

    def test_the_type_of_reporter_zero_is_answered_twice(self):
        client = self.connect()
        call = client.request(talreporting.GET_SERVICE_NAME, 0)
        self.assertEqual([client.result(call), client.result(call)], [65535, 65535])
        call = client.request(talreporting.GET_SERVICE_NAME, 99)
        self.assertEqual(client.result(call), 65535)
        client.get_all_reporters()
        self.assertFalse(client.has_reply(call), "any other reporter is answered once")

    def test_a_type_change_replaces_the_session(self):
        client = self.connect()
        started = self.session(client, 7, HostApplicationDisplayID="org.example.kept")
        client.set_service_type(7, talreporting.SERVICE_TYPES["alarms"])
        client.send_message({"case": "replaced"}, PLAYBACK, START, [7])
        client.stop_reporting_session(7)
        self.assertFalse(client.has_reply(started), "the start of the replaced session stays unanswered")
        (payload,) = self.daemon.events(service_event("alarms"), case="replaced")
        self.assertEqual(payload["HostApplicationDisplayID"], "org.example.kept")
        self.assertEqual(self.daemon.events(service_event("longformaudio"), case="replaced"), [])
        # The new session is not started until asked; then stop answers this start.
        restarted = client.start_reporting_session(7)
        client.set_service_type(7, talreporting.SERVICE_TYPES["alarms"])  # the same type: still the same session
        client.stop_reporting_session(7)
        self.assertIs(client.result(restarted), True)

    def test_clients_see_each_others_sessions_but_change_only_their_own(self):
        first, second = self.connect(), self.connect()
        started = self.session(first, 7)
        self.session(second, 8, "haptics")
        self.assertEqual(first.get_all_reporters(), [7, 8])
        self.assertEqual(second.get_service_name(7), 7)
        self.assertEqual(second.validate_reporter(7), {"reporterID": 7, "serviceType": 7})
        for change in (lambda: second.set_service_type(7, 3), lambda: second.stop_reporting_session(7),
                       lambda: second.set_configuration(7, {"HostApplicationDisplayID": "intruder"}),
                       lambda: second.destroy_reporting_session(7)):
            self.assertIs(change(), True)
        second.send_message({"case": "across"}, PLAYBACK, START, [7, 0, 99, 8, 7])
        self.assertFalse(first.has_reply(started))
        self.assertEqual(first.get_service_name(7), 7)
        (payload,) = self.daemon.events(service_event("longformaudio"), case="across")
        self.assertEqual(payload["HostApplicationDisplayID"], "Unknown")
        self.assertEqual(len(self.daemon.events(service_event("haptics"), case="across")), 1)
        # The same ID twice: the connection's own session comes first for itself, the older client's for messages.
        self.session(second, 7, "alerts")
        self.assertEqual((first.get_service_name(7), second.get_service_name(7)), (7, 10))
        second.send_message({"case": "shared id"}, PLAYBACK, START, [7])
        self.assertEqual(self.daemon.events(service_event("alerts"), case="shared id"), [])

    def test_a_broadcast_reaches_every_started_session(self):
        first, second, third = self.connect(), self.connect(), self.connect()
        self.session(first, 7)
        self.session(second, 8, "haptics")
        third.create_reporting_session(9)  # never started
        for receivers in (None, []):
            third.send_message({"case": "broadcast", "to": repr(receivers)}, PLAYBACK, START, receivers)
        for service, count in {"longformaudio": 2, "haptics": 2, "unknown": 0, "standalone": 0}.items():
            self.assertEqual(len(self.daemon.events(service_event(service), case="broadcast")), count, service)

    def test_a_broadcast_without_started_sessions_goes_to_the_single_message_session(self):
        client = self.connect()
        client.create_reporting_session(7)
        for number in (1, 2):
            client.send_message({"case": "single", "number": number}, PLAYBACK, START)
        self.assertEqual([(p["number"], p["HostApplicationDisplayID"])
                          for p in self.daemon.events(service_event("standalone"), case="single")],
                         [(1, "Unknown"), (2, "Unknown")])
        self.assertEqual(client.get_all_reporters(), [7])
        self.assertEqual(client.validate_reporter(1)["reporterID"], 0, "no client can address it")

    def test_a_killed_client_leaves_stopped_sessions_and_its_uptime(self):
        code = ("import os, sys, talreporting\n"
                "client = talreporting.Client(sys.argv[1])\n"
                "client.create_reporting_session(7)\n"
                "client.start_reporting_session(7)\n"
                "client.send_message({'case': 'killed'}, 4, 1, [7])\n"
                "print(flush=True)\n"
                "sys.stdin.read()\n")
        with subprocess.Popen([sys.executable, "-c", code, self.daemon.socket_path], stdin=subprocess.PIPE,
                              stdout=subprocess.PIPE) as process:
            self.assertEqual(process.stdout.readline(), b"\n")
            with open(f"/proc/{process.pid}/comm") as file:
                name = file.read().strip()
            watcher = self.connect()
            self.assertEqual(watcher.get_all_reporters(), [7])
            uptime = "org.vantle.talsys.talreportingclientuptime"
            before = len(self.daemon.events(uptime))
            process.kill()
        self.daemon.eventually(lambda: len(self.daemon.events(uptime)) > before, "the uptime event")
        event = self.daemon.events(uptime)[-1]
        self.assertEqual((set(event), event["processName"]), ({"processName", "seconds"}, name))
        self.assertGreaterEqual(event["seconds"], 0)
        self.assertIn(f"connection exited process={name} uptime_sec=", self.daemon.log())
        self.assertEqual(watcher.get_all_reporters(), [])
        watcher.send_message({"case": "after the kill"}, PLAYBACK, STOP)
        self.assertEqual(len(self.daemon.events("org.vantle.standalone.Playback.Stop", case="after the kill")), 1)


class InternalBuild(DaemonTest):
    config = {"device.toml": "InternalBuild = true\n"}

    def test_a_test_session_is_answered_at_once_and_again_at_stop(self):
        client = self.connect()
        client.create_reporting_session(7)
        client.set_service_type(7, talreporting.SERVICE_TYPES["test"])
        started = client.start_reporting_session(7)
        self.assertIs(client.result(started), True)
        for receivers in (None, [7]):
            client.send_message({"case": "marked", "to": repr(receivers)}, PLAYBACK, START, receivers)
        self.assertEqual([p.get("sendSingleMessage") for p in self.daemon.events(service_event("test"), case="marked")],
                         [True, None])
        client.stop_reporting_session(7)
        self.assertIs(client.result(started), True)


if __name__ == "__main__":
    unittest.main()
