#!/usr/bin/env bash
# bench/compare.sh [-n PAIRS] [-m MODE] FILE...
# Compares a complete analysis of each file with decoding the same file with ffmpeg. Runs the two alternately, in pairs,
# and prints a Markdown table of medians: wall time, processor time, peak memory, and the ratios within the pairs. Uses
# build/release/bin/tavo, or the command that TAVO names. Close other programs first; on a busy machine, rely only on
# the ratios of processor time.
set -euo pipefail
tavo=${TAVO:-$(dirname -- "${BASH_SOURCE[0]}")/../build/release/bin/tavo}
exec python3 - "$tavo" "$@" <<'END'
import argparse
import os
import statistics
import sys
import time

parser = argparse.ArgumentParser(prog="compare.sh")
parser.add_argument("-n", type=int, default=9, help="pairs, after one that does not count")
parser.add_argument("-m", default="beats", help="mode of the analysis")
parser.add_argument("files", nargs="+")
args = parser.parse_args(sys.argv[2:])


def measure(words):
    """Returns wall time and processor time in seconds, and peak memory in MiB."""
    start = time.monotonic()
    child = os.fork()
    if child == 0:
        nothing = os.open(os.devnull, os.O_RDWR)
        for stream in (0, 1, 2):
            os.dup2(nothing, stream)
        os.execvp(words[0], words)
    _, status, used = os.wait4(child, 0)
    if status != 0:
        sys.exit(f"compare.sh: {' '.join(words)} failed")
    return time.monotonic() - start, used.ru_utime + used.ru_stime, used.ru_maxrss / 1024


def median(values):
    return statistics.median(values)


print("| File | Wall time, s | ratio | Processor time, s | ratio | Peak memory, MiB |")
print("|---|---|---|---|---|---|")
for file in args.files:
    pairs = []
    for _ in range(args.n + 1):
        job = measure([sys.argv[1], "--quiet", "--mode", args.m, "--", file])
        pairs.append((job, measure(["ffmpeg", "-nostdin", "-y", "-i", file, "-ac", "1", "-f", "s16le",
                                    os.devnull])))
    pairs = pairs[1:]
    row = f"| {os.path.basename(file)}"
    for i in (0, 1):
        job, other = (median([pair[k][i] for pair in pairs]) for k in (0, 1))
        row += f" | {job:.3f} / {other:.3f} | {median([a[i] / b[i] for a, b in pairs]):.2f}"
    print(f"{row} | {median([pair[0][2] for pair in pairs]):.1f} |", flush=True)
print(f"\n{args.n} pairs, mode {args.m}, load average {os.getloadavg()[0]:.1f}")
END
