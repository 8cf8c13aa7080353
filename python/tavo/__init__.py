"""Finds a song's highlight, its tempo and its beats.

    >>> import tavo
    >>> song = tavo.analyze("song.mp3")
    >>> song.highlight_ms, song.tempo_bpm, song.beats[:3]

analyze runs libtavo.so in this process, one song at a time. analyze_many runs the tavo command,
which analyses several songs at once.
"""

from ._library import analyze
from ._many import analyze_many
from ._result import Mode, Result, TavoError

__version__ = "1.0.0"
__all__ = ["Mode", "Result", "TavoError", "analyze", "analyze_many"]
