"""What the drivers did during a session, as it reaches the store: a recorded machine, and a driver with counters of
its own."""

import pathlib
import shutil
import unittest

from tal_harness import DaemonTest

MACHINE = pathlib.Path(__file__).parent.parent / "support/sound_machine"
PLAYBACK_STATUS = "proc/asound/card0/pcm0p/sub0/status"
# The example of docs/drvstats.md.
AMPLIFIER = """{"group": "Speaker", "driver": "acme_amp<0>", "channels": [
    {"name": "Clips", "file": "/sys/kernel/debug/acme_amp/clips", "format": "simple", "bits": 16},
    {"name": "Power", "file": "/sys/kernel/debug/acme_amp/power", "format": "state", "unit": "ms"},
    {"name": "Late", "file": "/sys/kernel/debug/acme_amp/late", "format": "histogram", "unit": "us"}]}"""
AMPLIFIER_FILES = "sys/kernel/debug/acme_amp/"
INTAKE_KEYS = {"talreporting_timestamp", "invalid_timestamp", "audiotag", "HostApplicationDisplayID"}


class DriverStats(DaemonTest):
    def setUp(self):
        self.root = pathlib.Path(self.make_root(self.addCleanup))
        shutil.copytree(MACHINE, self.root / "machine", symlinks=True)
        self.write(AMPLIFIER_FILES + "clips", "65530\n")
        self.write(AMPLIFIER_FILES + "power", "on 4 1000\noff 3 50\n")
        self.write(AMPLIFIER_FILES + "late", "# microseconds\n0 99 5210\n100 999 0\nmax 97\n")
        self.machine = self.start_daemon("--host-root", str(self.root / "machine"), root=self.root, config={
            "drvstats.d/amplifier.json": AMPLIFIER, "drvstats.d/broken.json": '{"group": "Speaker"'})
        self.client = self.connect(self.machine)

    def write(self, path, text):
        path = self.root / "machine" / path
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text(text)

    def edit(self, path, old, new):
        text = (self.root / "machine" / path).read_text()
        self.assertIn(old, text)
        self.write(path, text.replace(old, new))

    def start(self, reporter):
        self.client.create_reporting_session(reporter)
        self.client.start_reporting_session(reporter)
        self.client.get_all_reporters()  # answered once the start is done

    def reported(self, kind):
        return [{key: value for key, value in payload.items() if key not in INTAKE_KEYS}
                for payload in self.machine.events(f"org.vantle.talsys.Drvstats.{kind}")]

    def test_overlapping_sessions_end_with_what_happened_meanwhile(self):
        self.start(1)
        self.edit(PLAYBACK_STATUS, "hw_ptr      : 480038", "hw_ptr      : 528038")
        self.write(AMPLIFIER_FILES + "clips", "4\n")
        self.start(2)
        self.edit(PLAYBACK_STATUS, "hw_ptr      : 528038", "hw_ptr      : 528538")
        self.edit("proc/interrupts", "      7023 ", "      7123 ")
        self.write(AMPLIFIER_FILES + "power", "on 5 1200\noff 4 250\n")
        self.write(AMPLIFIER_FILES + "late", "0 99 5214\n100 999 2\nmax 310\n")
        self.write("sys/devices/pci0000:00/0000:00:1f.3/power/runtime_active_time", "5011458\n")
        self.client.stop_reporting_session(1)
        self.write(PLAYBACK_STATUS, "closed\n")
        self.client.stop_reporting_session(2)

        peaks = {"HDA-Intel_Tx_Simple_PCHpcm0psub0LargestRoom": 15808,
                 "USB-Audio_Rx_Simple_Headsetpcm0csub0LargestFill": 1923}
        interrupts = {"HDA-Intel_MCA_Simple_PCHInterrupts": 100}
        self.assertEqual(self.reported("Simple"), [
            {"acmeamp_Speaker_Simple_Clips": 10, "HDA-Intel_Tx_Simple_PCHpcm0psub0Frames": 48500,
             **interrupts, **peaks},
            # The kernel forgets a substream's frames as it is closed; its peak was read by the first session.
            {**interrupts, **peaks}])
        self.assertEqual(self.reported("Histogram"), 2 * [{
            "acmeamp_Speaker_Histogram_Late":
                "count=2,lower=0,upper=999,min=0,max=310,unit=us::0-99:4;100-999:2"}])
        self.assertEqual(self.reported("State"), 2 * [{
            "acmeamp_Speaker_State_Power": "name:on,transition:1,residency:200,duty_cycle:0.500000;"
                                           "name:off,transition:1,residency:200,duty_cycle:0.500000;",
            "HDA-Intel_StateTransitionTimesms_State_PCH0000:00:1f.3":
                "name:active,transition:0,residency:250,duty_cycle:1.000000;",
            "HDA-Intel_StateTransitionTimesms_State_PCHhdaudioC0D0": "",
            "USB-Audio_StateTransitionTimesms_State_Headset1-2:1.0": ""}])
        self.assertEqual(self.machine.log().count("broken.json is ignored: parse error at line 1"), 1)
        self.assertEqual(self.machine.terminate(), 0)


if __name__ == "__main__":
    unittest.main()
