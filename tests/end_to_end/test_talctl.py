"""talctl against the real daemon: what people and scripts rely on."""

import json
import os
import pathlib
import select
import subprocess
import unittest

from tal_harness import BIN_DIR, PATIENCE_SECONDS, DaemonTest, run_program


def talctl(daemon_root, *arguments, **options):
    return subprocess.run([BIN_DIR / "talctl", "--root", str(daemon_root), *arguments], capture_output=True, text=True,
                          timeout=PATIENCE_SECONDS, **{"stdin": subprocess.DEVNULL, **options})


class Following:
    """A running `talctl events --follow --json`, its lines read as they come."""

    def __init__(self, test, root, *arguments):
        self.process = subprocess.Popen([BIN_DIR / "talctl", "--root", str(root), "events", "--follow", "--json",
                                         *arguments], stdin=subprocess.DEVNULL, stdout=subprocess.PIPE)
        test.addCleanup(self._end)
        self._buffer = b""

    def _end(self):
        self.process.kill()
        self.process.stdout.close()
        self.process.wait(PATIENCE_SECONDS)

    def next_payload(self):
        while b"\n" not in self._buffer:
            if not select.select([self.process.stdout], [], [], PATIENCE_SECONDS)[0]:
                raise AssertionError("no event came")
            data = os.read(self.process.stdout.fileno(), 65536)
            if not data:
                raise AssertionError(f"talctl ended with {self.process.wait(PATIENCE_SECONDS)}")
            self._buffer += data
        line, self._buffer = self._buffer.split(b"\n", 1)
        return json.loads(line)["payload"]


