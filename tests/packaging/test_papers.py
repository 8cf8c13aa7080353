"""The man page and the completion know the options that the command has, and no others."""
import os
import pathlib
import re
import subprocess
import sys
import tempfile
import unittest

TAVO, PACKAGING = (os.path.abspath(sys.argv.pop(1)) for _ in range(2))
PAGE = pathlib.Path(PACKAGING, "tavo.1")
COMPLETION, ZSH, FISH = (pathlib.Path(PACKAGING, "tavo." + shell) for shell in ("bash", "zsh", "fish"))
OPTION = re.compile(r"(?<![\w-])(--[a-z][a-z-]*|-[a-zA-Z0-9])(?![\w-])")


def options_of_the_command():
    help_text = subprocess.run([TAVO, "--help"], check=True, capture_output=True, text=True).stdout
    names = set()
    for line in help_text.splitlines():
        if line.startswith("  -"):
            names |= set(OPTION.findall(re.split(r"\s{2,}|\s[A-Z]", line.strip())[0]))
    return names


def complete(folder, *words):
    """What the completion offers for the last of the words."""
    script = ('source "$1"; cd "$2"; shift 2; COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); _tavo; '
              'printf "%s\\n" "${COMPREPLY[@]}"')
    said = subprocess.run(["bash", "--norc", "-c", script, "bash", COMPLETION, folder, *words],
                          check=True, capture_output=True, text=True)
    assert said.stderr == "", said.stderr
    return sorted(said.stdout.split("\n")[:-1]) if said.stdout != "\n" else []


def complete_in_fish(word):
    script = f"source '{FISH}'; complete -C 'tavo {word}'"
    said = subprocess.run(["fish", "--no-config", "-c", script], check=True, capture_output=True,
                          text=True).stdout
    return sorted(line.split("\t")[0] for line in said.splitlines())


class Papers(unittest.TestCase):
    def test_options(self):
        expected = options_of_the_command()
        self.assertGreater(len(expected), 15)
        section = PAGE.read_text().split(".SH OPTIONS")[1].split(".SH OUTPUT")[0]
        heads = "\n".join(part.splitlines()[0] for part in section.split(".TP\n")[1:])
        self.assertEqual(set(OPTION.findall(heads.replace("\\-", "-"))), expected)
        self.assertEqual(set(complete("/", "tavo", "-")), expected)
        self.assertEqual(set(complete_in_fish("-")) | set(complete_in_fish("--")), expected)
        subprocess.run(["zsh", "-n", ZSH], check=True)
        offered = re.sub(r"_arguments.*|\[.*?\]", "", ZSH.read_text())
        self.assertEqual(set(OPTION.findall(offered)), expected)

    def test_choices(self):
        """What is completed for an option's value is what the option takes."""
        for option in ("--mode", "--format", "--fps"):
            refused = subprocess.run([TAVO, option, "?", "x"], capture_output=True, text=True)
            choices = sorted(re.search(r"{(.*)}", refused.stderr).group(1).split(","))
            self.assertEqual(complete("/", "tavo", option, ""), choices)
            self.assertEqual(complete_in_fish(option + " "), choices)
            (offered,) = re.findall(option + r"=(?:}')?\[.*:\((.*)\)'", ZSH.read_text())
            self.assertEqual(sorted(offered.split()), choices)

    def test_page_is_clean(self):
        done = subprocess.run(["groff", "-man", "-ww", "-Tutf8", "-z", PAGE], check=True,
                              capture_output=True, text=True)
        self.assertEqual(done.stdout + done.stderr, "")

    def test_completion(self):
        with tempfile.TemporaryDirectory() as folder:
            os.mkdir(os.path.join(folder, "music"))
            for name in ("a song.wav", "-odd.wav"):
                pathlib.Path(folder, name).touch()
            cases = [
                (["--mo"], ["--mode"]),
                (["--mode", ""], ["beats", "both", "highlight"]),
                (["-m", "h"], ["highlight"]),
                (["--format", "=", "js"], ["json"]),
                (["--jobs", ""], []),
                (["--output-dir", ""], ["music"]),
                (["a"], ["a song.wav"]),
                (["--", "-"], ["-odd.wav"]),
                (["--force", ""], ["-odd.wav", "a song.wav", "music"]),
            ]
            for words, offered in cases:
                with self.subTest(words=words):
                    self.assertEqual(complete(folder, "tavo", *words), offered)


if __name__ == "__main__":
    unittest.main()
