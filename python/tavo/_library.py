"""One song at a time, through libtavo.so in this process."""

from __future__ import annotations

import ctypes
import os
import threading
from typing import Optional

import numpy as np

from . import _many
from ._location import LIBRARY
from ._result import Path, Result, TavoError, check


class _Info(ctypes.Structure):  # TAVO_INFO of tavo.h
    _fields_ = [
        ("hl_pos", ctypes.c_int32),
        ("beat_count", ctypes.c_int32),
        ("beat_times", ctypes.POINTER(ctypes.c_float)),
        ("status", ctypes.c_int32),
    ]


class _Param(ctypes.Structure):  # TAVO_PARAM of tavo.h
    _fields_ = [("path", ctypes.c_char_p), ("mode", ctypes.c_int32)]


_Callback = ctypes.CFUNCTYPE(None, ctypes.POINTER(_Info))
_one_instance = threading.Lock()  # the library holds one instance in a process
_loaded: Optional[ctypes.CDLL] = None


def _library() -> ctypes.CDLL:
    global _loaded
    if _loaded is None:
        lib = ctypes.CDLL(LIBRARY)
        i32, handle = ctypes.c_int32, ctypes.c_void_p
        lib.tavo_init.restype = handle
        lib.tavo_init.argtypes = [ctypes.POINTER(_Param), ctypes.POINTER(i32)]
        lib.tavo_setcallback.restype = None
        lib.tavo_setcallback.argtypes = [handle, _Callback]
        lib.tavo_analyze.argtypes = [handle, i32, i32, i32]
        lib.tavo_deinit.argtypes = [handle]
        lib.tavo_get_tempo.argtypes = [handle]
        lib.tavo_has_audio.argtypes = [handle]
        lib.tavo_get_stream.argtypes = [handle, ctypes.POINTER(i32), ctypes.POINTER(i32),
                                        ctypes.POINTER(ctypes.c_int64)]
        ctypes.c_char_p.in_dll(lib, "fnamedec").value = b""  # no click track
        _loaded = lib
    return _loaded


def analyze(path: Path, mode: str = "both", length: int = 0, max_beats: int = 0) -> Result:
    """Analyses one song and waits for the result.

    mode: "highlight", "beats", or "both": the highlight, then the beats from there on.
    length: length of the highlight wanted in seconds, 0 for none.
    max_beats: maximum number of threshold-selected beats, 0 for no limit.

    Raises TavoError when the file cannot be read or nothing was found in it, ValueError for wrong
    arguments. Calls from several threads take turns: use analyze_many for several songs at once.
    """
    number = check(mode, length, max_beats)
    name = os.fsencode(path)
    with _one_instance:
        result = _analyze(_library(), name, number, length, max_beats)
    if result is None:
        raise _many.reason(name, mode)
    return result


def _analyze(lib: ctypes.CDLL, name: bytes, mode: int, length: int,
             max_beats: int) -> Optional[Result]:
    code = ctypes.c_int32(0)
    tavo = lib.tavo_init(ctypes.byref(_Param(name, mode)), ctypes.byref(code))
    if not tavo:
        return None
    found = []  # on success: highlight start, beat times
    done = threading.Event()

    def on_result(info):  # on the library's thread; the record lives until tavo_deinit
        try:
            if info.contents.status == 0:
                count = info.contents.beat_count
                times = info.contents.beat_times[:count] if count > 0 else []
                found.append((info.contents.hl_pos, np.array(times, dtype=np.float64) / 1000.0))
        finally:
            done.set()

    callback = _Callback(on_result)  # must outlive the job
    try:
        lib.tavo_setcallback(tavo, callback)
        if lib.tavo_analyze(tavo, length, max_beats, 0) != 0:
            return None
        while not done.wait(0.5):  # a plain wait would hold back Ctrl-C
            pass
        if not found or not lib.tavo_has_audio(tavo):
            return None
        rate, channels, duration = ctypes.c_int32(), ctypes.c_int32(), ctypes.c_int64()
        lib.tavo_get_stream(tavo, ctypes.byref(rate), ctypes.byref(channels),
                            ctypes.byref(duration))
        start, beats = found[0]
        return Result(
            path=os.fsdecode(name),
            highlight_ms=None if mode == 1 else start,
            beats=beats,
            tempo_bpm=None if mode == 0 else lib.tavo_get_tempo(tavo),
            duration_s=duration.value / 1000.0,
            sample_rate=rate.value,
        )
    finally:
        lib.tavo_deinit(tavo)
