"""Python binding of the viraduve library (gel and blot analysis) through ctypes.

Every analysis function takes the capture folder (a str or path), the imaging mode and the
request documents as Python objects (dicts and lists), JSON texts, or paths of JSON files,
and returns the parsed answer. A refused request (a document that does not parse, a mode
that is not recognised) raises RefusedRequest; an analysis that failed raises AnalysisError.

The library is found through the environment variable VIRADUVE_LIBRARY, else next to this
package, in the repository's build folder, or on the system's library path.

The library writes its log to the process's standard output; `redirect_log` moves it away.
"""

import contextlib
import ctypes
import ctypes.util
import json
import os
import pathlib
import sys
import threading

__all__ = [
    "ViraduveError", "RefusedRequest", "AnalysisError", "LibraryNotFound",
    "auto_analysis", "band_lane_analysis", "custom_analysis_frame", "update_band_detection",
    "rolling_ball_analysis", "region_analysis", "tpn_analysis", "export_image", "vit_to_tiff",
    "channel_files", "default_image_paras", "redirect_log", "library",
]


class ViraduveError(Exception):
    """Base of the errors raised by this binding."""


class RefusedRequest(ViraduveError):
    """The library refused the request: a JSON document did not parse or the mode is unknown."""


class AnalysisError(ViraduveError):
    """The library answered "error" (or a failure status): the analysis failed."""


class LibraryNotFound(ViraduveError, OSError):
    """libviraduve.so could not be found or loaded."""


_lock = threading.Lock()
_lib = None


def _candidates():
    env = os.environ.get("VIRADUVE_LIBRARY")
    if env:
        # An explicit choice is not second-guessed.
        return [env]
    here = pathlib.Path(__file__).resolve().parent
    names = ["libviraduve.so", "libviraduve.so.0"]
    folders = [here, here.parent, here.parent.parent / "build"]
    found = [str(folder / name) for folder in folders for name in names if (folder / name).exists()]
    system = ctypes.util.find_library("viraduve")
    if system:
        found.append(system)
    return found


def library():
    """The loaded library (ctypes.CDLL), loaded on first use."""
    global _lib
    with _lock:
        if _lib is None:
            _lib = _load()
        return _lib


def _load():
    candidates = _candidates()
    errors = []
    for path in candidates:
        try:
            lib = ctypes.CDLL(path)
        except OSError as exc:
            errors.append(f"{path}: {exc}")
            continue
        _declare(lib)
        return lib
    detail = "; ".join(errors) if errors else "no candidate found"
    raise LibraryNotFound(
        "cannot load libviraduve.so (set VIRADUVE_LIBRARY to its path): " + detail)


def _declare(lib):
    text, ptr, answer = ctypes.c_char_p, ctypes.c_void_p, ctypes.c_void_p
    signatures = {
        "getAutoAnalysisFrameDetection": [text, text, text, text],
        "getBandLaneAnalysis": [text, text, text, ptr, text],
        "getCustomAnalysisFrame": [text, text, text, ptr, text],
        "getUpdateBandDetection": [text, text, text, ptr, text],
        "getRollingBallOnAnalysedData": [text, text, text, ptr, text],
        "getRegionAnalysis": [text, text, text, ptr, text, text],
        "getTPNAnalysisData": [text, text, text, text, text],
    }
    for name, args in signatures.items():
        fn = getattr(lib, name)
        fn.argtypes = args
        # A raw pointer, so the block can be handed back to releaseResult.
        fn.restype = answer
    lib.convertAndExportImage.argtypes = [text, text, text, text, ptr, text, text, text, text,
                                          ctypes.c_int, text, text, text, text]
    lib.convertAndExportImage.restype = ctypes.c_int
    lib.vitToTiff.argtypes = [text, text]
    lib.vitToTiff.restype = ctypes.c_int
    lib.releaseResult.argtypes = [ctypes.c_void_p]
    lib.releaseResult.restype = None


