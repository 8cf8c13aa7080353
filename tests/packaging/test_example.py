"""examples/analyze_file.c against the library of this build, on a song whose answers are known."""
import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

MAKE_SONG, ANALYZE_FILE = (os.path.abspath(sys.argv.pop(1)) for _ in range(2))
LOUD_MS = 20000
CURVE_MS = 2000  # the highlight is found on a curve with a point every 2 s, then refined
HIT_MS = 500  # 120 BPM
HIT_TOLERANCE_MS = 50  # two frames of the analysis


class Example(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def run_example(self, *arguments):
        return subprocess.run([ANALYZE_FILE, *arguments], cwd=self.folder, text=True,
                              capture_output=True, check=False)

    def test_song(self):
        subprocess.run([MAKE_SONG, "song.wav", "--seconds", "60", "--bpm", "120", "--loud-at",
                        str(LOUD_MS / 1000)], cwd=self.folder, check=True, capture_output=True)
        done = self.run_example("song.wav")
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        (key, start), *beats = (line.split() for line in done.stdout.splitlines())
        self.assertEqual(key, "highlight")
        self.assertLess(abs(int(start) - LOUD_MS), CURVE_MS)
        self.assertEqual({key for key, _ in beats}, {"beat"})
        times = [float(time) for _, time in beats]
        self.assertEqual(times, sorted(times))
        self.assertGreaterEqual(times[0], int(start))
        on_grid = [t for t in times if abs(t - HIT_MS * round(t / HIT_MS)) < HIT_TOLERANCE_MS]
        self.assertGreater(len(on_grid), 10)
        self.assertGreater(len(on_grid), 0.9 * len(times))
        self.assertEqual(os.listdir(self.folder), ["song.wav"])  # no click track

    def test_unusable(self):
        pathlib.Path(self.folder, "noise").write_bytes(b"no audio at all" * 100)
        for arguments, status in ((["noise"], 1), (["missing"], 1), ([], 2), (["a", "1", "b"], 2)):
            with self.subTest(arguments=arguments):
                done = self.run_example(*arguments)
                self.assertEqual((done.returncode, done.stdout), (status, ""))
                self.assertIn("analyze_file", done.stderr)


if __name__ == "__main__":
    unittest.main()
