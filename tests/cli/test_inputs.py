"""Which files are analysed: names of any bytes, folders, lists."""
import csv
import io
import os
import pathlib
import subprocess
import threading
from urllib.parse import unquote_to_bytes

from command_case import TAVO, Case, short_song

ODD_NAMES = [
    b"two words.wav", b"line\nbreak.wav", b"tab\tand \"quotes\", comma.wav", b"caf\xc3\xa9.wav",
    b"caf\xe9.wav",  # Latin-1
    b"\xed\xa0\x80 surrogate.wav", b"[a,b]", b"fd", b"back\\slash.wav", b"esc\x1b[31mred.wav",
]


class Inputs(Case):
    def found(self, *arguments, **options):
        """The names of the results, as bytes."""
        results = self.run_json("--mode", "highlight", *arguments, **options)
        return [unquote_to_bytes(r["file_bytes"]) if "file_bytes" in r else r["file"].encode()
                for r in results]


class Names(Inputs):
    def setUp(self):
        super().setUp()
        for name in ODD_NAMES:
            os.link(short_song(), os.path.join(os.fsencode(self.folder), name))

    def test_json_csv_and_lists_keep_every_name(self):
        results = self.run_json("--mode", "highlight", *ODD_NAMES)
        self.assertEqual(results[4]["file"], "caf\ufffd.wav")
        self.assertEqual([r["file"] for r in results if "file_bytes" not in r],
                         [name.decode() for name in ODD_NAMES[:4] + ODD_NAMES[6:]])
        done = self.run_tavo("--mode", "highlight", "--format", "csv", *ODD_NAMES)
        text = done.stdout.decode("utf-8", "surrogateescape")
        rows = list(csv.DictReader(io.StringIO(text, newline=""), strict=True))
        self.assertEqual([r["file"].encode("utf-8", "surrogateescape") for r in rows], ODD_NAMES)
        self.assertEqual(self.found("-0", "-", input=b"\0".join(ODD_NAMES)), ODD_NAMES)
        self.assertEqual(self.found("."), [b"./" + name for name in sorted(ODD_NAMES)])
        deep = "/".join(["d" * 100] * 7) + "/song.wav"
        self.put(deep)
        self.put("-dash.wav")
        self.assertEqual(self.found("--", "-dash.wav", deep), [b"-dash.wav", deep.encode()])

    def test_text_stays_one_line_a_name_and_obeys_no_escapes(self):
        done = self.run_tavo("--mode", "highlight", *ODD_NAMES, b"no\nsuch\x1b\xe9", status=1)
        self.assertEqual(done.stderr, rb"tavo: no\nsuch\x1B\xE9: The file does not exist." + b"\n")
        self.assertNotIn(b"\x1b", done.stdout)
        done.stdout.decode("utf-8")
        self.assertEqual(done.stdout.count(b"\n"), 3 * len(ODD_NAMES))
        self.assertIn(rb"line\nbreak.wav", done.stdout)


class Places(Inputs):
    def setUp(self):
        super().setUp()
        self.put("music/b.txt")  # a song by its content
        self.put("music/a.wav")
        self.put("music/letter.mp3", b"Dear reader, this is no song. " * 50)
        self.put("music/short", b"x")
        self.put("music/inner/deep/d.wav")
        self.put("other/o.wav")
        (self.folder / "music/inner/loop").symlink_to("..")
        (self.folder / "music/linked").symlink_to("../other")
        (self.folder / "music/link.wav").symlink_to("a.wav")
        (self.folder / "music/broken").symlink_to("nowhere")
        os.mkfifo(self.folder / "music/pipe")

    def test_folders(self):
        self.assertEqual(self.found("music"), [b"music/a.wav", b"music/b.txt", b"music/link.wav"])
        everything = [b"music/a.wav", b"music/b.txt", b"music/inner/deep/d.wav",
                      b"music/link.wav", b"music/linked/o.wav"]
        self.assertEqual(self.found("--recursive", "music"), everything)
        self.assertEqual(self.found("-r", "-j", "2", "music/"), everything)
        self.assertEqual(self.run_tavo("-m", "highlight", "music").stderr,
                         b"tavo: music: 2 files left out, not recognised as audio.\n")
        (self.folder / "none/of/them").mkdir(parents=True)
        for arguments in (["none"], ["--recursive", "none"]):
            (result,) = self.run_json(*arguments, status=1)
            self.assertIn("holds no audio files", result["error"])

    def test_lists(self):
        a, b, deep = b"music/a.wav", b"music/b.txt", b"music/inner/deep/d.wav"
        self.put("#1.wav")
        self.put("list", a + b"\n")
        for words, text, expected in (
                ("-", b"music/b.txt\n\nmusic/a.wav\nmusic/inner/deep", [b, a, deep]),  # no last newline
                ("--files-from -", b"music/b.txt\nmusic/inner/deep\n", [b, deep]),
                ("music/b.txt --files-from list", b"", [b, a]),
                ("-", b"\xef\xbb\xbf#EXTM3U\r\n#EXTINF:60,Song\r\nmusic/a.wav\r\n\r\n#1.wav\r\n", [a, b"#1.wav"])):
            self.assertEqual(self.found(*words.split(), input=text), expected, text)

    def test_what_is_no_list(self):
        sound = (self.folder / "music/a.wav").read_bytes()
        for words, text, said in (
                ("-", sound, "sound (WAV), not a list"), ("-0 -", sound, "sound (WAV)"),
                ("--files-from music/a.wav", b"", "name it as FILE"),
                ("-", b"music/a.wav\0music/b.txt", "give -0"), ("-", b"x" * 70000, "more than 4096 bytes"),
                ("--files-from nowhere", b"", "list of files cannot be read")):
            (result,) = self.run_json(*words.split(), input=text, status=1)
            self.assertIn(said, result["error"])
        done = self.run_tavo("--format", "json", "-", input=b"")
        self.assertEqual(done.stdout, b"")
        self.assertIn(b"names no files", done.stderr)

    def test_a_list_is_served_as_it_comes(self):
        """A result is there before the next name is; memory does not grow with the names."""
        process = subprocess.Popen([TAVO, "--format", "json", "-m", "highlight", "-"], cwd=self.folder,
                                   stdin=subprocess.PIPE, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
                                   env={**os.environ, "ASAN_OPTIONS": "quarantine_size_mb=0:"
                                        "thread_local_quarantine_size_kb=0"})  # it keeps what is freed
        self.addCleanup(process.wait)
        self.addCleanup(process.kill)

        def answer(names):
            writer = threading.Thread(target=lambda: (process.stdin.write(names), process.stdin.flush()))
            writer.start()
            for _ in range(names.count(b"\n")):
                result = self.objects(process.stdout.readline())[0]
            writer.join()
            status = pathlib.Path(f"/proc/{process.pid}/status").read_text()
            return result["file"], int(status.split("VmRSS:")[1].split()[0])

        self.assertEqual(answer(b"music/a.wav\n")[0], "music/a.wav")
        missing = b"x" * 200 + b"\n"
        _, before = answer(missing * 12000)
        name, after = answer(missing * 40000 + b"music/b.txt\n")
        self.assertEqual(name, "music/b.txt")
        self.assertLess(after - before, 4000)  # KiB; the names alone have 8000
        self.assertEqual((process.communicate()[0], process.returncode), (b"", 1))
