"""Tests what the command prints: results in every format, reasons for refused files, usage errors."""
import csv
import io
import os
import shlex
import struct
import subprocess

from command_case import AS_ORDINARY_USER, TAVO, Case, standard_song, wav

KEYS = ["file", "mode", "status", "sample_rate", "channels", "duration_ms", "offset_ms"]
BEATS = ["bpm", "beat_count", "beats_ms"]

EMPTY = "--clip --click --report --print --format --output-dir --store --fps --shard --files-from".split()
USAGE = [
    ("", "name at least one"), ("--mode all a.wav", "--mode"), ("--format xml a.wav", "--format"),
    ("--length -1 a.wav", "--length"), ("--length 30.5 a.wav", "'30.5' is not a whole number of seconds"),
    ("--max-beats 99999999999 a.wav", "--max-beats"), ("-j 0 a.wav", "--jobs"), ("--unknown a.wav", "--unknown"),
    ("-0 a.wav", "-0"), ("--output-dir . a.wav", "--format labels"), ("--skip-existing a.wav", "--format labels"),
    ("--skip-existing --force -f labels a.wav", "exclude each other"),
    ("--format labels --output-dir nowhere a.wav", "nowhere"), ("--fps 25 a.wav", "edl, fcpxml and otio"),
    ("--fps 26 -f edl a.wav", "--fps"), ("--print {title} a.wav", "{title} is not a field"),
    ("--print x -f csv a.wav", "replaces --format"),
    ("--click c.wav .", "--click takes exactly one"), ("--click c.wav --mode highlight a.wav", "needs beats"),
    ("--report p --click p a.wav", "name the same file"), ("--click c.wav -", "--click takes exactly one"),
    ("--embed a.wav", "--report"), ("--fade 1 a.wav", "needs --clip"), ("--clip c.mp3 a.wav", "needs --length"),
    ("--clip c.mp3 -l 9 .", "a folder for the clips"), ("--clip c -l 9 a.wav", "an extension"),
    *((f"{name} '' a.wav", f"{name}: the value is empty") for name in EMPTY),
    ("--clip c.mp3 -l 9 --fade 5 a.wav", "at most half"), ("--clip c.mp3 -l 9 --no-ffmpeg a.wav", "needs the ffmpeg"),
    ("--normalize --no-ffmpeg a.wav", "needs the ffmpeg"), ("--normalize -m beats a.wav", "needs a highlight"),
    ("--normalize --store a.db a.wav", "cannot be combined with --store"), ("--store a.db --from-store", "needs --format"),
    *((f"--shard {wrong} a.wav", "--shard") for wrong in ("0/3", "4/3", "1", "a/3", "1/3x", "auto")),
]
REFUSED = {  # file: its content and part of the reason
    "empty.wav": (b"", "it has 0 bytes"),
    "fifteen.wav": (b"RIFF\0\0\0\0WAVEfmt", "too short to be audio: it has 15 bytes"),
    "text.wav": (b"This is a letter, not a song.\n" * 99, "not recognised as audio of a known format. ffmpeg, which may"),
    "24.wav": (wav(bits=24), "not 16-bit integer PCM audio at 8000 to 48000 Hz, which is all that is read."),
    "8.wav": (wav(bits=8, tag=7), "not 16-bit"), "tag.wav": (wav(tag=300), "not 16-bit"), "96k.wav": (wav(rate=96000), "48000 Hz"),
    "1s.wav": (wav(seconds=1.0), "lasts 1.000 s"), "7999.wav": (wav(rate=7999), "7999 Hz"),
    "no-channels.wav": (wav(seconds=0.0)[:22] + b"\0\0" + wav()[24:], "WAV file is damaged or"),
    "no-data.wav": (wav()[:36], "no usable 16-bit integer PCM audio"),
    "lies.wav": (wav(seconds=0.5, data_size=0xFFFFFFFF), "lasts 0.500 s"),
    "long.wav": (wav(seconds=61.0, rate=8000), "The audio lasts 1:01"),
    "silence.wav": (wav(seconds=7.0, sample=b"\0"), "No beats were found"),
    "secret.wav": (wav(), "permission denied"), "closed/in.wav": (wav(), "permission denied"),
    "closed": (None, "permission denied"), "pipe": (None, "device, pipe"), "/dev/zero": (None, "device, pipe"),
    "loop": (None, "symbolic link"), "empty": (None, "no audio files"), "missing": (None, "does not exist"),
}


def clock(ms):
    tenths = round(ms / 100)
    return f"{tenths // 600}:{tenths // 10 % 60:02}.{tenths % 10}"


