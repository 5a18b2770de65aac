"""Real-time messages on their way to a real broker: all of them, in order, whatever happens on the way."""

import os
import pathlib
import subprocess
import unittest

import talreporting
from mqtt_broker import TOPIC, Broker, Receiver
from tal_harness import PLAYBACK, START, DaemonTest

RTC_SETTINGS = "settings/org.vantle.talsys.rtc.toml"
DEVICE_SETTINGS = "settings/org.vantle.talsys.toml"


def settings(broker, scheme="mqtt", more=""):
    return {RTC_SETTINGS: f'brokers = ["{scheme}://localhost:{broker.port}"]\n{more}',
            DEVICE_SETTINGS: 'device_name = "dev/1+#"\n'}


class Mqtt(DaemonTest):
    @classmethod
    def setUpClass(cls):
        """Each case has a daemon of its own."""

    def start_broker(self, **options):
        broker = Broker(self.make_root(self.addCleanup), **options)
        self.addCleanup(broker.stop)
        return broker.start()

    def receive(self, broker, *options):
        receiver = Receiver(broker, *options)
        self.addCleanup(receiver.close)
        return receiver

    def start_session(self, daemon, reporter, service="longformaudio"):
        client = self.connect(daemon)
        client.create_reporting_session(reporter)
        client.set_service_type(reporter, talreporting.SERVICE_TYPES[service])
        client.start_reporting_session(reporter)
        return client

    def send(self, client, reporter, numbers):
        calls = [client.request(talreporting.SEND_MESSAGE, {"n": n}, PLAYBACK, START, [reporter]) for n in numbers]
        for call in calls:
            client.result(call)

    def outbox(self, daemon):
        return daemon.rows("SELECT count(*) FROM rtc_outbox")[0][0]

    def committed(self, daemon, reporter):
        return daemon.rows("SELECT count(*) FROM rtc_outbox JOIN rtc_sessions s ON s.id = session"
                           " WHERE session_identifier = ?", reporter)[0][0]

    def wait_for_outbox(self, daemon, condition, what):
        barrier = self.connect(daemon, durable=True)
        daemon.eventually(lambda: barrier.get_all_reporters() is not None and condition(self.outbox(daemon)), what)

    def assert_complete(self, receiver, reporter, count):
        receiver.wait_for(lambda: len(receiver.client_numbers(reporter)) >= count, f"{count} messages of {reporter}")
        self.assertEqual(receiver.client_numbers(reporter), list(range(count)), "in order")

    def test_a_normal_run(self):
        broker = self.start_broker()
        receiver = self.receive(broker)
        daemon = self.start_daemon(config=settings(broker))
        batched, realtime = self.start_session(daemon, 7), self.start_session(daemon, 8, "apiusage")
        self.send(realtime, 8, range(20))
        self.send(batched, 7, range(600))
        self.assert_complete(receiver, 8, 20)
        self.assert_complete(receiver, 7, 600)
        batched.stop_reporting_session(7)
        receiver.wait_for(lambda: receiver.of_reporter(7)[-1]["category"] == 0xFFFF, "the summary is flushed")

        prefix = TOPIC + "/dev_1__/"
        for topic, payload in receiver.publications:
            if topic.startswith(prefix + "8/"):
                self.assertEqual(topic, f"{prefix}8/{payload['category']}/{payload['type']}")
            else:
                self.assertEqual(topic, prefix + "7")
                self.assertLessEqual(len(payload), 256)
        numbers = sorted(m["number"] for messages in receiver.by_session.values() for m in messages)
        self.assertEqual(numbers, list(range(1, len(numbers) + 1)), "by one from message to message")
        self.assertEqual(receiver.repeats, 0)
        first = receiver.of_reporter(7)[0]
        self.assertEqual(list(first), ["number", "recorded_at", "category", "type", "session_info", "user_info", "payload"])
        self.assertEqual(first["user_info"]["service_name"], "longformaudio_session")
        self.wait_for_outbox(daemon, lambda rows: rows == 0, "confirmed messages leave the outbox")
        self.assertIn(f"list of backends [mqtt://localhost:{broker.port}]", daemon.log())
        self.assertEqual(daemon.terminate(), 0)

    def test_the_broker_goes_and_comes_back_in_mid_stream(self):
        broker = self.start_broker()
        receiver = self.receive(broker)
        daemon = self.start_daemon(config=settings(broker))
        batched, realtime = self.start_session(daemon, 7), self.start_session(daemon, 8, "apiusage")
        for part in range(3):
            for client, reporter in ((batched, 7), (realtime, 8)):
                self.send(client, reporter, range(part * 1000, part * 1000 + 1000))
                if part == 1 and reporter == 7:
                    broker.stop()
        self.wait_for_outbox(daemon, lambda rows: rows >= 1000, "messages wait for the broker")
        broker.start()
        self.assert_complete(receiver, 7, 3000)
        self.assert_complete(receiver, 8, 3000)
        self.wait_for_outbox(daemon, lambda rows: rows == 0, "confirmed messages leave the outbox")
        self.assertIn("messages wait in the outbox and it is tried again", daemon.log())
        self.assertEqual(daemon.terminate(), 0)

    def test_kill_9_while_the_outbox_is_full(self):
        broker = self.start_broker()
        receiver = self.receive(broker)
        broker.stop()
        root, count = self.make_root(self.addCleanup), 2000
        for life in range(3):
            daemon = self.start_daemon(root=root, config=settings(broker))
            client = self.start_session(daemon, 100 + life)
            self.send(client, 100 + life, range(count))
            if life == 1:
                # Some of it gets through before the end.
                broker.start()
                receiver.wait_for(lambda: receiver.by_session, "some messages")
            # What is not committed yet may be lost; the life in the middle ends anywhere.
            self.wait_for_outbox(daemon, lambda _: life == 1 or self.committed(daemon, 100 + life) >= count,
                                 "all is in the outbox")
            daemon.kill()
            if life == 1:
                broker.stop()
        broker.start()
        daemon = self.start_daemon(root=root)
        for life in (0, 2):
            self.assert_complete(receiver, 100 + life, count)
        part = receiver.client_numbers(101)
        self.assertEqual(part, list(range(len(part))), "what was not committed is the end of the stream")
        self.wait_for_outbox(daemon, lambda rows: rows == 0, "confirmed messages leave the outbox")
        self.assertEqual(daemon.terminate(), 0)

    def test_a_wrong_password_sends_nothing_until_it_is_right(self):
        directory = pathlib.Path(self.make_root(self.addCleanup))
        passwords = directory / "passwords"
        for first, user, password in ((["-c"], "device", "right"), ([], "receiver", "other")):
            subprocess.run(["mosquitto_passwd", "-b", *first, passwords, user, password], check=True,
                           stderr=subprocess.DEVNULL)
        broker = self.start_broker(options=f"password_file {passwords}\n")
        receiver = self.receive(broker, "-u", "receiver", "-P", "other")
        secret = directory / "secret"
        secret.write_text("wrong\n")
        daemon = self.start_daemon(
            config=settings(broker, more=f'username = "device"\npassword_file = "{secret}"\n'))
        self.send(self.start_session(daemon, 7), 7, range(10))
        daemon.eventually(lambda: "not authorised" in daemon.log(), "the refusal is logged")
        self.assertNotIn("connected to broker", daemon.log())
        self.assertEqual(receiver.everything_so_far(), [])
        secret.write_text("right\n")
        self.assert_complete(receiver, 7, 10)
        self.assertEqual(daemon.terminate(), 0)

    def make_certificates(self):
        """An authority, another one, and a server's certificate of the first."""
        directory = pathlib.Path(self.make_root(self.addCleanup))
        run = lambda *arguments: subprocess.run(["openssl", *arguments], check=True, cwd=directory,
                                                stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        for name in ("ca", "other"):
            run("req", "-x509", "-newkey", "rsa:2048", "-nodes", "-days", "3", "-subj", f"/CN={name}", "-keyout",
                f"{name}.key", "-out", f"{name}.crt")
        run("req", "-newkey", "rsa:2048", "-nodes", "-subj", "/CN=localhost", "-keyout", "server.key", "-out", "server.csr")
        run("x509", "-req", "-in", "server.csr", "-CA", "ca.crt", "-CAkey", "ca.key", "-CAcreateserial", "-days", "3",
            "-out", "server.crt")
        for file in os.listdir(directory):
            os.chmod(directory / file, 0o644)
        return directory

    def test_a_certificate_of_another_authority_is_refused(self):
        certificates = self.make_certificates()
        broker = self.start_broker(options=(f"allow_anonymous true\ncafile {certificates}/ca.crt\n"
                                            f"certfile {certificates}/server.crt\nkeyfile {certificates}/server.key\n"))
        receiver = self.receive(broker, "--cafile", f"{certificates}/ca.crt", "-h", "localhost")
        wrong = settings(broker, "mqtts", f'ca_file = "{certificates}/other.crt"\n')
        daemon = self.start_daemon(config=wrong)
        self.send(self.start_session(daemon, 7), 7, range(10))
        daemon.eventually(lambda: "certificate verify failed" in daemon.log(), "the refusal is logged")
        self.assertNotIn("connected to broker", daemon.log())
        self.wait_for_outbox(daemon, lambda rows: rows >= 10, "the messages wait")
        self.assertEqual(receiver.everything_so_far(), [])
        for file, text in settings(broker, "mqtts", f'ca_file = "{certificates}/ca.crt"\n').items():
            daemon.write_config(file, text)
        self.assert_complete(receiver, 7, 10)
        self.assertEqual(daemon.terminate(), 0)


if __name__ == "__main__":
    unittest.main()
