"""Which files are analysed: names of any bytes, folders, lists."""
import csv
import io
import os
from urllib.parse import unquote_to_bytes

from command_case import Case, short_song

ODD_NAMES = [
    b"two words.wav",
    b"line\nbreak.wav",
    b"tab\tand \"quotes\", comma.wav",
    b"caf\xc3\xa9.wav",
    b"caf\xe9.wav",  # Latin-1
    b"\xed\xa0\x80 surrogate.wav",
    b"[a,b]",
    b"fd",
    b"back\\slash.wav",
    b"esc\x1b[31mred.wav",
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

    def test_json_and_csv_keep_every_name(self):
        results = self.run_json("--mode", "highlight", *ODD_NAMES)
        self.assertEqual(results[4]["file"], "caf\ufffd.wav")
        self.assertEqual([r["file"] for r in results if "file_bytes" not in r],
                         [name.decode() for name in ODD_NAMES[:4] + ODD_NAMES[6:]])
        done = self.run_tavo("--mode", "highlight", "--format", "csv", *ODD_NAMES)
        text = done.stdout.decode("utf-8", "surrogateescape")
        rows = list(csv.DictReader(io.StringIO(text, newline=""), strict=True))
        self.assertEqual([r["file"].encode("utf-8", "surrogateescape") for r in rows], ODD_NAMES)

    def test_text_stays_one_line_a_name_and_obeys_no_escapes(self):
        done = self.run_tavo("--mode", "highlight", *ODD_NAMES, b"no\nsuch\x1b\xe9", status=1)
        self.assertEqual(done.stderr, rb"tavo: no\nsuch\x1B\xE9: The file does not exist." + b"\n")
        self.assertNotIn(b"\x1b", done.stdout)
        done.stdout.decode("utf-8")
        self.assertEqual(done.stdout.count(b"\n"), 3 * len(ODD_NAMES))
        self.assertIn(rb"line\nbreak.wav", done.stdout)
        self.assertIn(rb"caf\xE9.wav", done.stdout)

    def test_lists_and_folders_hold_them(self):
        self.assertEqual(self.found("-0", "-", input=b"\0".join(ODD_NAMES)), ODD_NAMES)
        self.assertEqual(self.found("."), [b"./" + name for name in sorted(ODD_NAMES)])

    def test_a_dash_and_a_long_path(self):
        self.put("-dash.wav")
        deep = "/".join(["d" * 100] * 7) + "/song.wav"
        self.put(deep)
        self.assertEqual(self.found("--", "-dash.wav", deep), [b"-dash.wav", deep.encode()])


class Places(Inputs):
    def setUp(self):
        super().setUp()
        self.put("music/b.txt")  # a song by its content
        self.put("music/a.wav")
        self.put("music/letter.mp3", b"Dear reader, this is no song. " * 50)
        self.put("music/short", b"x")
        self.put("music/inner/deep/d.wav")
        (self.folder / "music/inner/loop").symlink_to("..")
        (self.folder / "music/link.wav").symlink_to("a.wav")
        (self.folder / "music/broken").symlink_to("nowhere")
        os.mkfifo(self.folder / "music/pipe")

    def test_folders_by_content(self):
        self.assertEqual(self.found("music"), [b"music/a.wav", b"music/b.txt", b"music/link.wav"])
        everything = [b"music/a.wav", b"music/b.txt", b"music/inner/deep/d.wav",
                      b"music/link.wav"]
        self.assertEqual(self.found("--recursive", "music"), everything)
        self.assertEqual(self.found("-r", "-j", "2", "music/"), everything)

    def test_folders_without_audio(self):
        (self.folder / "none/of/them").mkdir(parents=True)
        for arguments in (["none"], ["--recursive", "none"]):
            (result,) = self.run_json(*arguments, status=1)
            self.assertIn("holds no audio files", result["error"])

    def test_lists(self):
        names = b"music/b.txt\n\nmusic/a.wav\nmusic/inner/deep"  # no newline at the end
        expected = [b"music/b.txt", b"music/a.wav", b"music/inner/deep/d.wav"]
        self.assertEqual(self.found("-", input=names), expected)
        self.assertEqual(self.found("--files-from", "-", input=names), expected)
        self.put("list", b"music/a.wav\n")
        self.assertEqual(self.found("music/b.txt", "--files-from", "list"), expected[:2])

    def test_lists_of_nothing(self):
        done = self.run_tavo("--format", "json", "-", input=b"")
        self.assertEqual(done.stdout, b"")
        self.assertIn(b"names no files", done.stderr)
        (result,) = self.run_json("--files-from", "nowhere", status=1)
        self.assertIn("list of files cannot be read", result["error"])
