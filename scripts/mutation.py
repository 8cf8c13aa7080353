#!/usr/bin/env python3
"""mutation.py [--count N] [--seed N] [--jobs N] [--only ID,ID] [--build DIR] [--results FILE]

Changes one comparison, operator or constant of the library at a time and runs the tests on it: a
change that no test notices is a test that is missing, or a change that changes nothing. Samples N
changes over the files in proportion to their lines; one that does not compile is replaced by another.
Writes a line for each, tab separated: id, file:line, before, after, what noticed it or "survived".
Changes that have a line are not tried again unless --only names them. Survivors judged by hand stand
in docs/figures/survivors.txt: id, tab, judgement. Exits 1 when one is not judged or fewer than
LEAST_PERCENT of the changes are noticed.
"""
import argparse
import hashlib
import pathlib
import queue
import re
import resource
import shutil
import signal
import subprocess
import sys
import threading
import time

ROOT = pathlib.Path(__file__).resolve().parent.parent
FOLDERS = ["dsp", "highlight", "beat", "pcm", "media_source"]
# Whose tests are asked, in this order, after the folder's own.
ORDER = {"dsp": ["highlight", "beat", "core", "formats"], "highlight": ["core", "formats"],
         "beat": ["core", "formats"], "pcm": ["core", "formats"],
         "media_source": ["pcm", "core", "formats"]}
RESULTS = "song_results"  # the results of songs against those of the unchanged library: asked last
FIXTURES = "^(codec_fixtures|format_songs|results_songs|results_once)$"
LEAST_PERCENT = 90
TIMEOUT_FACTOR = 10
LEAST_TIMEOUT = 5.0  # seconds
MEMORY = 8 << 30     # bytes of address space; a change that asks for more has failed

TOKENS = re.compile(r"""
  (?P<skip>//[^\n]*|/\*.*?\*/|"(?:\\.|[^"\\])*"|'(?:\\.|[^'\\])+'|^[ \t]*\#[^\n]*)
 |(?P<number>0[xX][0-9a-fA-F']+[uUlL]*|\d[\d']*(?:\.[\d']*)?(?:[eE][+-]?\d+)?[uUlLfF]*)
 |(?P<word>[A-Za-z_]\w*)
 |(?P<op>->|<<=?|>>=?|&&|\|\||\+\+|--|[=!<>+*/%&|^-]=|[^\s\w])""", re.X | re.S | re.M)
SWAPS = {"<": ["<=", ">="], "<=": ["<", ">"], ">": [">=", "<="], ">=": [">", "<"], "==": ["!="],
         "!=": ["=="], "+": ["-"], "-": ["+"], "*": ["/"], "/": ["*"], "&&": ["||"], "||": ["&&"],
         "++": ["--"], "--": ["++"], "+=": ["-="], "-=": ["+="], "*=": ["/="], "/=": ["*="]}


def fail(message):
    sys.exit(f"mutation: {message}")


def value_of(text):
    """A literal's value and its suffix."""
    suffix = re.search(r"[uUlL]*$" if text[:2].lower() == "0x" else r"[uUlLfF]*$", text).group()
    digits = text[:len(text) - len(suffix)].replace("'", "")
    if re.fullmatch(r"0\d+", digits):
        return int(digits, 8), suffix
    return (int(digits, 0) if re.fullmatch(r"\d+|0[xX].*", digits) else float(digits)), suffix


def other_numbers(text):
    """The literal's value plus and minus one, and zero."""
    value, suffix = value_of(text)
    changed = {value + 1, value - 1, value - value} - {value}
    if isinstance(value, int):
        changed -= {-1}
    return [("(%r)" if each < 0 else "%r") % each + suffix for each in sorted(changed)]


class Change:
    """Edits of one file at one place. edits: (offset, old length, new text), ascending."""

    def __init__(self, file, text, offset, edits):
        start = text.rfind("\n", 0, offset) + 1
        end = text.find("\n", offset)
        self.file, self.edits = file, edits
        self.line = text.count("\n", 0, offset) + 1
        self.before = text[start:end].strip()
        new, shift = text[start:end], 0
        for at, length, with_text in edits:
            if at <= end:
                at += shift - start
                new = new[:at] + with_text + new[at + length:]
                shift += len(with_text) - length
        self.after = new.strip()
        # The same while the line stays as it is, wherever it moves.
        same_before = [each.strip() for each in text[:start].split("\n")].count(self.before)
        key = f"{file}|{self.before}|{same_before}|{offset - start}|{edits[0][2]}|{self.after}"
        self.id = f"{file}:{hashlib.sha1(key.encode()).hexdigest()[:6]}"

    def apply(self, text):
        for at, length, new in reversed(self.edits):
            text = text[:at] + new + text[at + length:]
        return text


