#!/usr/bin/env python3
"""uncovered.py REPORT: the figures of gcovr's JSON report, for scripts/coverage.sh.

Prints a row for each folder, writes docs/figures/uncovered.txt (file:function, tab, lines or
branches) and compares it with docs/figures/explained.txt (pattern for file:function, tab, reason).
Exits 1 when an uncovered line or branch has no reason or fewer than LEAST_PERCENT of all lines are
covered.
"""
import fnmatch
import json
import pathlib
import re
import sys

FIGURES = pathlib.Path(__file__).resolve().parent.parent / "docs" / "figures"
LEAST_PERCENT = 97
ALL = "library_and_stand_in"


def folder_of(file):
    return "stand_in" if file.startswith("desktop/wexaaudio/") else file.split("/")[0]


def function_at(functions, line):
    """The name of the last function that begins at or before the line."""
    before = [each for each in functions if each["lineno"] <= line]
    if not before:
        return "-"
    name = max(before, key=lambda each: each["lineno"])["name"]
    name = re.sub(r"\(anonymous namespace\)::", "", name).split("(")[0]
    return re.sub(r"<.*>", "", name).split(" ")[-1]


def ranges(lines):
    """7 8 9 12 as '7-9,12'."""
    parts = []
    for line in lines:
        if parts and parts[-1][1] == line - 1:
            parts[-1][1] = line
        else:
            parts.append([line, line])
    return ",".join(str(a) if a == b else f"{a}-{b}" for a, b in parts)


def main():
    report = json.loads(pathlib.Path(sys.argv[1]).read_text())
    totals, lines_at, branches_at = {}, {}, {}
    for file in report["files"]:
        name = file["file"]
        for line in file["lines"]:
            if line["gcovr/noncode"] or line["gcovr/excluded"]:
                continue
            taken = [each["count"] > 0 for each in line["branches"]]
            for folder in (folder_of(name), ALL):
                total = totals.setdefault(folder, [0, 0, 0, 0])
                for index, more in enumerate((1, line["count"] > 0, len(taken), sum(taken))):
                    total[index] += more
            place = f"{name}:{function_at(file['functions'], line['line_number'])}"
            if line["count"] == 0:
                lines_at.setdefault(place, []).append(line["line_number"])
            elif not all(taken):
                branches_at.setdefault(place, []).append(line["line_number"])

    for folder, (lines, covered, branches, taken) in totals.items():
        if folder != ALL:
            row(folder, lines, covered, branches, taken)
    percent = row(ALL, *totals[ALL])

    FIGURES.mkdir(parents=True, exist_ok=True)
    with open(FIGURES / "uncovered.txt", "w") as out:
        out.write("# Lines that the tests do not execute, then lines of which they do not take every branch.\n")
        for what, places in (("lines", lines_at), ("branches", branches_at)):
            out.writelines(f"{place}\t{what} {ranges(sorted(set(at)))}\n" for place, at in sorted(places.items()))

    explained = FIGURES / "explained.txt"
    texts = explained.read_text().splitlines() if explained.is_file() else []
    patterns = [each.split("\t")[0] for each in texts if each and not each.startswith("#")]
    unexplained = 0
    for what, places in (("lines", lines_at), ("branches", branches_at)):
        for place, at in sorted(places.items()):
            if not any(fnmatch.fnmatchcase(place, pattern) for pattern in patterns):
                unexplained += 1
                print(f"coverage: no reason for {place}, {what} {ranges(sorted(set(at)))}", file=sys.stderr)
    for pattern in patterns:
        if not fnmatch.filter(list(lines_at) + list(branches_at), pattern):
            print(f"coverage: nothing uncovered any more at {pattern}", file=sys.stderr)
    if percent < LEAST_PERCENT:
        print(f"coverage: below {LEAST_PERCENT} percent", file=sys.stderr)
    sys.exit(1 if unexplained > 0 or percent < LEAST_PERCENT else 0)


def row(folder, lines, covered, branches, taken):
    percent = 100 * covered / lines
    print(f"figure coverage folder={folder} lines={lines} covered={covered} percent={percent:.1f} "
          f"branches={branches} branches_covered={taken}")
    return percent


if __name__ == "__main__":
    main()
