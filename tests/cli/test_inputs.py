"""Which files are analysed: names of any bytes, folders, lists."""
import csv
import io
import os
import subprocess
from urllib.parse import unquote_to_bytes

from command_case import TAVO, Case, main, short_song

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


class Names(Case):
    def setUp(self):
        super().setUp()
        for name in ODD_NAMES:
            with open(os.path.join(os.fsencode(self.folder), name), "wb") as file:
                file.write(short_song().read_bytes())

    def names_in(self, results):
        return [unquote_to_bytes(r["file_bytes"]) if "file_bytes" in r else r["file"].encode()
                for r in results]

    def test_json_keeps_every_name(self):
        results = self.run_json("--mode", "highlight", *ODD_NAMES)
        self.assertEqual(self.names_in(results), ODD_NAMES)
        self.assertEqual(results[4]["file"], "caf\ufffd.wav")
        self.assertEqual(sum("file_bytes" in r for r in results), 2)
        self.assertEqual({r["status"] for r in results}, {"ok"})

    def test_csv_keeps_every_name(self):
        done = self.run_tavo("--mode", "highlight", "--format", "csv", *ODD_NAMES)
        text = done.stdout.decode("utf-8", "surrogateescape")
        rows = list(csv.DictReader(io.StringIO(text, newline=""), strict=True))
        self.assertEqual([r["file"].encode("utf-8", "surrogateescape") for r in rows], ODD_NAMES)

    def test_text_stays_one_line_a_name_and_obeys_no_escapes(self):
        done = self.run_tavo("--mode", "highlight", *ODD_NAMES)
        self.assertNotIn(b"\x1b", done.stdout)
        done.stdout.decode("utf-8")
        self.assertEqual(done.stdout.count(b"\n"), 3 * len(ODD_NAMES))
        self.assertIn(rb"line\nbreak.wav", done.stdout)
        self.assertIn(rb"caf\xE9.wav", done.stdout)

    def test_messages_too(self):
        done = self.run_tavo(b"no\nsuch\x1b\xe9", status=1)
        self.assertEqual(done.stderr, rb"tavo: no\nsuch\x1B\xE9: The file does not exist." + b"\n")

    def test_a_list_with_nul(self):
        results = self.run_json("--mode", "highlight", "-0", "-", input=b"\0".join(ODD_NAMES))
        self.assertEqual(self.names_in(results), ODD_NAMES)

    def test_the_folder_holds_them_in_order(self):
        results = self.run_json("--mode", "highlight", ".")
        self.assertEqual(self.names_in(results), [b"./" + n for n in sorted(ODD_NAMES)])

    def test_a_dash_and_a_long_path(self):
        self.put("-dash.wav")
        deep = "/".join(["d" * 100] * 7)
        self.put(f"{deep}/song.wav")
        results = self.run_json("--mode", "highlight", "--", "-dash.wav", f"{deep}/song.wav")
        self.assertEqual([r["status"] for r in results], ["ok", "ok"])
        self.assertEqual(results[1]["file"], f"{deep}/song.wav")


class Folders(Case):
    def setUp(self):
        super().setUp()
        self.put("music/b.txt")  # a song by its content
        self.put("music/a.wav")
        self.put("music/letter.mp3", b"Dear reader, this is no song. " * 50)
        self.put("music/short", b"x")
        self.put("music/inner/c.wav")
        self.put("music/inner/deep/d.wav")
        (self.folder / "music/inner/loop").symlink_to("..")
        (self.folder / "music/link.wav").symlink_to("a.wav")
        (self.folder / "music/broken").symlink_to("nowhere")
        os.mkfifo(self.folder / "music/pipe")

    def found(self, *arguments, **options):
        return [r["file"] for r in self.run_json("--mode", "highlight", *arguments, **options)]

    def test_by_content(self):
        self.assertEqual(self.found("music"),
                         ["music/a.wav", "music/b.txt", "music/link.wav"])

    def test_recursive(self):
        expected = ["music/a.wav", "music/b.txt", "music/inner/c.wav", "music/inner/deep/d.wav",
                    "music/link.wav"]
        self.assertEqual(self.found("--recursive", "music"), expected)
        self.assertEqual(self.found("-r", "-j", "2", "music/"), expected)

    def test_without_audio(self):
        (self.folder / "none/of/them").mkdir(parents=True)
        for arguments in (["none"], ["--recursive", "none"]):
            (result,) = self.run_json(*arguments, status=1)
            self.assertIn("holds no audio files", result["error"])


class Lists(Case):
    def setUp(self):
        super().setUp()
        for name in ("a.wav", "b.wav", "dir/c.wav"):
            self.put(name)

    def found(self, *arguments, **options):
        return [r["file"] for r in self.run_json("--mode", "highlight", *arguments, **options)]

    def test_standard_input(self):
        names = b"b.wav\n\na.wav\ndir"  # an empty line, no newline at the end, a folder
        self.assertEqual(self.found("-", input=names), ["b.wav", "a.wav", "dir/c.wav"])
        self.assertEqual(self.found("--files-from", "-", input=names),
                         ["b.wav", "a.wav", "dir/c.wav"])

    def test_a_file_and_names_beside_it(self):
        self.put("list", b"a.wav\n")
        self.assertEqual(self.found("b.wav", "--files-from", "list"), ["b.wav", "a.wav"])

    def test_an_empty_list(self):
        done = self.run_tavo("--format", "json", "-", input=b"")
        self.assertEqual(done.stdout, b"")
        self.assertIn(b"names no files", done.stderr)

    def test_a_missing_list(self):
        (result,) = self.run_json("--files-from", "nowhere", status=1)
        self.assertIn("list of files cannot be read", result["error"])

    def test_through_a_shell(self):
        done = subprocess.run(
            f"find . -name '*.wav' -print0 | sort -z | '{TAVO}' -0 --format csv -m highlight - | wc -l",
            shell=True, cwd=self.folder, capture_output=True, check=True)
        self.assertEqual((done.stdout.strip(), done.stderr), (b"4", b""))


if __name__ == "__main__":
    main()
