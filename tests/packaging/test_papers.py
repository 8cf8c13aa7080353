"""Tests that the man page and the completions have exactly the options of the command."""
import os
import pathlib
import re
import subprocess
import tempfile
import unittest

TAVO, PACKAGING = (pathlib.Path(os.environ[name]) for name in ("TAVO", "PACKAGING"))
PAGE, BASH, ZSH, FISH = (PACKAGING / f"tavo.{end}" for end in ("1", "bash", "zsh", "fish"))
OPTION = re.compile(r"(?<![\w-])(--[a-z][a-z-]*|-[a-zA-Z0-9])(?![\w-])")


def run(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True)


def complete(*words, folder="/"):
    """Returns the completions that bash offers for the last word."""
    script = ('source "$1"; cd "$2"; shift 2; COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); _tavo; '
              'for word in "${COMPREPLY[@]}"; do echo "$word"; done')
    output = run("bash", "--norc", "-c", script, "bash", BASH, folder, "tavo", *words)
    assert output.stderr == "", output.stderr
    return sorted(output.stdout.splitlines())


def complete_in_fish(word):
    output = run("fish", "--no-config", "-c", f"source '{FISH}'; complete -C 'tavo {word}'").stdout
    return sorted(line.split("\t")[0] for line in output.splitlines())


class ManPageAndCompletions(unittest.TestCase):
    def test_options(self):
        lines = re.findall(r"^  (-.*?)(?:\s{2,}|\s[A-Z]|$)", run(TAVO, "--help").stdout, re.MULTILINE)
        expected = set(OPTION.findall("\n".join(lines)))
        self.assertGreater(len(expected), 15)
        section = PAGE.read_text().split(".SH OPTIONS")[1].split(".SH OUTPUT")[0]
        heads = "\n".join(part.splitlines()[0] for part in section.split(".TP\n")[1:])
        self.assertEqual(set(OPTION.findall(heads.replace("\\-", "-"))), expected)
        self.assertEqual(set(complete("-")), expected)
        self.assertEqual({*complete_in_fish("-"), *complete_in_fish("--")}, expected)
        run("zsh", "-n", ZSH)
        self.assertEqual(set(OPTION.findall(re.sub(r"_arguments.*|\[.*?\]", "", ZSH.read_text()))), expected)

    def test_short_help(self):
        """The output of -h fits on one screen and names every option."""
        lines = run(TAVO, "-h").stdout.splitlines()
        self.assertLessEqual((len(lines), max(map(len, lines))), (24, 80))
        named = set(OPTION.findall("\n".join(line for line in lines[lines.index("Examples:") + 6:])))
        self.assertEqual(named, set(complete("-")))

    def test_choices(self):
        """Completions offer exactly the values that an option accepts."""
        for option in ("--mode", "--format", "--fps"):
            refused = subprocess.run([TAVO, option, "?", "x"], capture_output=True, text=True)
            choices = sorted(re.search(r"{(.*)}", refused.stderr)[1].split(","))
            self.assertEqual(complete(option, ""), choices)
            self.assertEqual(complete_in_fish(option + " "), choices)
            (offered,) = re.findall(option + r"=(?:}')?\[.*:\((.*)\)'", ZSH.read_text())
            self.assertEqual(sorted(offered.split()), choices)

    def test_page_has_no_warnings(self):
        done = run("groff", "-man", "-ww", "-Tutf8", "-z", PAGE)
        self.assertEqual(done.stdout + done.stderr, "")

    def test_completion(self):
        with tempfile.TemporaryDirectory() as folder:
            pathlib.Path(folder, "music").mkdir()
            for name in ("a song.wav", "-odd.wav"):
                pathlib.Path(folder, name).touch()
            for words, offered in (
                    (["--mo"], ["--mode"]), (["-m", "h"], ["highlight"]), (["--format", "=", "js"], ["json"]),
                    (["--jobs", ""], []), (["--output-dir", ""], ["music"]), (["a"], ["a song.wav"]),
                    (["--", "-"], ["-odd.wav"]), (["--force", ""], ["-odd.wav", "a song.wav", "music"])):
                self.assertEqual(complete(*words, folder=folder), offered, words)