def changes_of(file, text):
    """All changes of a file and its number of lines with code. Statements in functions and the
    constants outside them are changed; declarations, records and default values are not."""
    tokens = [each for each in TOKENS.finditer(text) if each.lastgroup != "skip"]
    scopes, statement, parens, found = [], [], 0, []
    for index, token in enumerate(tokens):
        word = token.group()
        if word == "{" and parens == 0:
            heads = {"namespace", "extern"} & set(statement) and "(" not in statement
            record = statement[:1] and statement[0] in ("struct", "enum", "union") and "=" not in statement
            scopes.append("outer" if heads else "record" if record and "(" not in statement else "code")
            if scopes[-1] != "code" or "=" not in statement:
                statement = []
            continue
        if word == "}" and parens == 0:
            if scopes.pop() != "code" or "=" not in statement:
                statement = []
            continue
        parens += {"(": 1, ")": -1}.get(word, 0)
        if word == ";" and parens == 0:
            statement = []
            continue
        statement.append(word)
        in_code = "code" in scopes
        constant = statement[0] == "constexpr" and file.endswith(".cpp") and "=" in statement
        if "record" in scopes or statement[0] == "static_assert" or not (in_code or constant):
            continue
        at, end = token.span()
        spaced = text[at - 1].isspace() and text[end].isspace()
        if token.lastgroup == "number":
            default = (statement[-2:-1] == ["="] and len(statement) > 3 and parens == 0
                       and tokens[index + 1].group() == ";" and value_of(word)[0] == 0)
            if not default:
                found += [Change(file, text, at, [(at, end - at, new)]) for new in other_numbers(word)]
        elif word in ("++", "--") or word in SWAPS and spaced:
            found += [Change(file, text, at, [(at, end - at, new)]) for new in SWAPS[word]]
        elif word in ("if", "while") and tokens[index + 1].group() == "(":
            depth, closing = 0, index + 1
            while True:
                depth += {"(": 1, ")": -1}.get(tokens[closing].group(), 0)
                if depth == 0:
                    break
                closing += 1
            found.append(Change(file, text, at, [(tokens[index + 1].end(), 0, "!("),
                                                 (tokens[closing].start(), 0, ")")]))
    return found, len({text.count("\n", 0, each.start()) for each in tokens})


def all_changes(seed):
    """For each file its changes in the order in which they are tried, and its lines of code."""
    files = {}
    for folder in FOLDERS:
        for path in sorted((ROOT / folder).glob("*.*")):
            if path.suffix in (".cpp", ".h"):
                name = path.relative_to(ROOT).as_posix()
                changes, lines = changes_of(name, path.read_text())
                changes.sort(key=lambda each: hashlib.sha1(f"{seed}|{each.id}".encode()).digest())
                if changes:
                    files[name] = (changes, lines)
    return files


def shares(files, count):
    """How many changes each file gets."""
    whole = sum(lines for _, lines in files.values())
    exact = {name: count * lines / whole for name, (_, lines) in files.items()}
    share = {name: int(each) for name, each in exact.items()}
    rest = sorted(exact, key=lambda name: share[name] - exact[name])
    for name in rest[:count - sum(share.values())]:
        share[name] += 1
    return share


def limits():
    resource.setrlimit(resource.RLIMIT_AS, (MEMORY, MEMORY))
    resource.setrlimit(resource.RLIMIT_CORE, (0, 0))


