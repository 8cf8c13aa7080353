#!/usr/bin/env python3
"""reliability.py [--check] [ROOT]: writes docs/RELIABILITY.md from the figures in docs/figures.

The figures are lines that the trial programs and scripts print and scripts/soak.sh keeps; no number
of the document is typed. A set that is missing, empty or at odds with what it must show is an error,
and nothing is written then. With --check nothing is written either: exits 1 unless the document is
what the figures give.
"""
import pathlib
import sys

# A set's heading, the files its rows come from, and what they mean. Columns of ZERO must be 0 in
# every row.
SETS = {
    "allocations": ("Allocations that fail", ["faults"], """
Each allocation of opening, job and release fails, once or from there on for ever, at every place in
turn. A row is one format in one mode; `second_decoding` is mode 2 when the landing point is not found
and the rest is decoded again. Every started job calls back once, nothing stays allocated."""),
    "threads": ("Threads, mutexes and conditions that cannot be made", ["faults"], """
Work of a thread that cannot be started runs on the calling thread: the result is `equal` to the
undisturbed one. A job's own thread that cannot be started is reported, and the instance stays ready."""),
    "files": ("File calls that fail", ["faults"], """
Each call fails once or from there on; `read` also delivers one byte at a time or random short
lengths, which must change nothing."""),
    "codec_faults": ("A codec library that misbehaves", ["codec_faults"], """
A scripted codec library answers each call of each of its functions with failures, ends, nothing,
impossible byte counts, absurd rates, channels and durations, once or for ever."""),
    "damage": ("Damaged files", ["damage"], """
Under address and undefined-behaviour sanitizers: one format's sample cut at every length to 4,096
and at 1,000 later ones; each byte of its first 4 KiB set to 0 and to 255 and each of its bits
flipped; and random accidents."""),
    "lifecycle": ("Create, analyse, stop, destroy", ["lifecycle", "lifecycle_tsan"], """
Cycles with random delays. Growth is from the tenth cycle to the last, in bytes and in numbers."""),
    "limits": ("Limits", ["limits"], """
What lies on, below and above each limit, and what is answered."""),
    "fuzzing": ("Fuzzing", ["fuzzing"], """
libFuzzer with address, undefined-behaviour and leak sanitizers. `aim` is what a target was to reach."""),
    "matrix": ("Compilers, optimisation and sanitizers", ["matrix"], """
The test suite and the results (ms and BPM, compared to the last digit) of every build."""),
    "coverage": ("Coverage", ["coverage"], """
Lines and branches that the tests execute. Every place that is not executed or does not take all of
its branches is named in `docs/figures/uncovered.txt`; why, stands below by the file and function."""),
    "mutation": ("Mutation", ["mutation"], """
One comparison, operator or constant changed at a time, in `dsp`, `highlight`, `beat`, `pcm` and
`media_source`, and the tests run on it."""),
}
ZERO = {"leaked", "hung", "wrong", "callbacks_wrong", "findings", "different", "failed_tests",
        "fds_growth", "threads_growth"}
NOTES = {"coverage": ("explained.txt", "Why the rest is not covered"),
         "mutation": ("survivors.txt", "The survivors")}


def fail(message):
    sys.exit(f"reliability: {message}")


def rows_of(figures, name, sources):
    """The rows of a set: dictionaries with the same keys."""
    rows = []
    for source in sources:
        path = figures / f"{source}.txt"
        if not path.is_file():
            fail(f"{path} is missing: run scripts/soak.sh {source}")
        for line in path.read_text().splitlines():
            words = line.split()
            if words[:2] == ["figure", name]:
                rows.append(dict(word.split("=", 1) for word in words[2:]))
    if not rows:
        fail(f"no figures of '{name}' in {', '.join(sources)}")
    for row in rows:
        if row.keys() != rows[0].keys():
            fail(f"rows of '{name}' have different columns")
        for column in ZERO & row.keys():
            if row[column] != "0":
                fail(f"{name}: {column} is {row[column]} in {row}")
    return rows


def number(text):
    digits = text.lstrip("-")
    return f"{int(text):,}" if digits.isdigit() else text


def table(rows):
    columns = list(rows[0])
    right = [all(row[column].replace(".", "", 1).lstrip("-").isdigit() for row in rows)
             for column in columns]
    lines = ["| " + " | ".join(column.replace("_", " ") for column in columns) + " |",
             "|" + "|".join("---:" if each else "---" for each in right) + "|"]
    lines += ["| " + " | ".join(number(row[column]) for column in columns) + " |" for row in rows]
    return "\n".join(lines)


def origin(figures, sources):
    """The first line of each file: time, machine, version."""
    return "; ".join(f"{source}: {(figures / f'{source}.txt').read_text().splitlines()[0].lstrip('# ')}"
                     for source in sources)


def notes(path):
    """The subjects of a file of "subject, tab, reason", those of one reason together."""
    if not path.is_file():
        fail(f"{path} is missing")
    subjects = {}
    for line in path.read_text().splitlines():
        if line and not line.startswith("#"):
            subject, reason = line.split("\t", 1)
            subjects.setdefault(reason, []).append(f"`{subject}`")
    return "\n".join(f"- {', '.join(each)}: {reason}" for reason, each in subjects.items())


def document(figures):
    parts = ["# Reliability", "What was tried to break the library, counted. `scripts/soak.sh` runs it "
             "all and keeps the figures in `docs/figures`; `scripts/reliability.py` writes this file "
             "from them. A sample of every set runs with the tests every day."]
    for name, (heading, sources, text) in SETS.items():
        parts += [f"## {heading}", text.strip(), table(rows_of(figures, name, sources)),
                  f"({origin(figures, sources)})"]
        if name in NOTES:
            file, title = NOTES[name]
            parts += [f"### {title}", notes(figures / file)]
    return "\n\n".join(parts) + "\n"


def main():
    arguments = sys.argv[1:]
    check = "--check" in arguments
    places = [each for each in arguments if each != "--check"]
    root = pathlib.Path(places[0] if places else pathlib.Path(__file__).parent.parent)
    text = document(root / "docs" / "figures")
    target = root / "docs" / "RELIABILITY.md"
    if not check:
        target.write_text(text)
    elif not target.is_file() or target.read_text() != text:
        fail(f"{target} is not what the figures give: run scripts/reliability.py")


if __name__ == "__main__":
    main()
