"""talctl report: what a person reads on a terminal and sees in a browser."""

import fcntl
import json
import os
import pathlib
import pty
import sqlite3
import struct
import subprocess
import termios
import time
import unittest

from headless_browser import CHROMIUM, Browser
from tal_harness import BIN_DIR, PATIENCE_SECONDS, DaemonTest

HOUR, DAY = 3600, 86400
LONG_NAME = "org.example." + "averylongname" * 9
EVIL_NAME = "<script>document.title='caught'</script><img src='http://127.0.0.1:9/x.png'>&amp;"
# Text that stands in front of a background that differs too little from it, as [text, contrast].
FAINT_TEXTS = """(() => {
  const channel = c => (c /= 255) <= 0.03928 ? c / 12.92 : ((c + 0.055) / 1.055) ** 2.4;
  const parse = text => text.match(/[\\d.]+/g).map(Number);
  const luminance = ([r, g, b]) => 0.2126 * channel(r) + 0.7152 * channel(g) + 0.0722 * channel(b);
  const background = element => {
    for (; element; element = element.parentElement) {
      const colour = parse(getComputedStyle(element).backgroundColor);
      if (colour.length === 3 || colour[3] > 0) return colour;
    }
    return [255, 255, 255];
  };
  const walker = document.createTreeWalker(document.body, NodeFilter.SHOW_TEXT);
  const faint = [];
  let seen = 0;
  while (walker.nextNode()) {
    const node = walker.currentNode;
    if (!node.data.trim() || !node.parentElement.checkVisibility()) continue;
    seen++;
    const a = luminance(parse(getComputedStyle(node.parentElement).color));
    const b = luminance(background(node.parentElement));
    const contrast = (Math.max(a, b) + 0.05) / (Math.min(a, b) + 0.05);
    if (contrast < 4.5) faint.push([node.data.trim(), contrast]);
  }
  return {seen, faint};
})()"""
# Text that is cut off or reaches over the side of the screen.
CUT_TEXTS = """[...document.querySelectorAll('dd, .name, .value, .detail, .axis b, .line span, td, th, p, h1, h2')]
  .filter(e => e.checkVisibility())
  .filter(e => e.scrollWidth > e.clientWidth + 1 && getComputedStyle(e).display !== 'inline'
            || e.getBoundingClientRect().right > innerWidth || e.getBoundingClientRect().left < 0)
  .map(e => e.textContent)"""
# The heights of a chart's columns, as parts of the chart's.
COLUMN_HEIGHTS = """(title => {
  const section = [...document.querySelectorAll('section')].find(s => s.querySelector('h2')?.textContent === title);
  const plot = section.querySelector('.plot').clientHeight;
  return [...section.querySelectorAll('.column')].map(column =>
    [...column.querySelectorAll('i')].reduce((sum, i) => sum + i.getBoundingClientRect().height, 0) / plot);
})"""


def talctl(root, *arguments, **options):
    return subprocess.run([BIN_DIR / "talctl", "--root", str(root), *arguments], capture_output=True, text=True,
                          timeout=PATIENCE_SECONDS, stdin=subprocess.DEVNULL, **options)


def on_terminal(columns, *command):
    """What the command prints on a terminal that is so wide."""
    master, slave = pty.openpty()
    fcntl.ioctl(slave, termios.TIOCSWINSZ, struct.pack("HHHH", 50, columns, 0, 0))
    process = subprocess.Popen([str(word) for word in command], stdin=subprocess.DEVNULL, stdout=slave,
                               env={**os.environ, "NO_COLOR": "1"})
    os.close(slave)
    output = b""
    while True:
        try:
            data = os.read(master, 65536)
        except OSError:  # the terminal's other end is closed
            break
        if not data:
            break
        output += data
    os.close(master)
    if process.wait(PATIENCE_SECONDS) != 0:
        raise AssertionError(output)
    return output.decode().replace("\r\n", "\n")


class Store:
    """A store as the daemon leaves it, each message under its two names."""

    def __init__(self, root):
        path = pathlib.Path(root) / "state/store.db"
        path.parent.mkdir(parents=True)
        self._database = sqlite3.connect(path)
        self._database.execute("CREATE TABLE events(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, "
                               "name TEXT NOT NULL, payload TEXT NOT NULL)")

    def add(self, at, service, event, **payload):
        for name in ("talsys", service):
            self._database.execute("INSERT INTO events(recorded_at, name, payload) VALUES (?, ?, ?)",
                                   (at, f"org.vantle.{name}.{event}", json.dumps(payload)))

    def add_playing(self, at, application, seconds, volume=0.5, device="Speaker", service="longformaudio"):
        self.add(at, service, "Volume.Summary", HostApplicationDisplayID=application, active_devices=device,
                 session_selected_format="S16LE 44100 Hz", mFormatID="raw", mChannelsPerFrame=2,
                 RvSessionVolume=volume, RvSessionVolumeBucketed=str(volume), play_seconds=float(seconds),
                 msgidx=1, msgcnt=1)

    def close(self):
        self._database.commit()
        self._database.close()


