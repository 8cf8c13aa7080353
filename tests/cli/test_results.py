"""What the command says about files that it can use, in every format."""
import csv
import io
import struct

from command_case import HIT_GRID_S, LOUD_S, TAVO, Case, main, short_song, standard_song

KEYS = ["file", "mode", "status", "sample_rate", "channels", "duration_ms"]
HIGHLIGHT = ["hl_pos_ms"]
BEATS = ["bpm", "beat_count", "beats_ms"]


class Usage(Case):
    def test_wrong_usage(self):
        self.put("a.wav")
        self.put("b.wav")
        cases = [
            ([], "name at least one"),
            (["--mode", "all", "a.wav"], "--mode"),
            (["--length", "-1", "a.wav"], "--length"),
            (["--length", "ten", "a.wav"], "--length"),
            (["--max-beats", "99999999999", "a.wav"], "--max-beats"),
            (["--format", "xml", "a.wav"], "--format"),
            (["-j", "0", "a.wav"], "--jobs"),
            (["--unknown", "a.wav"], "--unknown"),
            (["-0", "a.wav"], "-0"),
            (["--output-dir", ".", "a.wav"], "--format labels"),
            (["--format", "labels", "--output-dir", "nowhere", "a.wav"], "nowhere"),
            (["--click", "c.wav", "a.wav", "b.wav"], "exactly one"),
            (["--click", "c.wav", "."], "exactly one"),
            (["--click", "c.wav", "--mode", "highlight", "a.wav"], "needs beats"),
        ]
        for arguments, said in cases:
            with self.subTest(arguments=arguments):
                done = self.run_tavo(*arguments, status=2)
                self.assertEqual(done.stdout, b"")
                self.assertIn(said, done.stderr.decode())
                self.assertIn("--help", done.stderr.decode())

    def test_help_and_version(self):
        done = self.run_tavo("--help")
        self.assertEqual(done.stderr, b"")
        for word in (b"--mode", b"--recursive", b"--files-from", b"130"):
            self.assertIn(word, done.stdout)
        self.assertRegex(self.run_tavo("--version").stdout, rb"^tavo \d+\.\d+\.\d+\n$")