def _path_bytes(path):
    return os.fsencode(os.fspath(path))


def _document(value):
    """A request document as bytes: dicts and lists are written as JSON, a str or bytes is
    taken as JSON text, a path (os.PathLike) is read."""
    if isinstance(value, (dict, list)):
        return json.dumps(value).encode("utf-8")
    if isinstance(value, bytes):
        return value
    if isinstance(value, str):
        return value.encode("utf-8")
    if isinstance(value, os.PathLike):
        return pathlib.Path(value).read_bytes()
    raise TypeError(f"a request document must be a dict, list, JSON text or path, not {type(value).__name__}")


def _capture(capture_dir):
    path = pathlib.Path(capture_dir)
    if not path.is_dir():
        raise FileNotFoundError(f"capture folder not found: {capture_dir}")
    return _path_bytes(path)


def _paras(capture_dir, mode, image_paras):
    return _document(default_image_paras(capture_dir, mode) if image_paras is None else image_paras)


def _answer(function, pointer):
    lib = library()
    if not pointer:
        raise RefusedRequest(f"{function}: the request was refused "
                             "(a JSON document did not parse or the mode is not recognised)")
    try:
        text = ctypes.string_at(pointer)
    finally:
        lib.releaseResult(pointer)
    if text == b"error":
        raise AnalysisError(f"{function}: the analysis failed (see the library's log)")
    # Texts are copied byte for byte by the library; keep bytes that are not UTF-8.
    return json.loads(text.decode("utf-8", errors="surrogateescape"))


def channel_files(capture_dir):
    """Names of the channel files (ch*.tif) of a capture folder, in byte-wise order, which is
    the order the library pairs them with the image parameters."""
    names = [entry.name for entry in os.scandir(capture_dir)
             if entry.name.startswith("ch") and entry.name.endswith(".tif")]
    return sorted(names, key=os.fsencode)


def default_image_paras(capture_dir, mode):
    """Neutral image parameters for every channel file: full display range, gamma 1, no flip
    or rotation, the mode as the channel role."""
    m = mode.lower()
    bright = "vis" in m or ("dna" in m and not any(k in m for k in ("protein", "chemi", "uv")))
    grey = 0 if bright else 255
    element = {
        "img_angle": 0.0, "img_gamma": 1.0, "brightness": 0, "img_invert": False,
        "img_max": 65535, "img_min": 0, "r": grey, "g": grey, "b": grey,
        "img_flip_h": False, "img_flip_v": False, "saturation": False,
        "backgroundInverted": False, "auto_contrast": False, "channelAppMode": mode,
        "digitalZoom": 1.0, "opticalZoom": 1.0, "binning": 3,
        "backgroundDetection": "white" if bright else "black",
    }
    return {"ImageParas": [dict(element) for _ in channel_files(capture_dir)]}


def auto_analysis(capture_dir, mode, image_paras=None):
    """Finds the frames, lanes and bands of the capture and measures every band."""
    lib = library()
    d = _capture(capture_dir)
    return _answer("getAutoAnalysisFrameDetection", lib.getAutoAnalysisFrameDetection(
        d, mode.encode(), b"", _paras(capture_dir, mode, image_paras)))


def _frame_call(name, capture_dir, frame, mode, image_paras):
    lib = library()
    d = _capture(capture_dir)
    return _answer(name, getattr(lib, name)(
        d, _document(frame), mode.encode(), None, _paras(capture_dir, mode, image_paras)))


def band_lane_analysis(capture_dir, frame, mode, image_paras=None):
    """Measures the bands of the lanes of `frame` ({"analysisFrame": ...})."""
    return _frame_call("getBandLaneAnalysis", capture_dir, frame, mode, image_paras)


def custom_analysis_frame(capture_dir, frame, mode, image_paras=None):
    """Finds lanes and bands inside the frame of `frame`, then measures them."""
    return _frame_call("getCustomAnalysisFrame", capture_dir, frame, mode, image_paras)


