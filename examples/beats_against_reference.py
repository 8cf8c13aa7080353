#!/usr/bin/env python3
"""beats_against_reference.py SONG REFERENCE [PICTURE]

Compares the beats that tavo finds with a reference: a text file with one time in seconds a line, as
annotators write it. Prints precision, recall and F-measure at 70 ms. With PICTURE, and matplotlib
installed, both lists are drawn.
"""
import sys

import numpy as np
import tavo

TOLERANCE = 0.070  # seconds


def matches(found: np.ndarray, reference: np.ndarray) -> int:
    """Pairs of a beat and a reference within the tolerance; each time belongs to one pair at most."""
    pairs = i = k = 0
    while i < len(found) and k < len(reference):
        if abs(found[i] - reference[k]) <= TOLERANCE:
            pairs, i, k = pairs + 1, i + 1, k + 1
        elif found[i] < reference[k]:
            i += 1
        else:
            k += 1
    return pairs


def main() -> int:
    if len(sys.argv) not in (3, 4):
        print(__doc__, file=sys.stderr)
        return 2
    reference = np.loadtxt(sys.argv[2], ndmin=2)[:, 0]
    try:
        song = tavo.analyze(sys.argv[1], mode="beats")
    except tavo.TavoError as error:
        print(f"{error.path}: {error}", file=sys.stderr)
        return 1
    hits = matches(song.beats, reference)
    precision = hits / len(song.beats) if len(song.beats) else 0.0
    recall = hits / len(reference) if len(reference) else 0.0
    both = precision + recall
    print(f"tempo {song.tempo_bpm} BPM, {len(song.beats)} beats, {len(reference)} in the reference")
    print(f"precision {precision:.3f}  recall {recall:.3f}  F-measure "
          f"{2 * precision * recall / both if both else 0.0:.3f}")
    if len(sys.argv) == 4:
        import matplotlib.pyplot as plt

        plt.figure(figsize=(12, 2))
        plt.eventplot([song.beats, reference], colors=["tab:blue", "tab:orange"])
        plt.yticks([0, 1], ["tavo", "reference"])
        plt.xlabel("seconds")
        plt.savefig(sys.argv[3], bbox_inches="tight")
    return 0


if __name__ == "__main__":
    sys.exit(main())
