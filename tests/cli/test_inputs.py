"""Tests how the command finds the files to analyse: names with any bytes, folders and lists."""
import csv
import io
import os
import pathlib
import subprocess
import threading
from urllib.parse import unquote_to_bytes

from command_case import Case, send

ODD_NAMES = [
    b"two words.wav", b"line\nbreak.wav", b"tab\tand \"quotes\", comma.wav", b"caf\xc3\xa9.wav",
    b"caf\xe9.wav",  # Latin-1
    b"\xed\xa0\x80 surrogate.wav", b"[a,b]", b"fd", b"back\\slash.wav", b"esc\x1b[31m\xc2\x9b31m\xe2\x80\xaered.wav",
]


class Inputs(Case):
    def setUp(self):
        super().setUp()
        for name in ("a.wav", "b.txt", "inner/deep/d.wav", "../other/o.wav"):  # the content counts, not the name
            self.put("music/" + name)
        self.put("music/letter.mp3", b"Dear reader, this is no song. " * 50)
        self.put("music/short", b"x")
        for name, target in (("inner/loop", ".."), ("linked", "../other"), ("link.wav", "a.wav"), ("broken", "none")):
            (self.folder / "music" / name).symlink_to(target)
        os.mkfifo(self.folder / "music/pipe")

    def found(self, *arguments, **options):
        """Runs the command and returns the names in its results as bytes."""
        results = self.run_json("--mode", "highlight", *arguments, **options)
        return [unquote_to_bytes(r["file_bytes"]) if "file_bytes" in r else r["file"].encode() for r in results]

    def test_every_format_keeps_every_name(self):
        for name in ODD_NAMES:
            self.put(os.fsdecode(name))
        results = self.run_json("--mode", "highlight", *ODD_NAMES)
        self.assertEqual(results[4]["file"], "caf\ufffd.wav")
        self.assertEqual([r["file"] for r in results if "file_bytes" not in r],
                         [name.decode() for name in ODD_NAMES[:4] + ODD_NAMES[6:]])
        text = self.run_tavo("--mode", "highlight", "--format", "json", ODD_NAMES[-1]).stdout
        self.assertIn(rb"esc\u001b[31m\u009B31m\u202Ered.wav", text)
        text = self.run_tavo("--mode", "highlight", "--format", "csv", *ODD_NAMES).stdout
        rows = csv.DictReader(io.StringIO(os.fsdecode(text), newline=""), strict=True)
        self.assertEqual([os.fsencode(row["file"]) for row in rows], ODD_NAMES)
        self.assertEqual(self.found("-0", "-", input=b"\0".join(ODD_NAMES)), ODD_NAMES)
        self.assertEqual(self.found("."), [b"./" + name for name in sorted(ODD_NAMES)])
        deep = "/".join(["d" * 100] * 7) + "/song.wav"
        self.put(deep)
        self.put("-dash.wav")
        self.assertEqual(self.found("--", "-dash.wav", deep), [b"-dash.wav", deep.encode()])
        # In text output each name is on one line and has no control characters.
        done = self.run_tavo("--mode", "highlight", *ODD_NAMES, b"no\nsuch\x1b\xe9", status=1)
        self.assertEqual(done.stderr, rb"tavo: no\nsuch\x1B\xE9: The file does not exist." + b"\n")
        lines = done.stdout.decode("utf-8").split("\n")
        self.assertEqual(len(lines), 3 * len(ODD_NAMES) + 1)
        self.assertIn(r"line\nbreak.wav", lines)
        self.assertIn(r"esc\x1B[31m\xC2\x9B31m\xE2\x80\xAEred.wav", lines)

    def test_folders(self):
        self.assertEqual(self.found("music"), [b"music/a.wav", b"music/b.txt", b"music/link.wav"])
        everything = [b"music/a.wav", b"music/b.txt", b"music/inner/deep/d.wav", b"music/link.wav",
                      b"music/linked/o.wav"]
        self.assertEqual(self.found("--recursive", "music"), everything)
        self.assertEqual(self.found("-r", "-j", "2", "music/"), everything)
        self.assertEqual(self.run_tavo("-m", "highlight", "music").stderr,
                         b"tavo: music: 2 files left out, not recognised as audio.\n")
        for depth in range(24):  # 2^24 paths lead to the innermost folder
            for way in "ab":
                (self.folder / f"none/{depth}").mkdir(parents=True, exist_ok=True)
                (self.folder / f"none/{depth}/{way}").symlink_to(f"../{depth + 1}")
        for words in ("none", "--recursive none"):
            self.run_tavo(*words.split(), status=1, message=b"none: The folder holds no audio files")

    def test_lists(self):
        a, b, deep = b"music/a.wav", b"music/b.txt", b"music/inner/deep/d.wav"
        self.put("#1.wav")
        self.put("list", a + b"\n")
        sound = (self.folder / "#1.wav").read_bytes()
        for words, text, expected in (
                ("-", b"music/b.txt\n\nmusic/a.wav\nmusic/inner/deep", [b, a, deep]),  # without a final newline
                ("--files-from -", b"music/b.txt\nmusic/inner/deep\n", [b, deep]),
                ("music/b.txt --files-from list", b"", [b, a]),
                ("-", b"\xef\xbb\xbf#EXTM3U\r\n#EXTINF:60,Song\r\nmusic/a.wav\r\n\r\n#1.wav\r\n", [a, b"#1.wav"])):
            self.assertEqual(self.found(*words.split(), input=text), expected, text)
        for words, text, message in (  # these are not lists
                ("-", sound, b"This is sound, not a list"), ("-0 -", sound, b"This is sound"),
                ("--files-from music/a.wav", b"", b"name it as FILE"),
                ("--files-from nowhere", b"", b"list of files cannot be read"),
                ("-", b"music/a.wav\0music/b.txt", b"give -0"), ("-", b"x" * 70000, b"more than 4096 bytes")):
            self.run_tavo(*words.split(), input=text, status=1, message=message, printed=b"")
        self.run_tavo("--format", "json", "-", message=b"names no files", printed=b"")

    def test_a_list_is_served_as_it_comes(self):
        """The command prints each result before it reads the next name. Its memory does not grow with the list."""
        thousand = 100 if "SANITIZED" in os.environ else 1000  # a sanitizer needs a minute for all names
        sanitizer = "quarantine_size_mb=0:thread_local_quarantine_size_kb=0"  # releases freed memory at once
        process = self.start("--format", "json", "-m", "highlight", "-", stderr=subprocess.DEVNULL,
                             env={**os.environ, "ASAN_OPTIONS": sanitizer})

        def answer(names):
            """Sends names. Returns the file of the last result and the memory that the command uses, in KiB."""
            threading.Thread(target=send, args=(process, names)).start()
            for _ in range(names.count(b"\n")):
                (result,) = self.objects(process.stdout.readline())
            status = pathlib.Path(f"/proc/{process.pid}/status").read_text()
            return result["file"], int(status.split("VmRSS:")[1].split()[0])

        self.assertEqual(answer(b"music/a.wav\n")[0], "music/a.wav")
        missing = b"x" * 200 + b"\n"
        _, before = answer(missing * 12 * thousand)
        name, after = answer(missing * 40 * thousand + b"music/b.txt\n")
        self.assertEqual(name, "music/b.txt")
        self.assertLess(after - before, 4000)  # less than the size of the names
        self.assertEqual((process.communicate()[0], process.returncode), (b"", 1))
