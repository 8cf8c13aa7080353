"""Analyses many songs with the tavo command, which runs several at once in worker processes."""

from __future__ import annotations

import json
import os
import subprocess
import threading
from typing import IO, Any, Callable, Dict, Iterable, Iterator, List, Optional, Union
from urllib.parse import unquote_to_bytes

import numpy as np

from ._location import COMMAND
from ._result import Path, Result, TavoError, check


def analyze_many(
    paths: Iterable[Path],
    mode: str = "both",
    length: int = 0,
    max_beats: int = 0,
    jobs: Optional[int] = None,
    progress: Optional[Callable[[int, int], None]] = None,
) -> Iterator[Union[Result, TavoError]]:
    """Analyses several songs at a time and yields their results in the order of the paths.

    If a song cannot be analysed, its result is a TavoError; the others are still analysed.
    paths: files and folders. A folder stands for the songs in it.
    jobs: number of worker processes, each with one song at a time; None for one per processor.
    progress: called after each song with the number of finished songs and the number of paths.
    mode, length, max_beats: as for analyze.
    """
    check(mode, length, max_beats)
    names = [os.fsencode(path) for path in paths]
    return _run(names, mode, length, max_beats, jobs or os.cpu_count() or 1, progress)


def _run(names: List[bytes], mode: str, length: int, max_beats: int, jobs: int,
         progress: Optional[Callable[[int, int], None]]) -> Iterator[Union[Result, TavoError]]:
    words = [COMMAND, "--format", "json", "--quiet", "--mode", mode, "--length", str(length),
             "--max-beats", str(max_beats), "--jobs", str(jobs), "--null", "--files-from", "-"]
    if mode == "beats":
        words[words.index("--length"):words.index("--max-beats")] = []
    if mode == "highlight":
        words[words.index("--max-beats"):words.index("--jobs")] = []
    command = subprocess.Popen(words, stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                               stderr=subprocess.DEVNULL)
    assert command.stdin is not None and command.stdout is not None
    feeder = threading.Thread(target=_feed, args=(command.stdin, names), daemon=True)
    feeder.start()
    done = 0
    try:
        for line in command.stdout:
            done += 1
            if progress is not None:
                progress(done, len(names))
            yield _parse(json.loads(line))
        command.wait()
    finally:
        command.terminate()
        command.wait()
        command.stdout.close()
        feeder.join()
    if done < len(names):
        raise RuntimeError(f"tavo ended after {done} of {len(names)} songs")


def _feed(pipe: IO[bytes], names: List[bytes]) -> None:
    try:
        with pipe:
            for name in names:
                pipe.write(name + b"\0")
    except BrokenPipeError:  # _run reports that the command has ended
        pass


def _parse(song: Dict[str, Any]) -> Union[Result, TavoError]:
    path = unquote_to_bytes(song["file_bytes"]) if "file_bytes" in song else song["file"]
    if song["status"] != "ok":
        return TavoError(path, song["error"])
    return Result(
        path=os.fsdecode(path),
        highlight_ms=song.get("hl_pos_ms"),
        beats=np.array(song.get("beats_ms", []), dtype=np.float32).astype(np.float64) / 1000.0,
        tempo_bpm=song.get("bpm"),
        duration_s=song["duration_ms"] / 1000.0,
        sample_rate=song["sample_rate"],
    )
