"""`viraduve demo` and the hand-over of an analysis answer to `viraduve export`.

Run with VIRADUVE_CLI set to the command, as CTest does.
"""

import json
import os
import pathlib
import subprocess
import tempfile
import unittest

CLI = os.environ.get("VIRADUVE_CLI")


def run(*args):
    return subprocess.run([CLI, *map(str, args)], capture_output=True, text=True, timeout=300)


def frames_for_export(answer, complete_corners=True):
    """The export's frame list from an answer, written out independently of the command."""
    frames = []
    for entry in answer["frameLanesBands"]:
        frame = dict(entry["roi"])
        if complete_corners and not any(frame[k] for k in ("x3", "y3", "x4", "y4")):
            frame.update(x3=frame["x2"], y3=frame["y1"], x4=frame["x1"], y4=frame["y2"])
        frame["roiList"] = entry["lanes"]
        frames.append({"analysisFrame": frame})
    return frames


@unittest.skipUnless(CLI, "VIRADUVE_CLI is not set")
class DemoTest(unittest.TestCase):
    def setUp(self):
        self.tmp = tempfile.TemporaryDirectory()
        self.root = pathlib.Path(self.tmp.name)

    def tearDown(self):
        self.tmp.cleanup()

    def assertOneLineError(self, result, status):
        self.assertEqual(result.returncode, status, result.stderr)
        lines = result.stderr.splitlines()
        self.assertEqual(len(lines), 1, result.stderr)
        self.assertTrue(lines[0].startswith("viraduve: "), lines[0])

    def test_export_draws_an_answer_like_its_frame_list(self):
        capture = self.root / "gel"
        self.assertEqual(run("synth", capture, "--width", "320", "--height", "240",
                             "--lanes", "4", "--bands", "3").returncode, 0)
        answer_file = self.root / "answer.json"
        result = run("auto", capture, "uv", "-o", answer_file)
        self.assertEqual(result.returncode, 0, result.stderr)
        answer = json.loads(answer_file.read_text())
        self.assertTrue(any(entry["lanes"] for entry in answer["frameLanesBands"]))
        picture = capture / "output" / "ch0.png"

        def export(frames_option):
            result = run("export", capture, "uv", "--frames", frames_option)
            self.assertEqual(result.returncode, 0, result.stderr)
            self.assertEqual(result.stdout.split(), [str(picture)])
            return picture.read_bytes()

        from_answer = export(answer_file)
        as_frame_list = export(json.dumps(frames_for_export(answer)))
        open_corners = export(json.dumps(frames_for_export(answer, complete_corners=False)))
        self.assertEqual(from_answer, as_frame_list)
        # The completed corners matter: without them the frame is drawn differently.
        self.assertNotEqual(from_answer, open_corners)

    def test_demo_leaves_other_channel_files_alone(self):
        capture = self.root / "capture"
        capture.mkdir()
        foreign = capture / "ch5.tif"
        foreign.write_bytes(b"not ours")
        result = run("demo", "--out", self.root)
        self.assertOneLineError(result, 2)
        self.assertEqual(foreign.read_bytes(), b"not ours")
        self.assertEqual(sorted(p.name for p in capture.iterdir()), ["ch5.tif"])

    def test_demo_without_the_real_gel_is_refused(self):
        result = run("demo", "--real", "--gel", self.root / "missing", "--out", self.root / "w")
        self.assertOneLineError(result, 2)
        self.assertIn("real gel not found", result.stderr)

    def test_demo_runs_again_in_the_same_folder(self):
        for _ in range(2):
            result = run("demo", "--out", self.root)
            self.assertEqual(result.returncode, 0, result.stderr)
        answer = json.loads((self.root / "answer.json").read_text())
        lanes = [lane for entry in answer["frameLanesBands"] for lane in entry["lanes"]]
        self.assertEqual(len(lanes), 8)
        # The marker of lane 1 lies in channel 0, the target and the control in channel 1.
        channels = {band["channel"] for band in lanes[0]["bands"]}
        self.assertEqual(channels, {0, 1})
        self.assertTrue(all(band["channel"] == 1 for lane in lanes[1:] for band in lane["bands"]))
        self.assertIn(str(self.root / "capture" / "output" / "overlay.png"), result.stdout)


if __name__ == "__main__":
    unittest.main()
