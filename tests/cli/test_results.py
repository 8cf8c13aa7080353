"""What the command says in every format: results, refused files, wrong usage."""
import csv
import io
import os
import struct
import subprocess

from command_case import AS_ORDINARY_USER, LOUD_S, TAVO, Case, standard_song, wav

KEYS = ["file", "mode", "status", "sample_rate", "channels", "duration_ms"]
BEATS = ["bpm", "beat_count", "beats_ms"]
ASF = bytes.fromhex("3026b2758e66cf11a6d900aa0062ce6c")

USAGE = [
    ("", "name at least one"), ("--mode all a.wav", "--mode"), ("--format xml a.wav", "--format"),
    ("--length -1 a.wav", "'-1' is not a whole number of seconds"),
    ("--length 30.5 a.wav", "'30.5' is not a whole number of seconds"),
    ("--max-beats 99999999999 a.wav", "--max-beats"), ("-j 0 a.wav", "--jobs"),
    ("--unknown a.wav", "--unknown"), ("-0 a.wav", "-0"), ("--output-dir . a.wav", "--format labels"),
    ("--skip-existing a.wav", "--format labels"),
    ("--skip-existing --force -f labels a.wav", "exclude each other"),
    ("--format labels --output-dir nowhere a.wav", "nowhere"), ("--fps 25 a.wav", "edl and fcpxml"),
    ("--fps 26 -f edl a.wav", "--fps"), ("--format cue a.wav", "give both"),
    ("--click c.wav .", "--click takes exactly one"),
    ("--click c.wav --mode highlight a.wav", "needs beats"),
    ("--plot p.svg a.wav b.wav", "--plot takes exactly one"), ("--plot p.svg -", "--plot takes exactly one"),
    ("--plot p --click p a.wav", "name one file"),
]
REFUSED = {  # content, a part of the sentence
    "empty.wav": (b"", "empty"),
    "fifteen.wav": (b"RIFF\0\0\0\0WAVEfmt", "too short to be audio: it has 15 bytes"),
    "text.wav": (b"This is a letter, not a song.\n" * 99, "not recognised"),
    "movie.wma": (ASF + bytes(500), "ASF (Windows Media), a format that is refused. ffmpeg -i"),
    "24.wav": (wav(bits=24), "24-bit samples. Only 16-bit integer PCM at up to 48000 Hz is read from WAV; "
                             "ffmpeg -i FILE -c:a pcm_s16le -ar 44100 NEW.wav converts it."),
    "float.wav": (wav(bits=32, tag=3), "32-bit floating-point"),
    "alaw.wav": (wav(bits=8, tag=6), "format tag 6"),
    "96k.wav": (wav(rate=96000), "96000 Hz"),
    "1s.wav": (wav(seconds=1.0), "lasts 1.000 s"),
    "7999.wav": (wav(rate=7999), "7999 Hz"),
    "no-channels.wav": (wav(seconds=0.0)[:22] + b"\0\0" + wav()[24:], "0 channels"),
    "no-data.wav": (wav()[:36], "no usable audio stream"),
    "lies.wav": (wav(seconds=0.5, data_size=0xFFFFFFFF), "lasts 0.500 s"),
    "silence.wav": (wav(seconds=7.0, sample=b"\0"), "No beats were found"),
}