class TalctlTest(DaemonTest):
    def run_ok(self, *arguments, **options):
        done = talctl(self.daemon.root, *arguments, **options)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        return done.stdout

    def run_badly(self, status, *arguments, root=None, **options):
        """Its one line on standard error."""
        done = talctl(root or self.daemon.root, *arguments, **options)
        self.assertEqual((done.returncode, done.stdout), (status, ""), done.stderr)
        self.assertRegex(done.stderr, r"\Atalctl: [^\n]+\n\Z")
        return done.stderr

    def events(self, *arguments):
        return [json.loads(line) for line in self.run_ok("events", "--json", *arguments).splitlines()]

    def started_client(self, reporter, service=7):
        client = self.connect()
        client.create_reporting_session(reporter)
        client.set_service_type(reporter, service)
        client.start_reporting_session(reporter)
        client.get_all_reporters()  # answered after the start has been carried out
        return client

    def test_status_lists_reporters(self):
        self.started_client(4711)
        self.assertRegex(self.run_ok("status"), r"(?s)talreportingd \S+ runs at .*4711 +7 +longformaudio\n")
        status = json.loads(self.run_ok("status", "--json"))
        self.assertIs(status["running"], True)
        self.assertIn({"reporter": 4711, "service_type": 7, "service": "longformaudio"}, status["reporters"])

    def test_what_was_sent_is_stored_on_return(self):
        self.started_client(21)
        self.run_ok("send", "Playback", "start", "--reporter", "21", "whole=1", "negative=-1", "part=1.0", "truth=true",
                    'text="1"', "word=Built-in Audio", 'nested={"list": [1, {"deep": false}]}',
                    'when={"$date": 0.5}', 'bytes={"$data": "AP8Q"}')
        (row,) = self.daemon.rows("SELECT payload FROM events WHERE name = 'org.vantle.longformaudio.Playback.Start' "
                                  "AND json_extract(payload, '$.word') IS NOT NULL")
        self.assertTrue(row[0].startswith(
            '{"whole":1,"negative":-1,"part":1.0,"truth":true,"text":"1","word":"Built-in Audio",'
            '"nested":{"list":[1,{"deep":false}]},"when":"1970-01-01T00:00:00.500000Z","bytes":"AP8Q"'), row)

    def test_without_a_reporter_every_started_session_gets_it(self):
        self.started_client(31, service=7)
        self.started_client(32, service=2)
        self.run_ok("send", "4", "2", "mark=everyone")
        names = [row[0] for row in self.daemon.rows(
            "SELECT name FROM events WHERE json_extract(payload, '$.mark') = 'everyone'")]
        self.assertIn("org.vantle.longformaudio.Playback.Stop", names)
        self.assertIn("org.vantle.telephony.Playback.Stop", names)

    def test_events_are_filtered_and_ordered(self):
        for number in range(5):
            self.run_ok("send", "Volume", "Generic", f"filter_test={number}")
            self.run_ok("send", "Input", "Generic", f"filter_test={number}")
        found = self.events("--name", "*.Volume.Generic", "-n", "3")
        self.assertEqual([event["payload"]["filter_test"] for event in found][-1], 4)
        self.assertEqual(len(found), 3)
        self.assertTrue(all(event["name"].endswith(".Volume.Generic") for event in found))
        ids = [event["id"] for event in self.events("--since", "1h")]
        self.assertEqual(ids, sorted(ids))
        self.assertGreaterEqual(len(ids), 20)
        self.assertEqual(self.events("--since", "0s"), [])
        self.assertIn("filter_test=4", self.run_ok("events"))

    def test_follow_outlives_daemon_and_store(self):
        root = pathlib.Path(self.make_root(self.addCleanup))
        following = Following(self, root / "not" / "there", "--name", "org.vantle.talsys.Playback.*")
        daemon_root = root / "not" / "there"

        def send(mark):
            done = talctl(daemon_root, "send", "Playback", "Start", f"mark={mark}")
            self.assertEqual((done.returncode, done.stderr), (0, ""))
            self.assertEqual(following.next_payload()["mark"], mark)

        daemon_root.mkdir(parents=True)
        daemon = self.start_daemon(root=daemon_root)
        send("the first daemon")
        daemon.kill()
        daemon = self.start_daemon(root=daemon_root)
        send("after kill -9")
        self.assertEqual(daemon.terminate(), 0)
        for file in (daemon_root / "state").glob("store.db*"):
            file.unlink()
        self.start_daemon(root=daemon_root)
        send("a new store")

    def test_follow_ends_when_nobody_reads(self):
        following = Following(self, self.daemon.root, "-n", "0")
        following.process.stdout.close()
        self.assertEqual(following.process.wait(PATIENCE_SECONDS), 0)
        following.process.stdout = open(os.devnull, "rb")

    def write_script(self, *lines):
        path = pathlib.Path(self.make_root(self.addCleanup)) / "script"
        path.write_text("\n".join(lines) + "\n")
        return str(path)

    SCRIPT = ('{"op": "create", "reporter": 51}',
              '{"op": "set_service", "reporter": 51, "service": "telephony"}',
              '{"op": "configure", "reporter": 51, "configuration": {"HostApplicationDisplayID": "org.example.replay"}}',
              '# the call', '',
              '{"op": "start", "reporter": 51}',
              '{"op": "get_service", "reporter": 51}',
              '{"op": "validate", "reporter": 51}',
              '{"op": "list"}',
              '{"op": "send", "category": "Record", "type": "Start", "reporters": [51], "message": {"mark": "replayed"}}',
              '{"op": "stop", "reporter": 51}',
              '{"op": "destroy", "reporter": 51}',
              '{"op": "validate", "reporter": 51}')

    def test_replay_carries_out_a_script(self):
        answers = [json.loads(line) for line in self.run_ok("replay", self.write_script(*self.SCRIPT)).splitlines()]
        self.assertEqual([(answer["line"], answer["op"]) for answer in answers],
                         [(7, "get_service"), (8, "validate"), (9, "list"), (13, "validate")])
        self.assertEqual([answer.get("service") for answer in answers], ["telephony", "telephony", None, "unknown"])
        self.assertIn(51, answers[2]["reporters"])
        self.assertEqual(answers[3]["reporter"], 0)
        (payload,) = [event["payload"] for event in self.events("--name", "org.vantle.telephony.Record.Start")
                      if event["payload"].get("mark") == "replayed"]
        self.assertEqual(payload["HostApplicationDisplayID"], "org.example.replay")

    def test_replay_of_many_messages_loses_none(self):
        count = 30000  # several times what the client's queue holds
        script = "".join(f'{{"op":"send","category":1,"type":0,"message":{{"flood":{number}}}}}\n'
                         for number in range(count))
        done = subprocess.run([BIN_DIR / "talctl", "--root", str(self.daemon.root), "replay", "-"], input=script,
                              capture_output=True, text=True, timeout=PATIENCE_SECONDS)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        rows = self.daemon.rows("SELECT json_extract(payload, '$.flood') FROM events WHERE name = "
                                "'org.vantle.talsys.Generic.Generic' AND json_extract(payload, '$.flood') IS NOT NULL "
                                "ORDER BY id")
        self.assertEqual([row[0] for row in rows], list(range(count)))

    def test_replay_checks_a_file_before_it_begins(self):
        send = '{"op": "send", "category": 4, "type": 1, "message": {"mark": "%s"}}'
        script = (send % "before a bad line", "", '{"op": "fly"}')
        self.assertIn("line 3:", self.run_badly(2, "replay", self.write_script(*script)))
        self.assertEqual(self.daemon.rows("SELECT 1 FROM events WHERE payload LIKE '%before a bad line%'"), [])
        with open(self.write_script(send % "streamed", '{"op": "fly"}')) as script:
            self.assertIn("line 2:", self.run_badly(2, "replay", "-", stdin=script))
        self.daemon.eventually(lambda: self.daemon.rows("SELECT 1 FROM events WHERE payload LIKE '%streamed%'"),
                        "what stood before the bad line is sent")

    def test_settings_have_two_layers(self):
        domain = "org.vantle.talsys.talctl_test"
        self.daemon.write_config(f"settings/{domain}.toml", 'a = "administrator"\nb = [1, 2.5]\n')
        self.assertEqual(self.run_ok("settings", "get", domain, "a"), "administrator\n")
        self.assertEqual(self.run_ok("settings", "get", domain, "b"), "[1,2.5]\n")
        self.run_ok("settings", "set", domain, "a", "own word")
        self.run_ok("settings", "set", domain, "n", "-5")
        self.assertEqual([json.loads(line) for line in self.run_ok("settings", "get", domain, "--json").splitlines()],
                         [{"key": "a", "value": "own word", "layer": "state"},
                          {"key": "b", "value": [1, 2.5], "layer": "config"},
                          {"key": "n", "value": -5, "layer": "state"}])
        self.assertIn("nothing is not set", self.run_badly(1, "settings", "get", domain, "nothing"))

    def test_a_broken_settings_file_is_left_alone(self):
        path = self.daemon.root / "state/settings/org.vantle.broken.toml"
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text("a = 1\nb = = 2\n")
        self.run_badly(1, "settings", "set", "org.vantle.broken", "c", "3")
        self.assertIn("org.vantle.broken.toml:2:5", self.run_badly(1, "settings", "get", "org.vantle.broken"))
        self.assertEqual(path.read_text(), "a = 1\nb = = 2\n")

    def test_a_setting_takes_effect(self):
        daemon = self.start_daemon()
        done = talctl(daemon.root, "settings", "set", "org.vantle.talsys.analytics", "wanted", '["*.Volume.*"]')
        self.assertEqual((done.returncode, done.stderr), (0, ""))

        def only_wanted():
            before = len(daemon.rows("SELECT 1 FROM events WHERE name LIKE '%.Playback.%'"))
            talctl(daemon.root, "send", "Playback", "Start")
            talctl(daemon.root, "send", "Volume", "Generic")
            return before == len(daemon.rows("SELECT 1 FROM events WHERE name LIKE '%.Playback.%'"))

        daemon.eventually(only_wanted, "the daemon sees the setting")
        self.assertTrue(daemon.rows("SELECT 1 FROM events WHERE name LIKE '%.Volume.%'"))

    def test_a_posted_notification_brings_a_new_device_name_into_running_sessions(self):
        self.started_client(61, service=7)
        self.started_client(62, service=2)
        for name in ("Kitchen", "Bathroom"):
            self.daemon.write_config("settings/org.vantle.talsys.toml", f'device_name = "{name}"\n')
            self.run_ok("notify", "post", "org.vantle.talsys.reporting")
            for service in ("longformaudio", "telephony"):
                self.daemon.eventually(
                    lambda: self.daemon.events(f"org.vantle.{service}.Setup.Setup", device_name=name),
                    f"a session of {service} is told of {name}")

    def test_a_post_without_a_state_keeps_it(self):
        file = self.daemon.root / "run/notify/org.vantle.test"
        for arguments, state in (([], "0"), (["18446744073709551615"], "18446744073709551615"), ([], "18446744073709551615"),
                                 (["7"], "7"), ([], "7")):
            self.run_ok("notify", "post", "org.vantle.test", *arguments)
            self.assertEqual(file.read_text(), state)
        file.write_text("seven")
        self.assertIn("cannot be kept", self.run_badly(1, "notify", "post", "org.vantle.test"))
        self.run_badly(1, "notify", "post", "org.vantle.test", root=self.daemon.root / "nowhere")

    def test_kill_ends_the_daemon(self):
        daemon = self.start_daemon()
        if os.geteuid() == 0:
            stranger = talctl(daemon.root, "kill", user=65534, group=65534, extra_groups=[])
            self.assertEqual(stranger.returncode, 1)
            self.assertIn("org.vantle.talsys.ipc 3", stranger.stderr)
            self.assertIsNone(daemon.process.poll())
        done = talctl(daemon.root, "kill")
        self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""))
        self.assertEqual(daemon.wait(), 2)

    def test_without_a_daemon_it_fails_at_once(self):
        root = self.make_root(self.addCleanup)
        for command in (["status"], ["send", "1", "1"], ["kill"], ["events"], ["replay", self.write_script("")]):
            with self.subTest(command):
                self.run_badly(1, *command, root=root)
        done = talctl(root, "status", "--json")
        self.assertEqual(done.returncode, 1)
        self.assertIs(json.loads(done.stdout)["running"], False)
        self.assertEqual(os.listdir(root), [], "it made something")

    def test_wrong_usage_is_told_from_failure(self):
        for command in ([], ["fly"], ["send"], ["send", "1"], ["send", "Playbac", "1"], ["send", "1", "99999"],
                        ["send", "1", "1", "novalue"], ["send", "1", "1", "n=99999999999999999999"],
                        ["send", "1", "1", "n=null"], ["send", "1", "1", "j={"], ["send", "--reporter", "x", "1", "1"],
                        ["events", "--since", "yesterday"], ["events", "-n", "-1"], ["events", "extra"],
                        ["settings"], ["settings", "get"], ["settings", "get", "../passwd"],
                        ["settings", "set", "a", "b"], ["notify"], ["notify", "post"], ["notify", "post", "a/b"],
                        ["notify", "post", ".a"], ["notify", "post", "a", "-1"], ["notify", "post", "a", ""],
                        ["notify", "post", "a", "18446744073709551616"], ["notify", "post", "a", "1", "2"], ["--socket", "x", "status"]):
            with self.subTest(command):
                self.run_badly(2, *command)

    def test_text_of_clients_cannot_control_the_terminal(self):
        self.run_ok("send", "Playback", "Start", 'evil="\\u001b[2J\\u009b31m"', "key\x1b[31m=1")
        for output in (self.run_ok("events"), self.run_ok("events", "--json")):
            self.assertNotRegex(output.replace("\n", ""), r"[\x00-\x1f\x7f-\x9f]")
        self.assertIn('evil="\\u001b[2J\\u009b31m"', self.run_ok("events"))

    def test_version(self):
        self.assertRegex(run_program("talctl", "--version").stdout, r"\Atalctl \d+\.\d+\.\d+\n\Z")


if __name__ == "__main__":
    unittest.main()