def update_band_detection(capture_dir, frame, mode, image_paras=None):
    """Finds the bands of the lanes marked "update_flag" again, then measures them."""
    return _frame_call("getUpdateBandDetection", capture_dir, frame, mode, image_paras)


def rolling_ball_analysis(capture_dir, frame, mode, image_paras=None):
    """Measures the bands of `frame` against a rolling-ball lane background."""
    return _frame_call("getRollingBallOnAnalysedData", capture_dir, frame, mode, image_paras)


def region_analysis(capture_dir, regions, mode, image_paras=None, bg_region=None):
    """Measures the regions of `regions` ({"region_list": [...]}); `bg_region`
    ({"bgRegion": ...}) sets the global background, None for none."""
    lib = library()
    d = _capture(capture_dir)
    return _answer("getRegionAnalysis", lib.getRegionAnalysis(
        d, _document(regions), mode.encode(), None, _paras(capture_dir, mode, image_paras),
        None if bg_region is None else _document(bg_region)))


def tpn_analysis(capture_dir, frames, mode, tpn_request, image_paras=None):
    """Total-protein normalisation of the lanes named in `tpn_request` ({"frameList": ...})."""
    lib = library()
    d = _capture(capture_dir)
    return _answer("getTPNAnalysisData", lib.getTPNAnalysisData(
        d, _document(frames), mode.encode(), _document(tpn_request),
        _paras(capture_dir, mode, image_paras)))


def export_image(capture_dir, mode, export_attribute, image_paras=None, frames=None,
                 regions=None, overlay_list=None, annotations=None, channel_step=0,
                 tpn_frames=None, markers=None, texts=None, platform="Darwin"):
    """Renders the capture with overlays into capture_dir/output and returns that folder.
    `overlay_list` defaults to every channel; the other documents default to empty ones."""
    lib = library()
    d = _capture(capture_dir)
    if overlay_list is None:
        overlay_list = {"overlayList": list(range(len(channel_files(capture_dir))))}
    status = lib.convertAndExportImage(
        d, _document([] if frames is None else frames),
        _document({"region_list": []} if regions is None else regions), mode.encode(), None,
        _document(export_attribute), _paras(capture_dir, mode, image_paras),
        _document(overlay_list),
        _document({"annotationAttribute": []} if annotations is None else annotations),
        int(channel_step), _document([] if tpn_frames is None else tpn_frames),
        _document({"mwMarkerFrame": []} if markers is None else markers),
        _document([] if texts is None else texts), platform.encode())
    if status != 0:
        raise AnalysisError(f"convertAndExportImage: the export failed (status {status})")
    return pathlib.Path(capture_dir) / "output"


def vit_to_tiff(source, target):
    """Converts an image file to the format of the target's extension; returns the target."""
    lib = library()
    status = lib.vitToTiff(_path_bytes(source), _path_bytes(target))
    if status != 1 or not os.path.exists(target):
        raise AnalysisError(f"vitToTiff: cannot convert {source} to {target} (status {status})")
    return pathlib.Path(target)


@contextlib.contextmanager
def redirect_log(target=os.devnull):
    """Sends what the library writes to standard output (its log) to `target`, a path or
    an open file, while the block runs."""
    sys.stdout.flush()
    library()  # loaded before the switch, so its C runtime shares the flushed stdout
    libc = ctypes.CDLL(None)
    libc.fflush(None)
    saved = os.dup(1)
    close = None
    if hasattr(target, "fileno"):
        fd = target.fileno()
    else:
        close = fd = os.open(os.fspath(target), os.O_WRONLY | os.O_CREAT | os.O_TRUNC, 0o644)
    try:
        os.dup2(fd, 1)
        yield
    finally:
        libc.fflush(None)
        os.dup2(saved, 1)
        os.close(saved)
        if close is not None:
            os.close(close)
