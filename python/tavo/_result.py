"""The result of an analysis."""

from __future__ import annotations

import os
from dataclasses import dataclass
from typing import Any, Dict, List, Literal, Optional, Union

import numpy as np
import numpy.typing as npt

Path = Union[str, bytes, "os.PathLike[str]", "os.PathLike[bytes]"]
Mode = Literal["highlight", "beats", "both"]
MODES = ("highlight", "beats", "both")  # the index is the library's number


@dataclass(frozen=True, eq=False)
class Result:
    """The result of one song. Times count from the start of the file.

    path: the path as given; "" for samples.
    highlight_ms: start of the highlight in milliseconds; None in mode "beats".
    beats: times in seconds, ascending; float64, shape (beats,), read-only; empty in mode "highlight".
    tempo_bpm: tempo in beats per minute; in mode "both", that of the music from the highlight on; None in
        mode "highlight".
    duration_s: length of the stream in seconds.
    sample_rate: sample rate of the stream in Hz.

    Results are hashable, and equal if all their values are equal.
    """

    path: str
    highlight_ms: Optional[int]
    beats: npt.NDArray[np.float64]
    tempo_bpm: Optional[int]
    duration_s: float
    sample_rate: int

    def __post_init__(self) -> None:
        self.beats.flags.writeable = False

    def _key(self) -> object:
        return (self.path, self.highlight_ms, self.beats.tobytes(), self.tempo_bpm, self.duration_s,
                self.sample_rate)

    def __eq__(self, other: object) -> bool:
        return isinstance(other, Result) and self._key() == other._key()

    def __hash__(self) -> int:
        return hash(self._key())

    def to_dict(self) -> Dict[str, Any]:
        """Returns the fields as plain values, which json.dumps accepts."""
        return {**vars(self), "beats": self.beats.tolist()}

    def to_mirex(self) -> str:
        """Returns the beats in the MIREX format: one time in seconds per line."""
        return "".join(f"{time:.6f}\n" for time in self.beats)

    def to_jams(self) -> Dict[str, Any]:
        """Returns the result as JAMS: beat and tempo annotations, and a tag_open annotation for the highlight."""
        annotations = []
        if self.tempo_bpm is not None:
            start = self.highlight_ms / 1000.0 if self.highlight_ms is not None else 0.0
            length = max(self.duration_s - start, 0.0)
            annotations += [self._annotation("beat", [_observation(time, 0.0, None) for time in self.beats.tolist()]),
                            self._annotation("tempo", [_observation(start, length, self.tempo_bpm)])]
        if self.highlight_ms is not None:
            annotations.append(self._annotation("tag_open", [_observation(self.highlight_ms / 1000.0, 0.0, "highlight")]))
        return {
            "annotations": annotations,
            "file_metadata": {"title": "", "artist": "", "release": "", "duration": self.duration_s,
                              "identifiers": {}, "jams_version": "0.3.4"},
            "sandbox": {"path": self.path, "sample_rate": self.sample_rate},
        }

    def _annotation(self, namespace: str, data: List[Dict[str, Any]]) -> Dict[str, Any]:
        return {
            "namespace": namespace,
            "data": data,
            "annotation_metadata": {"annotation_tools": "tavo", "data_source": "program"},
            "sandbox": {},
            "time": 0.0,
            "duration": self.duration_s,
        }


def _observation(time: float, duration: float, value: Union[int, str, None]) -> Dict[str, Any]:
    confidence = 1.0 if isinstance(value, int) else None  # required by the namespace tempo
    return {"time": time, "duration": duration, "value": value, "confidence": confidence}


class TavoError(Exception):
    """The reason why a song could not be analysed. str() gives it as a sentence; path names the file."""

    def __init__(self, path: Path, sentence: str) -> None:
        super().__init__(sentence)
        self.path = os.fsdecode(path)


def check(mode: str, length: int, max_beats: int) -> int:
    """Returns the library's number for the mode. Raises ValueError for invalid arguments."""
    if mode not in MODES:
        raise ValueError(f"mode must be one of {', '.join(MODES)}, not {mode!r}")
    for name, value in (("length", length), ("max_beats", max_beats)):
        if not 0 <= value <= 0x7FFFFFFF:
            raise ValueError(f"{name} must be a whole number from 0, not {value!r}")
    return MODES.index(mode)
