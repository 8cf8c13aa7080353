"""Results in a database: once each, whatever happens, and the same as without."""
import json
import os
import random
import sqlite3
import time

from command_case import Case, send, short_song

KEYS = ("status", "sample_rate", "channels", "duration_ms", "hl_pos_ms", "bpm", "beats_ms")
STORE = ("--store", "x.db")


class Store(Case):
    def rows(self, where=""):
        with sqlite3.connect(self.folder / "x.db") as db:
            db.row_factory = sqlite3.Row
            return {row["path"]: dict(row) for row in db.execute(f"SELECT * FROM songs {where}")}

    def put_songs(self, count):
        return [self.put(f"song {i}.wav", source=short_song(seed=i % 5)).name for i in range(count)]

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
        words = ["--length", "5", "a.wav", odd, "text.wav"]
        results = self.run_json(*words, status=1)
        self.run_tavo(*STORE, *words, status=1, said=b"3 stored", printed=b"")
        rows = self.rows()
        self.assertEqual(sorted(rows), [b"a.wav", os.fsencode(odd), b"text.wav"])
        for name, result in zip(words[2:], results, strict=True):
            row, state = rows[os.fsencode(name)], os.stat(self.folder / name)
            self.assert_same(row, result)
            self.assertEqual([row[key] for key in ("size", "mtime_ns", "mode", "length_s", "max_beats")],
                             [state.st_size, state.st_mtime_ns, "both", 5, 0])
        # Known, the failed one too.
        self.run_tavo("--store", "sqlite:x.db", "--format", "json", *words, said=b"0 stored", printed=b"")

    def test_what_is_analysed_again(self):
        self.put("a.wav")
        self.put("bad.wav", content=b"RIFF" + bytes(60))
        for words, status, stored in (("", 1, 2), ("", 0, 0), ("--retry-failed", 1, 1), ("--redo", 1, 2),
                                      ("--mode beats", 1, 2), ("--max-beats 2", 1, 2), ("touched", 0, 1)):
            if words == "touched":
                os.utime(self.folder / "a.wav", (1, 1))
                words = ""
            self.run_tavo(*STORE, *words.split(), "a.wav", "bad.wav", status=status, said=b"%d stored" % stored)
        rows = self.rows("WHERE mode = 'both' AND max_beats = 0")
        self.assertEqual((len(rows), rows[b"a.wav"]["mtime_ns"]), (2, 10**9))

    def test_killed_at_any_moment(self):
        names = self.put_songs(240)
        random.seed(4)
        for _ in range(3):
            process = self.start(*STORE, "-j", "2", *names)
            time.sleep(random.uniform(0.2, 2.5))
            process.kill()
            process.wait()
        self.run_tavo(*STORE, "-j", "2", *names)
        rows = self.rows()
        self.assertEqual(len(rows), len(names))
        for i, result in enumerate(self.run_json(*names[:5])):
            for name in names[i::5]:
                self.assert_same(rows[name.encode()], result)

    def test_stored_as_time_passes(self):
        self.put("a.wav")
        self.run_tavo(*STORE, "a.wav")
        send(self.start(*STORE, "-"), b"./a.wav\n")
        self.wait_until(lambda: b"./a.wav" in self.rows())

    def test_a_store_that_does_not_answer(self):
        self.put("a.wav")
        self.run_tavo(*STORE, "a.wav")
        with sqlite3.connect(self.folder / "x.db", isolation_level=None) as other:
            other.execute("BEGIN EXCLUSIVE")
            done = self.run_tavo(*STORE, "--redo", "--patience", "3", "a.wav", status=1, said=b"trying again")
            other.execute("ROLLBACK")
        self.assertIn(b"1 result could not be stored", done.stderr)
        (saved,) = self.objects(done.stdout)
        self.assert_same(self.rows()[b"a.wav"], saved)
        for url, words in (("x.txt", b"sqlite:FILE"), ("none/x.db", b"cannot be used"),
                           ("postgresql://127.0.0.1:9/x", b"Connection refused")):
            self.run_tavo("--store", url, "a.wav", status=1, said=words)

    def test_written_out_again(self):
        names = self.put_songs(3)
        self.run_tavo(*STORE, *names, "--length", "5")
        expected = self.run_json(*names, "--length", "5")
        for name in names:
            os.unlink(self.folder / name)  # nothing is analysed
        self.assertEqual(self.run_json(*STORE, "--from-store", "--length", "5"), expected)
        self.run_tavo(*STORE, "--from-store", "--length", "5", "--format", "labels")
        start, end = (expected[1][key] / 1000 for key in ("hl_pos_ms", "hl_end_ms"))
        self.assertIn(f"{start:.6f}\t{end:.6f}\thighlight", (self.folder / "song 1.wav.labels.txt").read_text())
        self.run_tavo(*STORE, "--from-store", status=2)

    def test_shards(self):
        names = self.put_songs(12)

        def share(words, **environment):
            return [result["file"] for result in self.run_json("--mode", "highlight", "--shard", words, *names,
                                                               env={**os.environ, **environment})]

        shares = [share(f"{i}/3") for i in (1, 2, 3)]
        self.assertEqual(sorted(sum(shares, [])), sorted(names))
        self.assertTrue(all(shares))
        slurm = {"SLURM_ARRAY_TASK_MIN": "10", "SLURM_ARRAY_TASK_STEP": "5", "SLURM_ARRAY_TASK_COUNT": "3"}
        for i, expected in enumerate(shares):
            for engine in ({"SLURM_ARRAY_TASK_ID": str(10 + 5 * i), **slurm},
                           {"JOB_COMPLETION_INDEX": str(i), "TAVO_SHARDS": "3"},
                           {"AWS_BATCH_JOB_ARRAY_INDEX": str(i), "AWS_BATCH_JOB_ARRAY_SIZE": "3"}):
                self.assertEqual(share("auto", **engine), expected)
        for wrong in ("0/3", "4/3", "1", "a/3", "1/3x", "auto"):
            self.run_tavo("--shard", wrong, names[0], status=2)

    def test_forecast(self):
        names = self.put_songs(40)
        for i, name in enumerate(names):
            os.truncate(self.folder / name, short_song().stat().st_size + i * 1000)  # behind the sound
        self.put("bad.mp3", content=bytes(5000))
        self.put("list", "\n".join([*names, "bad.mp3", "missing.wav"]).encode())
        words = "--forecast list --files 1000000 --cores 4 --bandwidth 10 --sample".split()
        whole = self.run_tavo(*words, "1000").stdout.decode()
        mean_mb = sum(os.stat(self.folder / name).st_size for name in [*names, "bad.mp3"]) / 41 / 1e6
        for said in ("41 files, 41 analysed", "1 listed and not there", f"{mean_mb:.3f} ± 0.000 MB",
                     f"{mean_mb:.3f} TB", f"{100 / 41:.3f} ± 0.000 %"):
            self.assertIn(said, whole)
        part = self.run_tavo(*words, "12", *STORE).stdout.decode()
        mean, width = (float(word) for word in part.split("read ")[1].split(" MB")[0].split("±"))
        self.assertTrue(abs(mean - mean_mb) < 3 * width, part)
        self.assertLess(len(self.rows()), 41)
