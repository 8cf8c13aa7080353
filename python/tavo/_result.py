"""What an analysis gives."""

from __future__ import annotations

import os
from dataclasses import dataclass
from typing import Literal, Optional, Union

import numpy as np

Path = Union[str, bytes, "os.PathLike[str]", "os.PathLike[bytes]"]
Mode = Literal["highlight", "beats", "both"]
MODES = ("highlight", "beats", "both")  # in the order of the library's numbers


@dataclass(frozen=True)
class Result:
    """One song's result. Times count from the start of the file.

    path: the file, as it was named.
    highlight_ms: start of the highlight in milliseconds; None in mode "beats".
    beats: times in seconds, ascending; float64, shape (beats,); empty in mode "highlight".
    tempo_bpm: beats a minute, in mode "both" of the music from the highlight on; None in mode
        "highlight".
    duration_s: length of the stream in seconds.
    sample_rate: of the stream, Hz.
    """

    path: str
    highlight_ms: Optional[int]
    beats: np.ndarray
    tempo_bpm: Optional[int]
    duration_s: float
    sample_rate: int


class TavoError(Exception):
    """A song that could not be analysed. str() is a sentence; path names the file."""

    def __init__(self, path: Path, sentence: str):
        super().__init__(sentence)
        self.path = os.fsdecode(path)


def check(mode: str, length: int, max_beats: int) -> int:
    """The library's number of the mode. ValueError for arguments that the library cannot take."""
    if mode not in MODES:
        raise ValueError(f"mode must be one of {', '.join(MODES)}, not {mode!r}")
    for name, value in (("length", length), ("max_beats", max_beats)):
        if not 0 <= value <= 0x7FFFFFFF:
            raise ValueError(f"{name} must be a whole number from 0, not {value!r}")
    return MODES.index(mode)
