"""Real-time messages: what reaches the back-ends of real-time statistics, and what the log says of it."""

import json
import unittest

import talreporting
from tal_harness import PLAYBACK, START, DaemonTest

RTC_SETTINGS = "settings/org.vantle.talsys.rtc.toml"


def run_session(client, reporter, service, count):
    """A session from beginning to end, its messages numbered from 0."""
    client.create_reporting_session(reporter)
    client.set_service_type(reporter, talreporting.SERVICE_TYPES[service])
    client.start_reporting_session(reporter)
    for number in range(count):
        client.send_message({"n": number}, PLAYBACK, START, [reporter])
    client.stop_reporting_session(reporter)
    client.destroy_reporting_session(reporter)


def rtc_rows(daemon, reporter):
    return daemon.rows("SELECT category, type, realtime, session_info, user_info, payload FROM rtc_messages"
                       " WHERE session_identifier = ? ORDER BY id", reporter)


class RealTimeStore(DaemonTest):
    config = {RTC_SETTINGS: "store = true\n"}

    def test_messages_and_summary_stand_in_the_store(self):
        client = self.connect()
        for reporter, service, realtime in ((501, "longformaudio", 0), (502, "apiusage", 1)):
            with self.subTest(service):
                run_session(client, reporter, service, 3)
                self.daemon.eventually(lambda: any(row[0] == 0xFFFF for row in rtc_rows(self.daemon, reporter)),
                                       "the summary is stored")
                rows = rtc_rows(self.daemon, reporter)
                client_rows = [json.loads(row[5])["n"] for row in rows if row[:2] == (PLAYBACK, START)]
                self.assertEqual(client_rows, [0, 1, 2])
                self.assertEqual({row[2] for row in rows}, {realtime})
                self.assertEqual(json.loads(rows[0][3])["batch_events"], not realtime)
                self.assertEqual(json.loads(rows[0][4])["service_name"], service + "_session")
                summary = json.loads(rows[-1][5])
                self.assertEqual(rows[-1][:2], (0xFFFF, 65535))
                self.assertTrue(summary["n"].startswith("0,1,2"))
                self.assertTrue(all("talreporting_timestamp" not in json.loads(row[5]) for row in rows))

    def test_sigterm_stores_the_summaries_of_running_sessions(self):
        daemon = self.start_daemon(config=self.config)
        client = self.connect(daemon)
        client.create_reporting_session(7)
        client.set_service_type(7, talreporting.SERVICE_TYPES["longformaudio"])
        client.start_reporting_session(7)
        for number in range(2000):
            client.send_message({"n": number}, PLAYBACK, START, [7])
        self.assertEqual(daemon.terminate(), 0)
        rows = rtc_rows(daemon, 7)
        self.assertEqual([json.loads(row[5])["n"] for row in rows if row[:2] == (PLAYBACK, START)],
                         list(range(2000)))
        self.assertEqual(rows[-1][:2], (0xFFFF, 65535))


class NoBackends(DaemonTest):
    def test_a_session_without_back_ends_says_so_and_drops_each_message(self):
        run_session(self.connect(), 503, "longformaudio", 2)
        self.assertEqual(self.daemon.rows("SELECT count(*) FROM rtc_messages"), [(0,)])
        lines = ("no backends found, this session won't get sent to the server", "waiting to find backends",
                 "failed to find backend", "Session never started. shutDown")
        for line in lines:
            self.daemon.eventually(lambda: line in self.daemon.log(), line)
        self.assertGreaterEqual(self.daemon.log().count("Session never started. handleMessage"), 2)


if __name__ == "__main__":
    unittest.main()