def fill(store, now):
    """A week of which every figure is known."""
    noon = now - now % DAY - DAY + 12 * HOUR  # yesterday, UTC
    store.add_playing(noon, "Music", 2 * HOUR, volume=0.25)
    store.add_playing(noon - DAY, "Music", HOUR, volume=0.75, device="Headphones")
    store.add_playing(noon - 2 * DAY, LONG_NAME, 1800)
    store.add_playing(noon - 2 * DAY, EVIL_NAME, 900, device=EVIL_NAME)
    for number in range(300):
        store.add_playing(noon - 3 * DAY, f"small {number}", 1, service="alerts")
    store.add(noon, "telephony", "Input.Summary", HostApplicationDisplayID="Phone", active_devices="Microphone",
              inputrunning_seconds=600.0, msgidx=1, msgcnt=1)
    for _ in range(3):
        store.add(noon, "longformaudio", "IO.Error", HostApplicationDisplayID="Music", issue_type="overload")
    store.add(noon, "longformaudio", "Playback.Stop", HostApplicationDisplayID="Music", session_duration=9.0,
              xrun_episodes=3, xrun_starved_seconds=0.5)
    store.add(noon, "alarms", "Error.IssueDetector", HostApplicationDisplayID="Clock", issue_type="LowRMS")
    store.add_playing(now - 20 * DAY, "long ago", 7 * HOUR)


class ReportTest(DaemonTest):
    def setUp(self):
        self.root = pathlib.Path(self.make_root(self.addCleanup))
        self.environment = {**os.environ, "TZ": "UTC"}

    def filled(self):
        store = Store(self.root)
        fill(store, time.time())
        store.close()

    def report(self, *arguments):
        done = talctl(self.root, "report", *arguments, env=self.environment)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        return done.stdout


class Text(ReportTest):
    def test_every_figure_is_told(self):
        self.filled()
        text = self.report("--since", "7d")
        for line in (r"Played 3 h 50 min, recorded 10 min 00 s\.",
                     r"Music +longformaudio +3 h 00 min +– +42 % +3 +–  █+",
                     r"Phone +telephony +– +10 min 00 s +– +– +–  █+",
                     r"29\d others +4 min \d\d s +– +50 % +– +1.*",
                     r" *25 % +2 h 00 min +52 %  █{20}",
                     r"Speaker +2 h 35 min +– +31 %  █{20}",
                     r"S16LE 44100 Hz, raw, 2 ch +3 h 50 min +43 %  █{20}",
                     r"11:00 +2 h 50 min +10 min 00 s +– +–  █{20}",
                     r"3 overloads, 0\.5 s of audio missing\.",
                     r"Error\.IssueDetector +LowRMS +Clock +1 .*"):
            self.assertRegex(text, rf"(?m)^{line}$")
        self.assertNotIn("long ago", text)
        self.assertIn("long ago", self.report())

    def test_it_fits_the_terminal(self):
        self.filled()
        for columns in (40, 80, 200):
            text = on_terminal(columns, BIN_DIR / "talctl", "--root", self.root, "report")
            self.assertRegex(text, r"(?m)^Music +(\S+ +)?3 h 00 min +–", "a figure is cut")
            self.assertRegex(text, r"(?m)^\w{3} \d\d \w{3} +2 h 00 min +10 min 00 s")
            self.assertLessEqual(max(map(len, text.splitlines())), columns)

    def test_there_may_be_nothing(self):
        done = talctl(self.root, "report")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr, r"\Atalctl: there is no store at [^\n]+\n\Z")
        Store(self.root).close()
        self.assertIn("Nothing was stored in this time.", self.report())
        page = self.root / "no" / "directory.html"
        done = talctl(self.root, "report", "--html", str(page))
        self.assertEqual(done.returncode, 1)
        self.assertRegex(done.stderr, r"\Atalctl: cannot write [^\n]+: No such file or directory\n\Z")
        self.assertEqual(talctl(self.root, "report", "--since", "a week").returncode, 2)

    def test_a_running_daemon_is_reported_on_and_left_alone(self):
        daemon = self.start_daemon(root=self.root)
        client = self.connect(daemon)
        client.create_reporting_session(5)
        client.set_service_type(5, 7)
        client.set_configuration(5, {"HostApplicationDisplayID": "player"})
        client.start_reporting_session(5)
        now = time.time()
        for category_type, running, at in (((4, 1), True, now - 60), ((4, 2), False, now)):
            client.send_message({"session_output_running": running, "RvSessionVolume": 0.4,
                                 "talreporting_timestamp": at}, *category_type, [5])
        client.stop_reporting_session(5)
        daemon.eventually(lambda: daemon.events("org.vantle.longformaudio.Volume.Summary"), "a summary is stored")
        self.assertRegex(self.report("--since", "1h"), r"(?m)^player +longformaudio +1 min 00 s +40 % ")


