"""Tests the installed Python package with real files."""
import contextlib
import functools
import json
import os
import pathlib
import subprocess
import sys
import tempfile
import unittest
import wave
from concurrent.futures import ThreadPoolExecutor

CMAKE, BUILD, SONGS = os.environ["CMAKE"], os.environ["BUILD"], pathlib.Path(os.environ["SONGS"])
ROOT = pathlib.Path(__file__).parents[2]
EXAMPLE = ROOT / "examples" / "beats_against_reference.py"
JAMS = {  # fields that the documentation of JAMS requires
    "required": ["annotations", "file_metadata", "sandbox"],
    "properties": {
        "file_metadata": {"required": ["duration", "jams_version"]},
        "annotations": {"items": {
            "required": ["annotation_metadata", "data", "namespace"],
            "properties": {"data": {"type": "array", "items": {
                "required": ["time", "duration", "value", "confidence"],
                "properties": dict.fromkeys(("time", "duration"), {"type": "number", "minimum": 0})}}}}}}}

prefix = tempfile.TemporaryDirectory()
subprocess.run([CMAKE, "--install", BUILD, "--prefix", prefix.name], check=True, stdout=subprocess.DEVNULL)
packages = f"{prefix.name}/lib/python3/dist-packages"
sys.path.insert(0, packages)
import jsonschema  # noqa: E402
import numpy as np  # noqa: E402
import tavo  # noqa: E402

COMMAND = f"{prefix.name}/bin/tavo"
songs = [str(path) for path in sorted(SONGS.glob("song.*"))]


def run(*words):
    return subprocess.run(words, capture_output=True, text=True, env={**os.environ, "PYTHONPATH": packages})


def run_command(*words):
    return [json.loads(line) for line in run(COMMAND, "--format", "json", *words).stdout.splitlines()]