class Worker:
    """A copy of the tree and its build."""

    def __init__(self, place):
        self.source, self.build, self.scratch = place / "source", place / "build", place / "scratch"
        self.times = {}

    def copy(self):
        """Makes the copy equal to ROOT; what did not change keeps its time."""
        skipped = shutil.ignore_patterns("build", ".git", "__pycache__")
        wanted = set()

        def take(source, target):
            target = pathlib.Path(target)
            wanted.add(target)
            if not target.is_file() or target.read_bytes() != pathlib.Path(source).read_bytes():
                shutil.copy(source, target)
        shutil.copytree(ROOT, self.source, ignore=skipped, copy_function=take, dirs_exist_ok=True)
        for path in self.source.rglob("*"):
            if path.is_file() and path not in wanted:
                path.unlink()

    def run(self, *command):
        return subprocess.run([str(each) for each in command], cwd=self.source, text=True,
                              stdout=subprocess.PIPE, stderr=subprocess.STDOUT)

    def prepare(self):
        self.copy()
        self.must("cmake", "-S", self.source, "-B", self.build, "-G", "Ninja", "-DCMAKE_BUILD_TYPE=Release",
                  "-DCMAKE_CXX_FLAGS_RELEASE=-O1", "-DTAVO_BUILD_CLI=OFF", "-DTAVO_BUILD_JAVA=OFF")
        self.programs = {folder: sorted(each.name[:-len(".dir")] for each in
                                        self.build.glob(f"tests/{folder}/CMakeFiles/test_*.dir"))
                         for folder in FOLDERS + ["core", "formats"]}
        for folder, names in self.programs.items():
            if not names:
                fail(f"no test programs in tests/{folder}")
        everything = sum(self.programs.values(), []) + [RESULTS]
        self.must("ninja", "-C", self.build, "tavo", "make_song", "make_accented_song", *everything)
        # Programs that the library's sources are compiled into; the others load the changed library.
        self.own = [name for name in everything
                    if any((self.build / "tests").glob(f"*/CMakeFiles/{name}.dir/__/**/*.o"))]
        self.must("ctest", "--test-dir", self.build, "-R", FIXTURES, "--output-on-failure")
        for name in everything:
            start = time.monotonic()
            if self.noticed(name, 900):
                fail(f"{name} fails on the unchanged library")
            self.times[name] = time.monotonic() - start

    def must(self, *command):
        done = self.run(*command)
        if done.returncode != 0:
            fail(f"{' '.join(map(str, command))}:\n{done.stdout[-4000:]}")

    def noticed(self, name, timeout):
        """What a test program says of the library: '' when nothing is wrong."""
        shutil.rmtree(self.scratch, ignore_errors=True)
        self.scratch.mkdir()
        command = [self.build / "bin" / name, "--gtest_brief=1", "--gtest_fail_fast"]
        if name == RESULTS:
            results = self.build / "results"
            command = [self.build / "bin" / name, results / "songs", self.scratch / "results.txt",
                       results / "results.txt"]
        with open(self.scratch / "output", "w+b") as output:
            process = subprocess.Popen(command, cwd=self.scratch, stdin=subprocess.DEVNULL, stdout=output,
                                       stderr=subprocess.STDOUT, start_new_session=True, preexec_fn=limits,
                                       env={"PATH": "/usr/bin:/bin", "TMPDIR": str(self.scratch)})
            try:
                status = process.wait(timeout)
            except subprocess.TimeoutExpired:
                status = None
            finally:
                if process.poll() is None:
                    process.send_signal(signal.SIGKILL)
                    process.wait()
            output.seek(0)
            text = output.read().decode(errors="replace")
        if status == 0:
            return ""
        case = re.search(r"\[  FAILED  \] ([\w/]+\.[\w/]+)", text)
        how = "timeout" if status is None else f"signal {-status}" if status < 0 else \
            case.group(1) if case else "fails"
        return f"{name}: {how}"

    def judge(self, change):
        """What noticed the change, 'survived', or '' when it does not compile."""
        path = self.source / change.file
        original = path.read_text()
        path.write_text(change.apply(original))
        try:
            if self.run("ninja", "-C", self.build, "tavo", *self.own).returncode != 0:
                return ""
            folder = change.file.split("/")[0]
            names = sum((self.programs[each] for each in [folder] + ORDER[folder]), [])
            near = f"test_{pathlib.Path(change.file).stem}"
            names.sort(key=lambda name: (name not in self.programs[folder], name != near))
            for name in names + [RESULTS]:
                answer = self.noticed(name, max(LEAST_TIMEOUT, TIMEOUT_FACTOR * self.times[name]))
                if answer:
                    return answer
            return "survived"
        finally:
            path.write_text(original)


def read_table(path, columns):
    rows = {}
    if path.is_file():
        for line in path.read_text().splitlines():
            parts = line.split("\t")
            if len(parts) != columns and not line.startswith("#"):
                fail(f"{path}: not {columns} columns: {line}")
            if not line.startswith("#"):
                rows[parts[0]] = parts
    return rows


