"""The `viraduve` command: clean JSON on standard output, the log elsewhere, exit statuses,
and one clear line for bad input without touching the capture.

Run with VIRADUVE_CLI set to the command, as CTest does.
"""

import hashlib
import json
import os
import pathlib
import subprocess
import tempfile
import unittest

CLI = os.environ.get("VIRADUVE_CLI")


def run(*args, stdin=None):
    return subprocess.run([CLI, *map(str, args)], capture_output=True, text=True, input=stdin,
                          timeout=300)


def digest(folder):
    h = hashlib.sha256()
    for path in sorted(pathlib.Path(folder).rglob("*")):
        h.update(str(path).encode())
        if path.is_file():
            h.update(path.read_bytes())
    return h.hexdigest()


@unittest.skipUnless(CLI, "VIRADUVE_CLI is not set")
class CommandLineTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.tmp = tempfile.TemporaryDirectory()
        cls.root = pathlib.Path(cls.tmp.name)
        cls.capture = cls.root / "gel"
        cls.frame_file = cls.root / "frame.json"
        out = run("synth", cls.capture, "--width", "256", "--height", "256", "--lanes", "4",
                  "--bands", "3", "-o", cls.frame_file)
        assert out.returncode == 0, out.stderr
        cls.frame = json.loads(cls.frame_file.read_text())
        # Total-protein request naming every lane of the frame, normalised on channel 0.
        f = cls.frame["analysisFrame"]
        lanes = [entry["lane"] for entry in f["roiList"]]
        corners = ("x1", "x2", "y1", "y2")
        cls.tpn_file = cls.root / "tpn.json"
        cls.tpn_file.write_text(json.dumps({"frameList": [{
            "analysisFrameRoi": {k: f[k] for k in corners}, "uid": f["uid"], "channel": 0,
            "normalizeLanes": [{"laneVolTop": {"y1": f["y1"]}, "laneVolBottom": {"y2": f["y2"]},
                                "uid": lane["uid"], "laneRoi": {k: lane[k] for k in corners}}
                               for lane in lanes]}]}))

    @classmethod
    def tearDownClass(cls):
        cls.tmp.cleanup()

    def assertOneLineError(self, result, status):
        self.assertEqual(result.returncode, status, result.stderr)
        self.assertEqual(result.stdout, "")
        lines = result.stderr.splitlines()
        self.assertEqual(len(lines), 1, result.stderr)
        self.assertTrue(lines[0].startswith("viraduve: "), lines[0])

    def test_answers_are_clean_json_with_the_log_elsewhere(self):
        log = self.root / "auto.log"
        cases = [
            ("auto", ["auto", self.capture, "uv", "--log", log]),
            ("analyze", ["analyze", self.capture, "uv", "--frame", self.frame_file]),
            ("detect", ["detect", self.capture, "uv", "--frame", self.frame_file]),
            ("update", ["update", self.capture, "uv", "--frame", json.dumps(self.frame)]),
            ("rolling-ball", ["rolling-ball", self.capture, "uv", "--frame", self.frame_file]),
            ("tpn", ["tpn", self.capture, "uv", "--frame", self.frame_file, "--tpn", self.tpn_file]),
        ]
        for name, args in cases:
            with self.subTest(name):
                result = run(*args)
                self.assertEqual(result.returncode, 0, result.stderr)
                answer = json.loads(result.stdout)  # the log would break the JSON
                lanes = answer["frameLanesBands"][0]["lanes"]
                self.assertEqual(len(lanes), 4)
                if name == "tpn":
                    # Factors are relative to the strongest lane.
                    self.assertEqual(max(lane["lane"]["norm_factor"] for lane in lanes), 1.0)
        self.assertIn("in getAutoAnalysisFrameDetection:: url = ", log.read_text())

    def test_verbose_sends_the_log_to_standard_error(self):
        result = run("analyze", self.capture, "uv", "--frame", "-", "-v",
                     stdin=json.dumps(self.frame))
        self.assertEqual(result.returncode, 0, result.stderr)
        json.loads(result.stdout)
        self.assertIn("in getBandLaneAnalysis:: url = ", result.stderr)

    def test_output_file_and_summary(self):
        out = self.root / "answer.json"
        result = run("analyze", self.capture, "uv", "--frame", self.frame_file, "-o", out)
        self.assertEqual((result.returncode, result.stdout), (0, ""), result.stderr)
        bands = json.loads(out.read_text())["frameLanesBands"][0]["lanes"][0]["bands"]

        result = run("analyze", self.capture, "uv", "--frame", self.frame_file, "--summary")
        self.assertEqual(result.returncode, 0, result.stderr)
        header, *rows = result.stdout.splitlines()
        for column in ("frame", "lane", "band", "position", "volume", "bg-corrected", "normalised"):
            self.assertIn(column, header)
        self.assertEqual(len(rows), 12)  # 4 lanes x 3 bands
        first = rows[0].split()
        self.assertEqual(first[:4], ["0", "0", "0", "0"])
        self.assertAlmostEqual(float(first[5]), bands[0]["volume"], delta=0.01)

    def test_regions(self):
        band = self.frame["analysisFrame"]["roiList"][1]["bands"][0]
        regions = {"region_list": [
            {"circle_b": False, "channel": 0, "uid": "a", "regionName": "", "regionRefName": "",
             "bg_color": "", "x1": band["x1"], "y1": band["y1"], "x2": band["x2"],
             "y2": band["y2"], "bg_corrected": False},
            {"circle_b": True, "channel": 0, "uid": "b", "regionName": "", "regionRefName": "",
             "bg_color": "", "x": 128, "y": 128, "circle_radius": 10, "bg_corrected": False}]}
        result = run("regions", self.capture, "uv", "--regions", json.dumps(regions),
                     "--bg-region", '{"bgRegion": {"circle_b": false, "x1": 0, "y1": 0, '
                     '"x2": 10, "y2": 10}}')
        self.assertEqual(result.returncode, 0, result.stderr)
        self.assertEqual([r["uid"] for r in json.loads(result.stdout)["cloud_region_list"]],
                         ["a", "b"])

    def test_library_refusal_and_failure_statuses(self):
        cases = [
            ("unknown mode is refused", ["auto", self.capture, "Unknown"], 2, "refused"),
            ("wrong parameter type fails", ["auto", self.capture, "uv", "--paras",
                                            '{"ImageParas": [{"img_max": "abc"}]}'], 1, "failed"),
        ]
        for name, args, status, word in cases:
            with self.subTest(name):
                result = run(*args)
                self.assertOneLineError(result, status)
                self.assertIn(word, result.stderr)

    def test_bad_input_is_one_line_and_leaves_the_capture_alone(self):
        missing = self.root / "missing"
        bad_json = self.root / "bad.json"
        bad_json.write_text('{"analysisFrame": ')
        empty = self.root / "empty"
        empty.mkdir(exist_ok=True)
        before = digest(self.root)
        frame = ["--frame", self.frame_file]
        cases = [
            ("auto, missing folder", ["auto", missing, "uv"]),
            ("analyze, missing folder", ["analyze", missing, "uv", *frame]),
            ("detect, missing folder", ["detect", missing, "uv", *frame]),
            ("update, missing frame file", ["update", self.capture, "uv", "--frame", missing]),
            ("rolling-ball, invalid frame file", ["rolling-ball", self.capture, "uv", "--frame", bad_json]),
            ("analyze, invalid inline frame", ["analyze", self.capture, "uv", "--frame", "{bad"]),
            ("auto, invalid parameters", ["auto", self.capture, "uv", "--paras", "[1,"]),
            ("regions, invalid regions", ["regions", self.capture, "uv", "--regions", bad_json]),
            ("tpn, missing request", ["tpn", self.capture, "uv", *frame, "--tpn", missing]),
            ("export, missing folder", ["export", missing, "uv"]),
            ("export, invalid attributes", ["export", self.capture, "uv", "--attributes", "{"]),
            ("convert, missing source", ["convert", missing, self.root / "out.tif"]),
            ("auto, folder without channel files", ["auto", empty, "uv"]),
            ("missing mode", ["auto", self.capture]),
            ("unknown option", ["auto", self.capture, "uv", "--no-such-option"]),
            ("unwritable answer file", ["auto", self.capture, "uv", "-o", missing / "x.json"]),
        ]
        for name, args in cases:
            with self.subTest(name):
                self.assertOneLineError(run(*args), 2)
        self.assertEqual(digest(self.root), before)

    def test_convert_keeps_sixteen_bits(self):
        target = self.root / "converted.tif"
        result = run("convert", self.capture / "ch0.tif", target)
        self.assertEqual(result.returncode, 0, result.stderr)
        self.assertEqual(result.stdout, "")
        # Same pixels: analysing a copy answers like the original.
        copy = self.root / "copy"
        copy.mkdir()
        os.replace(target, copy / "ch0.tif")
        original = run("analyze", self.capture, "uv", "--frame", self.frame_file)
        converted = run("analyze", copy, "uv", "--frame", self.frame_file)
        self.assertEqual(json.loads(original.stdout), json.loads(converted.stdout))

    def test_export_lists_the_files_it_wrote(self):
        capture = self.root / "export"
        self.assertEqual(run("synth", capture, "--width", "100", "--height", "80",
                             "--channels", "2", "--lanes", "2", "--bands", "1").returncode, 0)
        result = run("export", capture, "fluo", "--frames", f"[{self.frame_file.read_text()}]")
        self.assertEqual(result.returncode, 0, result.stderr)
        written = sorted(pathlib.Path(p).name for p in result.stdout.splitlines())
        self.assertEqual(written, ["ch0.png", "ch1.png"])

    def test_synth_is_deterministic(self):
        a, b = self.root / "s1", self.root / "s2"
        for folder in (a, b):
            self.assertEqual(run("synth", folder, "--width", "64", "--height", "64", "--noise", "30",
                                 "--lanes", "2", "--bands", "1", "--seed", "9").returncode, 0)
        self.assertEqual((a / "ch0.tif").read_bytes(), (b / "ch0.tif").read_bytes())


if __name__ == "__main__":
    unittest.main()
