"""Results in a database: once each, whatever happens, and the same as without."""
import json
import os
import random
import sqlite3
import subprocess
import time

from command_case import TAVO, Case, short_song

KEYS = ("status", "sample_rate", "channels", "duration_ms", "hl_pos_ms", "bpm", "beats_ms")


class Store(Case):
    def rows(self, name="x.db", where=""):
        with sqlite3.connect(self.folder / name) as db:
            db.row_factory = sqlite3.Row
            return {row["path"]: dict(row) for row in db.execute(f"SELECT * FROM songs {where}")}

    def put_songs(self, count):
        names = [f"song {i}.wav" for i in range(count)]
        for i, name in enumerate(names):
            self.put(name, source=short_song(seed=i % 5))
        return names

    def assert_same(self, row, result):
        self.assertEqual(row["sentence"], result.get("error"))
        for key in KEYS:
            value = row[key] if key != "beats_ms" or row[key] is None else json.loads(row[key])
            self.assertEqual(value, result.get(key), key)

    def test_rows_equal_results(self):
        odd = os.fsdecode(b"odd \xff.wav")
        self.put("a.wav")
        self.put(odd, source=short_song(seed=3))
        self.put("text.wav", content=b"no music, but as long as a head\n" * 4)
        names = ["a.wav", odd, "text.wav"]
        results = self.run_json("--length", "5", *names, status=1)
        done = self.run_tavo("--store", "x.db", "--length", "5", *names, status=1)
        self.assertEqual(done.stdout, b"")
        self.assertIn(b"3 stored", done.stderr)
        rows = self.rows()
        self.assertEqual(sorted(rows), sorted(os.fsencode(name) for name in names))
        for name, result in zip(names, results):
            row = rows[os.fsencode(name)]
            self.assert_same(row, result)
            state = os.stat(self.folder / name)
            self.assertEqual((row["size"], row["mtime_ns"]), (state.st_size, state.st_mtime_ns))
            self.assertEqual((row["mode"], row["length_s"], row["max_beats"]), ("both", 5, 0))
        done = self.run_tavo("--store", "sqlite:x.db", "--length", "5", "--format", "json", *names)
        self.assertEqual(done.stdout, b"")  # known, the failed one too

    def test_what_is_analysed_again(self):
        self.put("a.wav")
        self.put("bad.wav", content=b"RIFF" + bytes(60))

        def stored(*words, status=0):
            done = self.run_tavo("--store", "x.db", *words, "a.wav", "bad.wav", status=status)
            return int(done.stderr.split(b" stored")[0].split()[-1])

        self.assertEqual(stored(status=1), 2)
        self.assertEqual(stored(), 0)
        self.assertEqual(stored("--retry-failed", status=1), 1)
        self.assertEqual(stored("--redo", status=1), 2)
        self.assertEqual(stored("--mode", "beats", status=1), 2)
        self.assertEqual(stored("--max-beats", "2", status=1), 2)
        self.assertEqual(len(self.rows(where="WHERE mode = 'both'")), 2)
        os.utime(self.folder / "a.wav", (1, 1))
        self.assertEqual(stored(), 1)
        self.assertEqual(self.rows(where="WHERE max_beats = 0 AND mode = 'both'")[b"a.wav"]["mtime_ns"], 10**9)

    def test_killed_at_any_moment(self):
        names = self.put_songs(240)
        random.seed(4)
        for _ in range(3):
            run = subprocess.Popen([TAVO, "--store", "x.db", "-j", "2", *names], cwd=self.folder,
                                   stdin=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
            time.sleep(random.uniform(0.2, 2.5))
            run.kill()
            run.wait()
            if (self.folder / "x.db").exists():
                subprocess.run(["sqlite3", "x.db", "PRAGMA integrity_check"], cwd=self.folder, check=True,
                               stdout=subprocess.DEVNULL)
        self.run_tavo("--store", "x.db", "-j", "2", *names)
        rows = self.rows()
        self.assertEqual(len(rows), len(names))
        for result in self.run_json(*names[:5]):
            for i in range(names.index(result["file"]), len(names), 5):
                self.assert_same(rows[names[i].encode()], result)

    def test_a_store_that_does_not_answer(self):
        self.put("a.wav")
        self.run_tavo("--store", "x.db", "a.wav")
        with sqlite3.connect(self.folder / "x.db", isolation_level=None) as other:
            other.execute("BEGIN EXCLUSIVE")
            done = self.run_tavo("--store", "x.db", "--redo", "--patience", "3", "a.wav", status=1)
            other.execute("ROLLBACK")
        self.assertIn(b"trying again", done.stderr)
        self.assertIn(b"could not be stored", done.stderr)
        (saved,) = self.objects(done.stdout)
        self.assert_same(self.rows()[b"a.wav"], saved)
        for url, words in (("x.txt", b"sqlite:FILE"), ("none/x.db", b"cannot be used"),
                           ("postgresql://127.0.0.1:9/x", b"Connection refused")):
            done = self.run_tavo("--store", url, "a.wav", status=1)
            self.assertIn(words, done.stderr)

    def test_written_out_again(self):
        names = self.put_songs(3)
        self.run_tavo("--store", "x.db", *names)
        expected = self.run_json(*names)
        for name in names:
            os.unlink(self.folder / name)  # nothing is analysed
        self.assertEqual(self.run_json("--store", "x.db", "--from-store"), expected)
        self.run_tavo("--store", "x.db", "--from-store", "--format", "labels")
        self.assertIn("highlight", (self.folder / "song 1.wav.labels.txt").read_text())
        self.run_tavo("--store", "x.db", "--from-store", status=2)

    def test_shards(self):
        names = self.put_songs(12)

        def share(words, **environment):
            done = self.run_tavo("--format", "json", "--mode", "highlight", "--shard", words, *names,
                                 env={**os.environ, **environment})
            return [result["file"] for result in self.objects(done.stdout)]

        shares = [share(f"{i}/3") for i in (1, 2, 3)]
        self.assertEqual(sorted(sum(shares, [])), sorted(names))
        self.assertTrue(all(shares))
        slurm = {"SLURM_ARRAY_TASK_MIN": "10", "SLURM_ARRAY_TASK_STEP": "5", "SLURM_ARRAY_TASK_COUNT": "3"}
        for i, expected in enumerate(shares):
            self.assertEqual(share("auto", SLURM_ARRAY_TASK_ID=str(10 + 5 * i), **slurm), expected)
            self.assertEqual(share("auto", JOB_COMPLETION_INDEX=str(i), TAVO_SHARDS="3"), expected)
            self.assertEqual(share("auto", AWS_BATCH_JOB_ARRAY_INDEX=str(i), AWS_BATCH_JOB_ARRAY_SIZE="3"), expected)
        for wrong in ("0/3", "4/3", "1", "a/3", "1/3x", "auto"):
            self.run_tavo("--shard", wrong, names[0], status=2)

    def test_forecast(self):
        names = self.put_songs(40)
        for i, name in enumerate(names):
            with open(self.folder / name, "ab") as file:
                file.write(bytes(i * 1000))  # behind the sound
        self.put("bad.mp3", content=bytes(5000))
        (self.folder / "list").write_text("\n".join([*names, "bad.mp3", "missing.wav"]))
        words = ["--forecast", "list", "--files", "1000000", "--cores", "4", "--bandwidth", "10"]
        whole = self.run_tavo(*words, "--sample", "1000", status=0).stdout.decode()
        sizes = [os.stat(self.folder / name).st_size for name in [*names, "bad.mp3"]]
        self.assertIn("41 files, 41 analysed", whole)
        self.assertIn("1 listed and not there", whole)
        self.assertIn(f"{sum(sizes) / 41 / 1e6:.3f} ± 0.000 MB", whole)
        self.assertIn(f"{sum(sizes) / 41 / 1e6:.3f} TB", whole)
        self.assertIn(f"{100 / 41:.3f} ± 0.000 %", whole)
        part = self.run_tavo(*words, "--sample", "12", "--store", "x.db").stdout.decode()
        mean, width = (float(word) for word in part.split("read ")[1].split(" MB")[0].split("±"))
        self.assertLess(abs(mean - sum(sizes) / 41 / 1e6), 3 * width)
        self.assertGreater(width, 0)
        self.assertLess(len(self.rows()), 41)
