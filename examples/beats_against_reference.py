#!/usr/bin/env python3
"""beats_against_reference.py SONG REFERENCE [PICTURE]

Compares the beats that tavo finds with a reference annotation: a text file with one time in seconds per
line. Prints precision, recall and F-measure at 70 ms, computed by mir_eval (Debian: python3-mir-eval).
With PICTURE, also draws both lists to that file; this needs matplotlib.
"""
import sys

import mir_eval
import numpy as np
import tavo

TOLERANCE = 0.070  # seconds


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
    # mir_eval's beat scores ignore the first 5 s, so its onset scores are used.
    f_measure, precision, recall = mir_eval.onset.f_measure(reference, song.beats, window=TOLERANCE)
    print(f"tempo {song.tempo_bpm} BPM, {len(song.beats)} beats, {len(reference)} in the reference")
    print(f"precision {precision:.3f}  recall {recall:.3f}  F-measure {f_measure:.3f}")
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
