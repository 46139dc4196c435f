"""The ctypes binding: answers parsed, refusals and failures raised, results released.

Run with VIRADUVE_LIBRARY (the shared library), VIRADUVE_CLI (the command, which writes the
synthetic captures) and PYTHONPATH (the python/ folder) set, as CTest does.
"""

import hashlib
import json
import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

import viraduve

CLI = os.environ.get("VIRADUVE_CLI")


def make_capture(folder, *args):
    """Writes a synthetic gel into folder and returns its true analysis frame."""
    out = subprocess.run([CLI, "synth", str(folder), *args], check=True, capture_output=True)
    return json.loads(out.stdout)


def digest(folder):
    h = hashlib.sha256()
    for name in sorted(os.listdir(folder)):
        h.update(name.encode())
        path = os.path.join(folder, name)
        if os.path.isfile(path):
            h.update(pathlib.Path(path).read_bytes())
    return h.hexdigest()


@unittest.skipUnless(CLI, "VIRADUVE_CLI is not set")
class BindingTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.tmp = tempfile.TemporaryDirectory()
        cls.root = pathlib.Path(cls.tmp.name)
        cls.capture = cls.root / "gel"
        cls.frame = make_capture(cls.capture, "--width", "256", "--height", "256",
                                 "--lanes", "4", "--bands", "3", "--seed", "5")
        cls.log = cls.root / "library.log"

    @classmethod
    def tearDownClass(cls):
        cls.tmp.cleanup()

    def quiet(self):
        return viraduve.redirect_log(self.log)

    def test_auto_analysis_finds_the_synthetic_lanes(self):
        with self.quiet():
            answer = viraduve.auto_analysis(self.capture, "uv")
        frames = answer["frameLanesBands"]
        self.assertGreaterEqual(len(frames), 1)
        self.assertEqual(len(frames[0]["lanes"]), len(self.frame["analysisFrame"]["roiList"]))
        self.assertIn("in getAutoAnalysisFrameDetection:: url = ", self.log.read_text())

    def test_documents_as_dict_text_and_path_give_the_same_answer(self):
        frame_file = self.root / "frame.json"
        frame_file.write_text(json.dumps(self.frame))
        answers = []
        for frame in (self.frame, json.dumps(self.frame), frame_file):
            with self.subTest(kind=type(frame).__name__), self.quiet():
                answers.append(viraduve.band_lane_analysis(str(self.capture), frame, "uv"))
        self.assertEqual(answers[0], answers[1])
        self.assertEqual(answers[0], answers[2])
        lanes = answers[0]["frameLanesBands"][0]["lanes"]
        self.assertEqual(len(lanes), 4)
        for lane in lanes:
            for band in lane["bands"]:
                self.assertGreater(band["local_bg_volume"], 0.0)
                self.assertEqual(band["rolling_bg_volume"], 0.0)

    def test_region_analysis_answers_regions(self):
        f = self.frame["analysisFrame"]
        band = f["roiList"][0]["bands"][0]
        regions = {"region_list": [
            {"circle_b": False, "channel": 0, "uid": "r1", "regionName": "band",
             "regionRefName": "", "bg_color": "", "x1": band["x1"], "y1": band["y1"],
             "x2": band["x2"], "y2": band["y2"], "bg_corrected": False}]}
        with self.quiet():
            answer = viraduve.region_analysis(self.capture, regions, "uv")
        (region,) = answer["cloud_region_list"]
        self.assertEqual(region["uid"], "r1")
        self.assertGreater(region["volume"], 0.0)

    def test_refusals_and_failures_raise(self):
        before = digest(self.capture)
        cases = [
            ("unknown mode", lambda: viraduve.auto_analysis(self.capture, "Unknown"),
             viraduve.RefusedRequest),
            ("frame text that does not parse",
             lambda: viraduve.update_band_detection(self.capture, "{", "uv"),
             viraduve.RefusedRequest),
            ("image parameter of the wrong type",
             lambda: viraduve.auto_analysis(self.capture, "uv",
                                            {"ImageParas": [{"img_max": "abc"}]}),
             viraduve.AnalysisError),
            ("missing capture folder",
             lambda: viraduve.auto_analysis(self.root / "missing", "uv"), FileNotFoundError),
            ("document of the wrong type",
             lambda: viraduve.band_lane_analysis(self.capture, 42, "uv"), TypeError),
        ]
        for name, call, error in cases:
            with self.subTest(name), self.quiet():
                self.assertRaises(error, call)
        self.assertEqual(digest(self.capture), before)

    def test_vit_to_tiff_converts_and_reports_failures(self):
        target = self.root / "copy.tif"
        with self.quiet():
            self.assertEqual(viraduve.vit_to_tiff(self.capture / "ch0.tif", target), target)
            self.assertTrue(target.exists())
            with self.assertRaises(viraduve.AnalysisError):
                viraduve.vit_to_tiff(self.root / "missing.tif", self.root / "never.tif")
        self.assertFalse((self.root / "never.tif").exists())

    def test_export_writes_a_picture_per_channel(self):
        capture = self.root / "export"
        make_capture(capture, "--width", "128", "--height", "128", "--lanes", "2", "--bands", "1")
        attributes = {"exportAttribute": {"exportLayers": False, "format": 1, "channelSelection": 2,
                                          "dpi": 254, "height": 1.285, "width": 1.285,
                                          "exportAnnotation": False, "exportMarkers": False}}
        with self.quiet():
            out = viraduve.export_image(capture, "uv", attributes)
        self.assertTrue((out / "ch0.png").exists())

    def test_default_image_paras_cover_every_channel_file(self):
        capture = self.root / "three"
        make_capture(capture, "--width", "64", "--height", "64", "--lanes", "1", "--bands", "1",
                     "--channels", "3")
        paras = viraduve.default_image_paras(capture, "fluo")["ImageParas"]
        self.assertEqual(len(paras), 3)
        self.assertEqual(paras[0]["img_max"], 65535)
        self.assertEqual(paras[2]["channelAppMode"], "fluo")


class LibraryLoadingTest(unittest.TestCase):
    def test_a_wrong_library_path_names_the_variable(self):
        code = ("import viraduve\n"
                "try:\n"
                "    viraduve.library()\n"
                "except viraduve.LibraryNotFound as e:\n"
                "    print(e)\n")
        env = dict(os.environ, VIRADUVE_LIBRARY="/nonexistent/libviraduve.so")
        out = subprocess.run([sys.executable, "-c", code], env=env, capture_output=True, text=True,
                             check=True)
        self.assertIn("VIRADUVE_LIBRARY", out.stdout)


if __name__ == "__main__":
    unittest.main()