@unittest.skipUnless(CHROMIUM, "needs chromium")
class Page(ReportTest):
    def setUp(self):
        super().setUp()
        self.browser = Browser(self)

    def show(self, *, since=("--since", "7d"), **screen):
        page = self.root / "report.html"
        self.report(*since, "--html", str(page))
        self.browser.show(page.as_uri(), **screen)
        # One file, and nothing it asks for or complains of.
        self.assertEqual((self.browser.requests, self.browser.complaints), ([page.as_uri()], []))
        return self.browser.evaluate("document.body.innerText")

    def test_every_figure_can_be_seen(self):
        self.filled()
        text = self.show(width=1200)
        for fact in ("Audio report", "Played\n3 h 50 min", "Recorded\n10 min 00 s", "Mean volume\n43 %", "Overloads\n3",
                     "Errors\n1", "Music\n3 h 00 min", "mean volume 42 %", "3 overloads", "Phone\n10 min 00 s",
                     "Speaker\n2 h 35 min", "Headphones\n1 h 00 min", "0.5 s of audio missing", "LowRMS\n1 time",
                     EVIL_NAME, LONG_NAME, "29"):
            self.assertIn(fact, text)
        self.assertNotIn("long ago", text)
        self.assertEqual(self.browser.evaluate("document.title"), "Audio report", "a name was run as a script")
        self.assertEqual(self.browser.evaluate("document.querySelectorAll('script, img, link, iframe').length"), 0)

    def test_charts_are_drawn_to_scale(self):
        self.filled()
        self.show(width=1200)
        loud = self.browser.evaluate(f"{COLUMN_HEIGHTS}('How loud')")
        self.assertEqual(len(loud), 17)
        self.assertAlmostEqual(loud[4], 1, delta=0.02)  # two hours on a scale of two
        self.assertAlmostEqual(loud[12], 0.5, delta=0.02)
        self.assertEqual([i for i, height in enumerate(loud) if height > 0], [4, 8, 12])
        days = self.browser.evaluate(f"{COLUMN_HEIGHTS}('By day')")
        self.assertEqual(len(days), 8)  # seven times 24 hours touch as many days
        self.assertAlmostEqual(days[5] / days[6], 60 / 130, delta=0.02)
        self.assertEqual(self.browser.evaluate("document.querySelectorAll('.column.marked').length"), 2)

    def test_it_is_legible_on_any_screen_in_light_and_dark(self):
        self.filled()
        backgrounds = set()
        for width in (320, 375, 768, 1200):
            for scheme in ("light", "dark"):
                with self.subTest(width=width, scheme=scheme):
                    self.show(width=width, scheme=scheme)
                    self.browser.evaluate("document.querySelectorAll('details').forEach(d => d.open = true)")
                    self.assertLessEqual(self.browser.evaluate("document.documentElement.scrollWidth"), width)
                    self.assertEqual(self.browser.evaluate(CUT_TEXTS), [])
                    texts = self.browser.evaluate(FAINT_TEXTS)
                    self.assertGreater(texts["seen"], 100)
                    self.assertEqual(texts["faint"], [])
                    smallest = self.browser.evaluate(
                        "Math.min(...[...document.querySelectorAll('body *')].map(e => parseFloat("
                        "getComputedStyle(e).fontSize)))")
                    self.assertGreaterEqual(smallest, 12)
                    backgrounds.add(self.browser.evaluate("getComputedStyle(document.body).backgroundColor"))
        self.assertEqual(len(backgrounds), 2, "light and dark look alike")

    def test_an_empty_store_makes_a_page_too(self):
        Store(self.root).close()
        self.assertIn("Nothing was stored in this time.", self.show(width=375, since=()))


if __name__ == "__main__":
    unittest.main()
