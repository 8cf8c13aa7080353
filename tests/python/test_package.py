"""The installed Python package, with real files. Arguments by environment: CMAKE, BUILD, SONGS."""
import json
import os
import pathlib
import subprocess
import sys
import tempfile
import threading
import unittest

CMAKE, BUILD, SONGS = os.environ["CMAKE"], os.environ["BUILD"], pathlib.Path(os.environ["SONGS"])
EXAMPLE = pathlib.Path(__file__).parents[2] / "examples" / "beats_against_reference.py"

prefix = tempfile.TemporaryDirectory()
subprocess.run([CMAKE, "--install", BUILD, "--prefix", prefix.name], check=True, stdout=subprocess.DEVNULL)
packages = f"{prefix.name}/lib/python3/dist-packages"
sys.path.insert(0, packages)
import numpy as np  # noqa: E402
import tavo  # noqa: E402

COMMAND = f"{prefix.name}/bin/tavo"
songs = [str(path) for path in sorted(SONGS.glob("song.*"))]


def by_command(*words):
    done = subprocess.run([COMMAND, "--format", "json", *words], capture_output=True, text=True)
    return [json.loads(line) for line in done.stdout.splitlines()]


class Package(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.TemporaryDirectory()
        self.addCleanup(self.folder.cleanup)
        os.chdir(self.folder.name)

    def same(self, result, told):
        self.assertEqual(result.path, told["file"])
        self.assertEqual(result.highlight_ms, told.get("hl_pos_ms"))
        self.assertEqual(result.tempo_bpm, told.get("bpm"))
        self.assertEqual(result.duration_s, told["duration_ms"] / 1000)
        self.assertEqual(result.sample_rate, told["sample_rate"])
        self.assertEqual(result.beats.dtype, np.float64)
        expected = np.float32(told.get("beats_ms", [])).astype(np.float64) / 1000
        np.testing.assert_array_equal(result.beats, expected)

    def test_same_as_the_command(self):
        self.assertGreater(len(songs), 3)
        for mode in ("highlight", "beats", "both"):
            told = by_command("--mode", mode, *songs)
            for song, one in zip(songs, told):
                with self.subTest(mode=mode, song=song):
                    self.same(tavo.analyze(song, mode=mode), one)
        self.assertEqual(os.listdir(), [])  # no click track

    def test_arguments_reach_the_library(self):
        (told,) = by_command("--length", "10", "--max-beats", "3", songs[0])
        result = tavo.analyze(pathlib.Path(songs[0]), "both", 10, 3)
        self.same(result, told)
        self.assertNotEqual(len(result.beats), len(tavo.analyze(songs[0]).beats))
        for wrong in ({"mode": "all"}, {"length": -1}, {"max_beats": 1 << 31}):
            with self.assertRaises(ValueError):
                tavo.analyze(songs[0], **wrong)

    def test_failures_are_told_in_the_commands_words(self):
        text = pathlib.Path("notes.txt")
        text.write_text("no music here, but more than a few bytes of it\n")
        for path in (text, pathlib.Path("missing.wav")):
            with self.subTest(path=path), self.assertRaises(tavo.TavoError) as caught:
                tavo.analyze(path)
            self.assertEqual(str(caught.exception), by_command(str(path))[0]["error"])
            self.assertEqual(caught.exception.path, str(path))

    def test_threads_take_turns(self):
        results = {}
        threads = [threading.Thread(target=lambda song=song: results.update({song: tavo.analyze(song)}))
                   for song in songs[:3]]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join(120)
        self.assertEqual(sorted(results), songs[:3])

    def test_many(self):
        pathlib.Path("broken.wav").write_bytes(b"RIFF" + bytes(100))
        odd = os.fsencode(self.folder.name) + b"/\xff name.wav"
        os.symlink(songs[0], odd)
        paths = [songs[0], "broken.wav", odd, songs[1]]
        steps = []
        ends = list(tavo.analyze_many(paths, jobs=2, progress=lambda *step: steps.append(step)))
        self.assertEqual(steps, [(k, 4) for k in (1, 2, 3, 4)])
        self.assertEqual([end.path for end in ends], [os.fsdecode(path) for path in paths])
        self.assertIsInstance(ends[1], tavo.TavoError)
        np.testing.assert_array_equal(ends[0].beats, ends[2].beats)
        self.assertEqual(ends[3].tempo_bpm, tavo.analyze(songs[1]).tempo_bpm)
        next(tavo.analyze_many(songs)).path  # left early: the command ends too

    def run_python(self, *words):
        return subprocess.run([sys.executable, *words], capture_output=True, text=True,
                              env={**os.environ, "PYTHONPATH": packages})

    def test_module_is_the_command(self):
        for words in (["--version"], ["missing.wav"]):
            module = self.run_python("-m", "tavo", *words)
            command = subprocess.run([COMMAND, *words], capture_output=True, text=True)
            self.assertEqual((module.returncode, module.stdout, module.stderr),
                             (command.returncode, command.stdout, command.stderr))

    def test_example(self):
        beats = tavo.analyze(songs[0], mode="beats").beats
        np.savetxt("all.txt", beats)
        np.savetxt("moved.txt", beats[::2] + 0.08)
        exact = self.run_python(str(EXAMPLE), songs[0], "all.txt")
        self.assertIn("precision 1.000  recall 1.000  F-measure 1.000", exact.stdout, exact.stderr)
        self.assertIn("precision 0.000  recall 0.000", self.run_python(str(EXAMPLE), songs[0], "moved.txt").stdout)


if __name__ == "__main__":
    unittest.main()
