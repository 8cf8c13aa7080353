"""What the command says about files that it can use, in every format; wrong usage."""
import csv
import io
import struct

from command_case import LOUD_S, Case, standard_song

KEYS = ["file", "mode", "status", "sample_rate", "channels", "duration_ms"]
HIGHLIGHT = ["hl_pos_ms"]
BEATS = ["bpm", "beat_count", "beats_ms"]


def as_single(times):
    return [struct.unpack("f", struct.pack("f", float(t)))[0] for t in times]


class Results(Case):
    def test_wrong_usage(self):
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
            (["--click", "c.wav", "."], "--click takes exactly one"),
            (["--click", "c.wav", "--mode", "highlight", "a.wav"], "needs beats"),
            (["--plot", "p.svg", "a.wav", "b.wav"], "--plot takes exactly one"),
            (["--plot", "p.svg", "-"], "--plot takes exactly one"),
            (["--plot", "p.svg", "--files-from", "l", "a.wav"], "--plot takes exactly one"),
            (["--plot", "p", "--click", "p", "a.wav"], "name one file"),
        ]
        for arguments, said in cases:
            with self.subTest(arguments=arguments):
                done = self.run_tavo(*arguments, status=2)
                self.assertEqual(done.stdout, b"")
                self.assertIn(said, done.stderr.decode())
                self.assertIn("--help", done.stderr.decode())
        self.assert_only()

    def analyse(self, *arguments):
        self.put("song.wav", source=standard_song())
        (result,) = self.run_json(*arguments, "song.wav")
        return result

    def test_json_of_each_mode(self):
        for mode, keys in (("highlight", HIGHLIGHT), ("beats", BEATS), ("both", HIGHLIGHT + BEATS)):
            with self.subTest(mode=mode):
                result = self.analyse("--mode", mode)
                self.assertEqual(list(result), KEYS + keys)
                self.assertEqual([result[key] for key in KEYS],
                                 ["song.wav", mode, "ok", 44100, 2, 60000])
                start = result.get("hl_pos_ms", 1000 * LOUD_S)
                self.assertAlmostEqual(start, 1000 * LOUD_S, delta=1000)  # whole seconds in WAV
                if mode == "highlight":
                    continue
                self.assertIn(result["bpm"], (117, 120, 123))  # neighbours on the grid of hops
                self.assertGreater(result["beat_count"], 10)
                self.assertEqual(result["beat_count"], len(result["beats_ms"]))
                few = self.analyse("--mode", mode, "--max-beats", "3")
                self.assertLess(few["beat_count"], result["beat_count"])
        self.assertEqual(self.analyse(), result)  # both is what is done unasked

    def test_csv_and_text_say_the_same(self):
        result = self.analyse()
        done = self.run_tavo("--format", "csv", "song.wav", "missing, really.wav", status=1)
        rows = list(csv.DictReader(io.StringIO(done.stdout.decode(), newline=""), strict=True))
        self.assertEqual(list(rows[0]), KEYS + HIGHLIGHT + BEATS + ["error"])
        for key in KEYS + HIGHLIGHT + ["bpm", "beat_count"]:
            self.assertEqual(rows[0][key], str(result[key]))
        self.assertEqual(as_single(rows[0]["beats_ms"].split()), as_single(result["beats_ms"]))
        self.assertEqual(rows[0]["error"], "")
        self.assertEqual([rows[1][key] for key in ("file", "status", "bpm", "error")],
                         ["missing, really.wav", "failed", "", "The file does not exist."])

        done = self.run_tavo("song.wav", "missing.wav", status=1)
        self.assertEqual(done.stderr, b"tavo: missing.wav: The file does not exist.\n")
        text = done.stdout.decode()
        self.assertTrue(text.startswith("song.wav\n"))
        self.assertIn(f"0:{result['hl_pos_ms'] // 1000:02}.{result['hl_pos_ms'] // 100 % 10}", text)
        self.assertIn(f"{result['bpm']} BPM", text)
        self.assertIn(f"{result['beat_count']},", text)
        self.assertNotIn("missing", text)