class Results(Case):
    def test_wrong_usage(self):
        for words, message in USAGE:
            done = self.run_tavo(*shlex.split(words), status=2, message=message.encode(), printed=b"")
            self.assertIn(b"--help", done.stderr)
        self.assert_only()

    def analyse(self, words=""):
        self.put("song.wav", source=standard_song())
        return self.run_json(*words.split(), "song.wav")[0]

    def test_json_of_each_mode(self):
        start = ["hl_pos_ms", "hl_end_ms"]
        for mode, keys in (("highlight", start + ["hl_refined"]), ("beats", BEATS), ("both", start + BEATS)):
            result = self.analyse(f"--mode {mode} --length 12")
            self.assertEqual(list(result), KEYS + keys)
            self.assertEqual([result[key] for key in KEYS], ["song.wav", mode, "ok", 44100, 2, 60000, 0])
            if mode != "beats":
                # In mode both, the highlight of a WAV file is at a whole second.
                self.assertAlmostEqual(result["hl_pos_ms"], 20000, delta=1000)
                self.assertEqual(result["hl_end_ms"], result["hl_pos_ms"] + 12000)
            if mode != "highlight":
                self.assertIn(result["bpm"], (117, 120, 123))  # beat periods are whole numbers of hops
                self.assertTrue(10 < result["beat_count"] == len(result["beats_ms"]))
                few = self.analyse(f"--mode {mode} --max-beats 3")
                self.assertLess(few["beat_count"], result["beat_count"])
        self.assertNotIn("hl_end_ms", few)
        self.assertEqual(self.analyse(), self.analyse("--mode both"))
        self.assertEqual(self.analyse("--length 86400")["hl_end_ms"], 60000)  # at the end of the song

    def test_csv_and_text_have_the_same_results(self):
        result = self.analyse()
        done = self.run_tavo("--format", "csv", "song.wav", "missing, really.wav", status=1)
        rows = list(csv.DictReader(io.StringIO(done.stdout.decode(), newline=""), strict=True))
        self.assertEqual(list(rows[0]), KEYS + ["hl_pos_ms", "hl_end_ms", "hl_refined"] + BEATS + ["cpu_ms", "error"])
        for key in KEYS[:-1] + ["hl_pos_ms", "bpm", "beat_count"]:
            self.assertEqual(rows[0][key], str(result[key]))
        single = struct.Struct(f"{result['beat_count']}f")  # the library stores times in single precision
        self.assertEqual(single.pack(*map(float, rows[0]["beats_ms"].split())), single.pack(*result["beats_ms"]))
        self.assertEqual([rows[1][key] for key in ("file", "status", "bpm", "error")],
                         ["missing, really.wav", "failed", "", "The file does not exist."])
        text = self.run_tavo("song.wav", "missing.wav", status=1).stdout.decode()
        first, last = (clock(result["beats_ms"][i]) for i in (0, -1))
        self.assertEqual(text, f"""song.wav
  stream     1:00.0, 44100 Hz, 2 channels
  highlight  {clock(result['hl_pos_ms'])}
  tempo      {result['bpm']} BPM from the highlight on
  beats      {result['beat_count']}, from {first} to {last}
""")

    def test_coarse_highlight_is_marked(self):
        # At a level of 1/16 the song is too quiet for the refinement, so its highlight is a multiple of 2 s.
        loud = standard_song().read_bytes()
        samples = memoryview(loud[44:]).cast("h")
        for level, refined in ((1, True), (16, False)):
            self.put("a.wav", loud[:44] + struct.pack(f"<{len(samples)}h", *(sample // level for sample in samples)))
            (result,) = self.run_json("--mode", "highlight", "a.wav")
            self.assertEqual((result["hl_refined"], result["hl_pos_ms"] % 2000 != 0), (refined, refined))
            text = self.run_tavo("--mode", "highlight", "a.wav").stdout.decode()
            about = f"highlight  about 0:{result['hl_pos_ms'] // 1000:02} (--normalize refines)\n"
            self.assertEqual(about in text, not refined, text)
            for mode in ("highlight", "both"):
                (raised,) = self.run_json("--mode", mode, "--normalize", "a.wav")
                self.assertEqual(raised.get("hl_normalized", False), not refined)
                if mode == "highlight" or not refined:
                    self.assertAlmostEqual(raised["hl_pos_ms"], 20000, delta=400)
                self.assertTrue(all(beat >= raised["hl_pos_ms"] for beat in raised.get("beats_ms", ())))

    def test_refused_files(self):
        os.mkfifo(self.folder / "pipe")
        (self.folder / "loop").symlink_to("loop")
        (self.folder / "empty").mkdir()
        for name, (content, _) in REFUSED.items():
            if content is not None:
                self.put(name, content)
        (self.folder / "secret.wav").chmod(0)
        (self.folder / "closed").chmod(0)
        self.addCleanup(os.chmod, self.folder / "closed", 0o700)
        done = self.run_tavo("--no-ffmpeg", "--max-minutes", "1", "-f", "json", *REFUSED, status=1, before=AS_ORDINARY_USER)
        messages = done.stderr.decode().splitlines()
        results = self.objects(done.stdout)
        for result, line, (name, (_, message)) in zip(results, messages, REFUSED.items(), strict=True):
            self.assertEqual((result["file"], result["status"], "beats_ms" in result), (name, "failed", False))
            self.assertIn(message, result["error"])
            self.assertRegex(result["error"], r"^[A-Z].*\.$")
            self.assertEqual(line, f"tavo: {name}: {result['error']}")

    def test_notes(self):
        self.put("song.wav")
        for words, message in (("--length 10 --mode beats", b"--length has no effect in mode beats"),
                            ("--max-beats 9 --mode highlight", b"--max-beats has no effect in mode highlight"),
                            ("--click c.wav --force", b"the click track starts at the highlight")):
            self.run_tavo(*words.split(), "song.wav", message=message)
            self.assertEqual(self.run_tavo(*words.split(), "-q", "song.wav").stderr, b"")
        for words, message in (("--help >/dev/full", b"No space left"), ("song.wav >/dev/full", b"cannot be written"),
                            ("song.wav <&- >&-", b"cannot be written")):
            done = subprocess.run(f"'{TAVO}' {words}", shell=True, cwd=self.folder, capture_output=True)
            self.assertEqual(done.returncode, 1, words)
            self.assertIn(message, done.stderr)