class Results(Case):
    def test_wrong_usage(self):
        for words, said in USAGE:
            done = self.run_tavo(*words.split(), status=2)
            self.assertEqual(done.stdout, b"", words)
            self.assertIn(said, done.stderr.decode())
            self.assertIn("--help", done.stderr.decode())
        self.assert_only()

    def analyse(self, *arguments):
        self.put("song.wav", source=standard_song())
        return self.run_json(*arguments, "song.wav")[0]

    def test_json_of_each_mode(self):
        start = ["hl_pos_ms", "hl_end_ms"]
        for mode, keys in (("highlight", start + ["hl_refined"]), ("beats", BEATS), ("both", start + BEATS)):
            result = self.analyse("--mode", mode, "--length", "12")
            self.assertEqual(list(result), KEYS + keys)
            self.assertEqual([result[key] for key in KEYS], ["song.wav", mode, "ok", 44100, 2, 60000])
            if mode != "beats":
                # In mode both a WAV file's highlight moves to a whole second.
                self.assertAlmostEqual(result["hl_pos_ms"], 1000 * LOUD_S, delta=1000)
                self.assertEqual(result["hl_end_ms"], result["hl_pos_ms"] + 12000)
            if mode != "highlight":
                self.assertIn(result["bpm"], (117, 120, 123))  # neighbours on the grid of hops
                self.assertTrue(10 < result["beat_count"] == len(result["beats_ms"]))
                few = self.analyse("--mode", mode, "--max-beats", "3")
                self.assertLess(few["beat_count"], result["beat_count"])
        self.assertNotIn("hl_end_ms", few)
        self.assertEqual(self.analyse(), self.analyse("--mode", "both"))
        late = self.analyse("--length", "86400")  # the end is that of the song
        self.assertEqual(late["hl_end_ms"], late["duration_ms"])

    def test_csv_and_text_say_the_same(self):
        result = self.analyse()
        done = self.run_tavo("--format", "csv", "song.wav", "missing, really.wav", status=1)
        rows = list(csv.DictReader(io.StringIO(done.stdout.decode(), newline=""), strict=True))
        self.assertEqual(list(rows[0]), KEYS + ["hl_pos_ms", "hl_end_ms", "hl_refined"] + BEATS + ["cpu_ms", "error"])
        for key in KEYS + ["hl_pos_ms", "bpm", "beat_count"]:
            self.assertEqual(rows[0][key], str(result[key]))
        single = struct.Struct(f"{result['beat_count']}f")  # the library's own precision
        self.assertEqual(single.pack(*map(float, rows[0]["beats_ms"].split())), single.pack(*result["beats_ms"]))
        self.assertEqual([rows[1][key] for key in ("file", "status", "bpm", "error")],
                         ["missing, really.wav", "failed", "", "The file does not exist."])
        text = self.run_tavo("song.wav", "missing.wav", status=1).stdout.decode()
        self.assertRegex(text, rf"^song.wav\n.*\n  highlight  0:{result['hl_pos_ms'] // 1000}\.\d\n  tempo      "
                               rf"{result['bpm']} BPM from the highlight on\n  beats      {result['beat_count']}, .*\n$")

    def test_a_coarse_highlight_is_called_so(self):
        # A song too quiet for the refinement: a point of the curve with a value each 2 s.
        loud = standard_song().read_bytes()
        samples = memoryview(loud[44:]).cast("h")
        self.put("quiet.wav", loud[:44] + struct.pack(f"<{len(samples)}h", *(s // 16 for s in samples)))
        self.put("loud.wav", loud)
        for name, refined in (("loud.wav", True), ("quiet.wav", False)):
            (result,) = self.run_json("--mode", "highlight", name)
            self.assertEqual((result["hl_refined"], result["hl_pos_ms"] % 2000 != 0), (refined, refined))
            text = self.run_tavo("--mode", "highlight", name).stdout.decode()
            self.assertEqual(f"highlight  about 0:{result['hl_pos_ms'] // 1000:02}\n" in text, not refined, text)

    def test_refused_files(self):
        for name, (content, said) in REFUSED.items():
            self.put(name, content)
            done = self.run_tavo("--format", "json", name, status=1)
            (result,) = self.objects(done.stdout)
            self.assertEqual((result["file"], result["status"]), (name, "failed"))
            self.assertIn(said, result["error"])
            self.assertRegex(result["error"], r"^[A-Z].*\.$")
            self.assertEqual(done.stderr.decode(), f"tavo: {name}: {result['error']}\n")
            self.assertNotIn("beats_ms", result)

    def test_no_files(self):
        os.mkfifo(self.folder / "pipe")
        (self.folder / "loop").symlink_to("loop")
        (self.folder / "empty").mkdir()
        self.put("closed/in.wav")
        os.chmod(self.put("secret.wav"), 0)
        os.chmod(self.folder / "closed", 0)
        self.addCleanup(os.chmod, self.folder / "closed", 0o700)
        expected = {"pipe": "device, pipe", "/dev/zero": "device, pipe", "loop": "symbolic link",
                    "empty": "no audio files", "missing": "does not exist", "secret.wav": "permission denied",
                    "closed": "permission denied", "closed/in.wav": "permission denied"}
        results = self.run_json(*expected, status=1, before=AS_ORDINARY_USER)
        for result, (name, words) in zip(results, expected.items(), strict=True):
            self.assertEqual(result["file"], name)
            self.assertIn(words, result["error"])

    def test_notes(self):
        self.put("song.wav")
        for words, said in (("--length 10 --mode beats", b"--length has no effect in mode beats"),
                            ("--max-beats 9 --mode highlight", b"--max-beats has no effect in mode highlight"),
                            ("--click c.wav --force", b"the click track starts at the highlight")):
            self.assertIn(said, self.run_tavo(*words.split(), "song.wav").stderr)
            self.assertEqual(self.run_tavo(*words.split(), "-q", "song.wav").stderr, b"")
        for words, said in (("--help >/dev/full", b"No space left"), ("song.wav >/dev/full", b"cannot be written"),
                            ("song.wav >&-", b"cannot be written")):
            done = subprocess.run(f"'{TAVO}' {words}", shell=True, cwd=self.folder, capture_output=True)
            self.assertEqual(done.returncode, 1, words)
            self.assertIn(said, done.stderr)
