"""Finds a song's highlight, its tempo and its beats.

    >>> import tavo
    >>> song = tavo.analyze("song.mp3")
    >>> song.highlight_ms, song.tempo_bpm, song.beats[:3]

The work is done by libtavo.so, several songs at once by the command tavo.
"""

from ._library import analyze
from ._many import analyze_many
from ._result import Mode, Result, TavoError

__all__ = ["Mode", "Result", "TavoError", "analyze", "analyze_many"]