class Table:
    """The lines of the results file, written anew after every change."""

    def __init__(self, path):
        self.path, self.lock = path, threading.Lock()
        self.rows = read_table(path, 5)

    def put(self, change, answer):
        with self.lock:
            place = f"{change.file}:{change.line}"
            self.rows[change.id] = [change.id, place, change.before, change.after, answer]
            self.path.parent.mkdir(parents=True, exist_ok=True)
            partly = self.path.with_suffix(".part")
            ordered = sorted(self.rows.values(), key=lambda row: (row[1].split(":")[0],
                                                                  int(row[1].split(":")[1]), row[0]))
            partly.write_text("".join("\t".join(row) + "\n" for row in ordered))
            partly.replace(self.path)
            print(f"{answer or 'does not compile'}\t{place}\t{change.before}\t->\t{change.after}", flush=True)


NO_MUTANT = "does not compile"


def work(worker, files, share, chosen, table):
    """Takes files until none is left; of each, changes until its share has compiled."""
    while True:
        try:
            name = files.get_nowait()
        except queue.Empty:
            return
        changes, wanted = share[name]
        tried = 0
        for change in changes:
            if chosen is None and tried == wanted:
                break
            if chosen is not None and change.id not in chosen:
                continue
            if chosen is not None or change.id not in table.rows:
                table.put(change, worker.judge(change) or NO_MUTANT)
            tried += table.rows[change.id][4] != NO_MUTANT


def summary(table, judged):
    """Prints a row for each folder and one for all. Returns what is wrong."""
    rows = [row for row in table.rows.values() if row[4] != NO_MUTANT]
    unjudged = [row[0] for row in rows if row[4] == "survived" and row[0] not in judged]
    for folder in FOLDERS + ["all"]:
        mine = [row for row in rows if folder in ("all", row[1].split("/")[0])]
        survived = [row[0] for row in mine if row[4] == "survived"]
        results = sum(row[4].startswith(RESULTS) for row in mine)
        killed = len(mine) - len(survived)
        percent = 100 * killed / len(mine) if mine else 0
        known = sum(each in judged for each in survived)
        print(f"figure mutation folder={folder} mutants={len(mine)} killed={killed} "
              f"only_by_results={results} survived={len(survived)} judged={known} "
              f"unjudged={len(survived) - known} percent={percent:.1f}")
    wrong = [f"not judged: {', '.join(unjudged)}"] if unjudged else []
    return wrong + ([f"fewer than {LEAST_PERCENT} percent killed"] if percent < LEAST_PERCENT else [])


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--count", type=int, default=300)
    parser.add_argument("--seed", default="1")
    parser.add_argument("--jobs", type=int, default=1)
    parser.add_argument("--only", type=lambda text: set(text.split(",")))
    parser.add_argument("--build", type=pathlib.Path, default=ROOT / "build" / "mutation")
    parser.add_argument("--results", type=pathlib.Path, default=ROOT / "docs" / "figures" / "mutants.txt")
    options = parser.parse_args()
    for tool in ("cmake", "ninja", "g++", "ffmpeg"):
        if not shutil.which(tool):
            fail(f"{tool} is missing: run scripts/setup.sh")
    files = all_changes(options.seed)
    known = {change.id: change for changes, _ in files.values() for change in changes}
    unknown = (options.only or set()) - known.keys()
    if unknown:
        fail(f"no such changes: {', '.join(sorted(unknown))}")
    counts = shares(files, options.count)
    table = Table(options.results)
    for name in [each for each in table.rows if each not in known]:
        del table.rows[name]  # its line of code is gone
    for name, row in table.rows.items():
        row[1] = f"{known[name].file}:{known[name].line}"
    share = {name: (changes, counts[name]) for name, (changes, _) in files.items()}
    waiting = queue.Queue()
    for name in files:
        if options.only is None or any(each.rsplit(":", 1)[0] == name for each in options.only):
            waiting.put(name)
    workers = [Worker(options.build / str(index)) for index in range(options.jobs)]
    for worker in workers:
        worker.prepare()
    threads = [threading.Thread(target=work, args=(worker, waiting, share, options.only, table), daemon=True)
               for worker in workers]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    wrong = summary(table, read_table(ROOT / "docs" / "figures" / "survivors.txt", 2))
    if wrong:
        fail("; ".join(wrong))


if __name__ == "__main__":
    main()