class Formats(Case):
    def setUp(self):
        super().setUp()
        self.put("song.wav", source=standard_song())

    def test_json_of_each_mode(self):
        for mode, keys in (("highlight", HIGHLIGHT), ("beats", BEATS), ("both", HIGHLIGHT + BEATS)):
            with self.subTest(mode=mode):
                (result,) = self.run_json("--mode", mode, "song.wav")
                self.assertEqual(list(result), KEYS + keys)
                self.assertEqual([result[key] for key in KEYS],
                                 ["song.wav", mode, "ok", 44100, 2, 60000])
        self.assertEqual(self.run_json("song.wav"), self.run_json("--mode", "both", "song.wav"))

    def test_highlight_is_where_the_song_gets_loud(self):
        (result,) = self.run_json("--mode", "highlight", "song.wav")
        self.assertLessEqual(abs(result["hl_pos_ms"] - 1000 * LOUD_S), 400)

    def test_beats_and_tempo(self):
        (result,) = self.run_json("--mode", "beats", "song.wav")
        self.assertIn(result["bpm"], (117, 120, 123))  # neighbours on the grid of whole hops
        times = result["beats_ms"]
        self.assertEqual(result["beat_count"], len(times))
        self.assertEqual(times, sorted(times))
        self.assertGreater(len(times), 10)
        hop = 256 / 11025
        near = [t for t in times
                if abs((t / 1000 + HIT_GRID_S / 2) % HIT_GRID_S - HIT_GRID_S / 2) <= 2 * hop]
        self.assertGreater(len(near), 0.9 * len(times))  # a step of the loudness is a beat too

    def test_both_starts_at_the_highlight(self):
        (result,) = self.run_json("song.wav")
        self.assertLessEqual(abs(result["hl_pos_ms"] - 1000 * LOUD_S), 1000)  # whole seconds in WAV
        self.assertGreaterEqual(min(result["beats_ms"]), result["hl_pos_ms"])

    def test_max_beats(self):
        (free,) = self.run_json("--mode", "beats", "song.wav")
        (few,) = self.run_json("--mode", "beats", "--max-beats", "3", "song.wav")
        self.assertLess(few["beat_count"], free["beat_count"])

    def test_csv_says_the_same(self):
        (result,) = self.run_json("song.wav")
        done = self.run_tavo("--format", "csv", "song.wav", "missing, really.wav", status=1)
        rows = list(csv.DictReader(io.StringIO(done.stdout.decode(), newline=""), strict=True))
        self.assertEqual(len(rows), 2)
        self.assertEqual(list(rows[0]), KEYS + HIGHLIGHT + BEATS + ["error"])
        for key in KEYS + HIGHLIGHT + ["bpm", "beat_count"]:
            self.assertEqual(rows[0][key], str(result[key]))
        as_single = [struct.unpack("f", struct.pack("f", float(t)))[0]
                     for t in rows[0]["beats_ms"].split()]
        expected = [struct.unpack("f", struct.pack("f", t))[0] for t in result["beats_ms"]]
        self.assertEqual(as_single, expected)
        self.assertEqual((rows[0]["error"], rows[1]["file"]), ("", "missing, really.wav"))
        self.assertEqual((rows[1]["status"], rows[1]["error"], rows[1]["bpm"]),
                         ("failed", "The file does not exist.", ""))

    def test_text_names_what_was_found(self):
        (result,) = self.run_json("song.wav")
        done = self.run_tavo("song.wav")
        text = done.stdout.decode()
        self.assertEqual(done.stderr, b"")
        self.assertTrue(text.startswith("song.wav\n"))
        self.assertIn(f"0:{result['hl_pos_ms'] // 1000:02}.{result['hl_pos_ms'] // 100 % 10}", text)
        self.assertIn(f"{result['bpm']} BPM", text)
        self.assertIn(f"{result['beat_count']},", text)

    def test_the_same_on_every_run(self):
        first = self.run_tavo("--format", "json", "song.wav").stdout
        for _ in range(3):
            self.assertEqual(self.run_tavo("--format", "json", "song.wav").stdout, first)


class Click(Case):
    def test_click_track(self):
        song = self.put("song.wav", source=standard_song())
        before = song.read_bytes()
        self.run_tavo("--click", "click.wav", "song.wav")
        track = (self.folder / "click.wav").read_bytes()
        self.assertEqual(track[:4] + track[8:12], b"RIFFWAVE")
        self.assertEqual(struct.unpack("<I", track[40:44])[0], len(track) - 44)
        self.assertGreater(max(struct.unpack(f"<{(len(track) - 44) // 2}h", track[44:])), 3000)
        self.assertEqual(sorted(p.name for p in self.folder.iterdir()), ["click.wav", "song.wav"])
        self.assertEqual(song.read_bytes(), before)

    def test_no_file_unless_asked(self):
        self.put("song.wav")
        self.run_tavo("song.wav")
        self.assertEqual([p.name for p in self.folder.iterdir()], ["song.wav"])

    def test_places_that_cannot_be_written(self):
        song = self.put("song.wav")
        before = song.read_bytes()
        for place in ("nowhere/click.wav", "song.wav", "."):
            with self.subTest(place=place):
                (result,) = self.run_json("--click", place, "song.wav", status=1)
                self.assertIn("click", result["error"])
        self.assertEqual(song.read_bytes(), before)
        self.assertEqual([p.name for p in self.folder.iterdir()], ["song.wav"])

    def test_a_full_disk(self):
        self.put("song.wav")
        done = self.run_tavo_with_file_limit("--format", "json", "--click", "click.wav", "song.wav")
        (result,) = self.objects(done.stdout)
        self.assertIn("could not be written whole", result["error"])
        self.assertEqual([p.name for p in self.folder.iterdir()], ["song.wav"])

    def run_tavo_with_file_limit(self, *arguments):
        import resource
        import subprocess
        limit = lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (4096, 4096))
        done = subprocess.run([TAVO, *arguments], capture_output=True, cwd=self.folder,
                              preexec_fn=limit)
        self.assertEqual(done.returncode, 1, done.stderr)
        return done


if __name__ == "__main__":
    main()