class Package(unittest.TestCase):
    def setUp(self):
        self.enterContext(contextlib.chdir(self.enterContext(tempfile.TemporaryDirectory())))

    def assert_same(self, result, line):
        self.assertEqual((result.path, result.highlight_ms, result.tempo_bpm, result.duration_s, result.sample_rate),
                         (line["file"], line.get("hl_pos_ms"), line.get("bpm"), line["duration_ms"] / 1000,
                          line["sample_rate"]))
        self.assertEqual(result.beats.dtype, np.float64)
        np.testing.assert_array_equal(result.beats, np.float32(line.get("beats_ms", [])).astype(np.float64) / 1000)

    def test_same_as_the_command(self):
        self.assertGreater(len(songs), 3)
        with ThreadPoolExecutor(3) as pool:  # calls from any thread run one after another
            for mode in ("highlight", "beats", "both"):
                results = pool.map(functools.partial(tavo.analyze, mode=mode), songs)
                for result, line in zip(results, run_command("--mode", mode, *songs), strict=True):
                    self.assert_same(result, line)
        self.assertEqual(os.listdir(), [])  # no click track was written

    def test_arguments_reach_the_library(self):
        (line,) = run_command("--length", "10", "--max-beats", "3", songs[0])
        result = tavo.analyze(pathlib.Path(songs[0]), mode="both", length=10, max_beats=3)
        self.assert_same(result, line)
        self.assertNotEqual(len(result.beats), len(tavo.analyze(songs[0]).beats))
        self.assert_same(next(tavo.analyze_many([songs[0]], "both", 10, 3)), line)
        for wrong in ({"mode": "all"}, {"length": -1}, {"max_beats": 1 << 31}):
            with self.assertRaises(ValueError):
                tavo.analyze(songs[0], **wrong)

    def test_failures_have_a_reason(self):
        pathlib.Path("notes.txt").write_text("no music here, but more than a few bytes of it\n")
        stereo = np.zeros((44100, 2))
        for song, rate, reason in (("notes.txt", None, "The format is unknown or not supported."),
                                   ("missing.wav", None, "The file cannot be opened or has no audio stream."),
                                   (stereo, 44100, "The audio lasts 1 s or less."),
                                   (np.zeros(44100), 4000, "The sample rate is below 8000 Hz."),
                                   (np.zeros(88200), 44100, "No beats were found")):
            with self.subTest(reason=reason), self.assertRaises(tavo.TavoError) as caught:
                tavo.analyze(song, rate)
            self.assertIn(reason, str(caught.exception))
            self.assertEqual(caught.exception.path, song if rate is None else "")
        for samples in (np.zeros((2, 2, 2)), np.zeros(0), np.zeros(9, np.int32), np.array([np.nan])):
            self.assertRaises(ValueError, tavo.analyze, samples, 44100)
        self.assertRaises(ValueError, tavo.analyze, stereo)

    def test_samples_give_the_result_of_their_file(self):
        (song,) = (name for name in songs if name.endswith("song.wav"))
        with wave.open(song) as file:
            rate, frames = file.getframerate(), file.readframes(file.getnframes())
            pcm = np.frombuffer(frames, "<i2").reshape(-1, file.getnchannels())
        expected = tavo.analyze(song)
        for samples in (pcm, pcm / 32768.0, np.float32(pcm / 32768.0)):
            result = tavo.analyze(samples, rate)
            self.assertEqual((result.path, result.highlight_ms, result.tempo_bpm, result.duration_s, result.sample_rate),
                             ("", *[*vars(expected).values()][1:2], *[*vars(expected).values()][3:]))
            np.testing.assert_allclose(result.beats, expected.beats, atol=1e-3)
        np.testing.assert_array_equal(tavo.analyze(pcm, rate).beats, expected.beats)

    def test_forms_of_a_result(self):
        result = tavo.analyze(songs[0])
        self.assertEqual(len({result, tavo.analyze(songs[0]), tavo.analyze(songs[0], mode="beats")}), 2)
        self.assertEqual(json.loads(json.dumps(result.to_dict())), {**vars(result), "beats": [*result.beats]})
        np.testing.assert_allclose([float(line) for line in result.to_mirex().splitlines()], result.beats, atol=1e-6)
        for mode, namespaces in (("highlight", ["tag_open"]), ("beats", ["beat", "tempo"]),
                                 ("both", ["beat", "tempo", "tag_open"])):
            jams = json.loads(json.dumps(tavo.analyze(songs[0], mode=mode).to_jams()))
            jsonschema.validate(jams, JAMS)
            self.assertEqual([annotation["namespace"] for annotation in jams["annotations"]], namespaces)

    def test_types(self):
        checked = run(sys.executable, "-m", "mypy", "--strict", "--cache-dir", os.getcwd(), ROOT / "python/tavo")
        self.assertEqual((checked.returncode, checked.stderr), (0, ""), checked.stdout)

    def test_many(self):
        pathlib.Path("broken.wav").write_bytes(b"RIFF" + bytes(100))
        odd = os.fsencode(os.getcwd()) + b"/\xff name.wav"
        os.symlink(songs[0], odd)
        paths = [songs[0], "broken.wav", odd, songs[1]]
        steps = []
        first, broken, same, other = tavo.analyze_many(paths, jobs=2, progress=lambda *step: steps.append(step))
        self.assertEqual(steps, [(k, 4) for k in (1, 2, 3, 4)])
        self.assertEqual([end.path for end in (first, broken, same, other)], [os.fsdecode(path) for path in paths])
        self.assertIsInstance(broken, tavo.TavoError)
        np.testing.assert_array_equal(first.beats, same.beats)
        for result, line in zip((first, other), run_command(*songs[:2]), strict=True):
            self.assert_same(result, line)
        next(tavo.analyze_many(songs)).path  # the command ends although not all results are read

    def test_module_is_the_command(self):
        for words in (["--version"], ["missing.wav"]):
            module, command = run(sys.executable, "-m", "tavo", *words), run(COMMAND, *words)
            self.assertEqual(vars(module) | {"args": words}, vars(command) | {"args": words})

    def test_example(self):
        beats = tavo.analyze(songs[0], mode="beats").beats
        for given, expected in ((beats, "precision 1.000  recall 1.000  F-measure 1.000"),
                                (beats[::2] + 0.08, "precision 0.000  recall 0.000")):
            np.savetxt("beats.txt", given)
            self.assertIn(expected, run(sys.executable, EXAMPLE, songs[0], "beats.txt").stdout)
