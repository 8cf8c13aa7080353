"""Analyses one song at a time with libtavo.so in this process."""

from __future__ import annotations

import ctypes
import os
import threading
from typing import Any, List, Optional, Tuple, Union

import numpy as np
import numpy.typing as npt

from ._location import LIBRARY
from ._result import Path, Result, TavoError, check
from ._samples import Samples, memory_file, to_mono


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
_one_instance = threading.Lock()  # the library allows one instance per process
_loaded: Optional[ctypes.CDLL] = None


def _library() -> ctypes.CDLL:
    global _loaded
    if _loaded is None:
        lib = ctypes.CDLL(LIBRARY)
        i32, handle = ctypes.c_int32, ctypes.c_void_p
        lib.tavo_init.restype = handle
        lib.tavo_init.argtypes = [ctypes.POINTER(_Param), ctypes.POINTER(i32)]
        lib.tavo_probe.argtypes = [ctypes.c_char_p, ctypes.c_void_p]
        lib.tavo_error_text.restype = ctypes.c_char_p
        lib.tavo_error_text.argtypes = [i32]
        lib.tavo_setcallback.restype = None
        lib.tavo_setcallback.argtypes = [handle, _Callback]
        lib.tavo_analyze.argtypes = [handle, i32, i32, i32]
        for name in ("tavo_deinit", "tavo_get_tempo", "tavo_has_audio", "tavo_is_complete"):
            getattr(lib, name).argtypes = [handle]
        lib.tavo_get_stream.argtypes = [handle, ctypes.POINTER(i32), ctypes.POINTER(i32),
                                        ctypes.POINTER(ctypes.c_int64)]
        ctypes.c_char_p.in_dll(lib, "fnamedec").value = b""  # no click track
        _loaded = lib
    return _loaded


def analyze(song: Union[Path, Samples], rate: Optional[int] = None, *, mode: str = "both",
            length: int = 0, max_beats: int = 0) -> Result:
    """Analyses one song and waits for the result.

    song: the path of a file; or, with rate, samples of shape (n,) or (n, channels), as int16 or as
        floats with full scale 1.0. The mean of the channels is analysed.
    rate: sample rate of the samples in Hz; None for a file.
    mode: "highlight", "beats" or "both"; "both" finds the beats from the highlight on.
    length: requested length of the highlight in seconds; 0 for no particular length.
    max_beats: maximum number of threshold-selected beats; 0 for no limit.

    Raises TavoError if the song cannot be read to its end or nothing is found in it, and ValueError
    for invalid arguments. Calls from several threads run one after another; analyze_many analyses
    several songs at once.
    """
    number = check(mode, length, max_beats)
    if isinstance(song, (str, bytes, os.PathLike)):
        if rate is not None:
            raise ValueError("rate belongs to samples; a file states its own")
        name = os.fsencode(song)
        with _one_instance:
            return _analyze(_library(), name, os.fsdecode(name), number, length, max_beats)
    if rate is None or not 0 < rate <= 0x3FFFFFFF:
        raise ValueError(f"samples need a rate in Hz, not {rate!r}")
    with memory_file(to_mono(song), int(rate)) as name, _one_instance:
        return _analyze(_library(), name, "", number, length, max_beats)


def _reason(lib: ctypes.CDLL, code: int) -> str:
    text: bytes = lib.tavo_error_text(code)
    clause = text.decode()
    return f"{clause[0].upper()}{clause[1:]}."


def _analyze(lib: ctypes.CDLL, name: bytes, path: str, mode: int, length: int,
             max_beats: int) -> Result:
    code = ctypes.c_int32(0)
    tavo = lib.tavo_init(ctypes.byref(_Param(name, mode)), ctypes.byref(code))
    if not tavo:
        raise TavoError(path, _reason(lib, lib.tavo_probe(name, None) or code.value))
    found: List[Tuple[int, npt.NDArray[np.float64]]] = []  # on success: highlight start, beat times
    done = threading.Event()

    def on_result(info: Any) -> None:  # on the library's thread; the record lives until tavo_deinit
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
        started = lib.tavo_analyze(tavo, length, max_beats, 0)
        if started != 0:
            raise TavoError(path, _reason(lib, started))
        while not done.wait(0.5):  # a wait without a timeout would delay Ctrl-C
            pass
        if not lib.tavo_is_complete(tavo):
            raise TavoError(path, "The file could not be read to its end.")
        if not lib.tavo_has_audio(tavo):
            raise TavoError(path, "No audio could be decoded.")
        if not found:
            raise TavoError(path, "No beats were found: the song may be silent or too short for a rhythm.")
        rate, channels, duration = ctypes.c_int32(), ctypes.c_int32(), ctypes.c_int64()
        lib.tavo_get_stream(tavo, ctypes.byref(rate), ctypes.byref(channels),
                            ctypes.byref(duration))
        start, beats = found[0]
        return Result(
            path=path,
            highlight_ms=None if mode == 1 else start,
            beats=beats,
            tempo_bpm=None if mode == 0 else lib.tavo_get_tempo(tavo),
            duration_s=duration.value / 1000.0,
            sample_rate=rate.value,
        )
    finally:
        lib.tavo_deinit(tavo)
