"""Tests --store. Each song is stored once, with the same result as without --store."""
import json
import os
import sqlite3
import time

from command_case import AS_ORDINARY_USER, Case, send, short_song

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
        for key in "status sample_rate channels duration_ms offset_ms hl_pos_ms bpm beats_ms".split():
            value = row[key] if key != "beats_ms" or row[key] is None else json.loads(row[key])
            self.assertEqual(value, result.get(key), key)

    def test_rows_equal_results(self):
        odd = os.fsdecode(b"odd \xff.wav")
        self.put("a.wav")
        self.put(odd, source=short_song(seed=3))
        self.put("text.wav", content=b"no music, but as long as a head\n" * 4)
        words = ["--length", "5", "a.wav", odd, "text.wav"]
        results = self.run_json(*words, status=1)
        self.run_tavo(*STORE, *words, status=1, message=b"3 stored", printed=b"")
        rows = self.rows()
        for name, result in zip(words[2:], results, strict=True):
            row, state = rows[os.fsencode(name)], os.stat(self.folder / name)
            self.assert_same(row, result)
            self.assertEqual([row[key] for key in ("size", "mtime_ns", "mode", "length_s", "max_beats")],
                             [state.st_size, state.st_mtime_ns, "both", 5, 0])
        # A second run finds all songs in the store, including the failed one.
        self.run_tavo("--store", "sqlite:x.db", "--format", "json", *words, status=1,
                      message=b"0 stored, 3 known already (1 failed; --retry-failed)", printed=b"")

    def test_changed_requests_and_files_are_analysed_again(self):
        self.put("a.wav")
        self.put("bad.wav", content=b"RIFF" + bytes(60))
        for words, stored in (("", 2), ("", 0), ("--retry-failed", 1), ("--redo", 2), ("--mode beats", 2),
                              ("--max-beats 2", 2)):
            self.run_tavo(*STORE, *words.split(), "a.wav", "bad.wav", status=1, message=b"%d stored" % stored)
        os.utime(self.folder / "a.wav", (1, 1))
        self.run_tavo(*STORE, "a.wav", "bad.wav", status=1, message=b"1 stored, 1 known")
        rows = self.rows("WHERE mode = 'both' AND max_beats = 0")
        self.assertEqual((len(rows), rows[b"a.wav"]["mtime_ns"]), (2, 10**9))

    def test_killed_at_any_moment(self):
        names = self.put_songs(240)
        for delay in (0.3, 0.7, 1.9):
            process = self.start(*STORE, "-j", "2", *names)
            time.sleep(delay)
            process.kill()
            process.wait()
        self.run_tavo(*STORE, "-j", "2", *names)
        rows = self.rows()
        self.assertEqual(len(rows), len(names))
        for i, result in enumerate(self.run_json(*names[:5])):
            for name in names[i::5]:
                self.assert_same(rows[name.encode()], result)

    def test_results_are_stored_while_a_list_is_read(self):
        self.put("a.wav")
        self.run_tavo(*STORE, "a.wav")
        send(self.start(*STORE, "-"), b"./a.wav\n")
        self.wait_until(lambda: b"./a.wav" in self.rows())

    def test_unusable_stores_are_reported(self):
        self.put("a.wav")
        self.run_tavo(*STORE, "a.wav")
        with sqlite3.connect(self.folder / "x.db", isolation_level=None) as other:
            other.execute("BEGIN EXCLUSIVE")
            waiting, stopped = self.start(*STORE, "a.wav"), self.start(*STORE, "a.wav")
            self.assertIn(b"trying again", waiting.stderr.readline())
            time.sleep(1)  # SQLite waits again, for 2 s
            stopped.terminate()
            stopped.wait(timeout=1)
            other.execute("ROLLBACK")
            self.assertIn(b"1 known", waiting.stderr.read())
            other.execute("BEGIN IMMEDIATE")
            done = self.run_tavo(*STORE, "--redo", "--patience", "3", "a.wav", status=1, message=b"trying again")
            other.execute("ROLLBACK")
        self.assertIn(b"1 result could not be stored", done.stderr)
        self.assert_same(self.rows()[b"a.wav"], *self.objects(done.stdout))
        self.put("text.db", b"no database, but as long as one\n" * 40)
        for url, words in (("x.txt", b"sqlite:FILE"), ("none/x.db", b"cannot be used"), ("sqlite:", b"is not a file"),
                           ("sqlite::memory:", b"is not a file"), ("text.db", b"not a database"),
                           ("postgresql://127.0.0.1:9/x", b"Connection refused"),
                           ("postgresql://127.0.0.1:9/x?password=se%zt", b"cannot be used"),
                           ("postgresql://me:se%40c/r@et@127.0.0.1:9/x", b"cannot be used")):
            done = self.run_tavo("--store", url, "a.wav", status=1, message=words)
            self.assertNotRegex(done.stderr, rb"\bme\b|\bse\b|\bc\b|\br\b|\bet\b|trying again")

    def test_from_store(self):
        names = self.put_songs(3)
        self.run_tavo(*STORE, *names, "--length", "5")
        expected = self.run_json(*names, "--length", "5")
        for name in names:
            os.unlink(self.folder / name)  # the songs are no longer needed
        self.run_tavo(*STORE, "--from-store", "--length", "5", "--format", "labels")
        self.assertIn("highlight", (self.folder / "song 1.wav.labels.txt").read_text())
        # Reading does not need write access to the store and its folder.
        (self.folder / "x.db").chmod(0o444)
        self.folder.chmod(0o555)
        self.addCleanup(self.folder.chmod, 0o700)
        self.assertEqual(self.run_json(*STORE, "--from-store", "--length", "5", before=AS_ORDINARY_USER), expected)

    def test_markers_of_a_run_that_was_killed(self):
        """A killed run may leave marker files of songs that are not in the store."""
        names = self.put_songs(3)
        words = (*STORE, "--format", "labels", *names)
        self.run_tavo(*words)
        (self.folder / "x.db").unlink()
        self.put("song 1.wav.labels.txt", b"of somebody else\n")
        for _ in range(2):  # the failure of song 1 is not stored
            self.run_tavo(*words, status=1, message=b"song 1.wav: The file song 1.wav.labels.txt exists already")
            self.assertEqual([row["status"] for row in self.rows().values()], ["ok"] * 2)
        self.run_tavo(*words, "--force", message=b"1 stored, 2 known")

    def test_a_store_of_the_first_version(self):
        """It lacks the columns offset_ms and decoder, and has a write-ahead log. Here, some rows are also damaged."""
        self.put("a.wav")
        self.put("bad.wav", content=b"RIFF" + bytes(60))
        self.run_tavo(*STORE, "a.wav", "bad.wav", status=1)
        damaged = (("blob", "hl_pos_ms", b"x"), ("deep", "beats_ms", "[" * 10**6),
                   ("nested", "beats_ms", "[" * 10**5 + "]" * 10**5), ("word", "bpm", "many"))
        rows = self.rows()
        with sqlite3.connect(self.folder / "x.db", isolation_level=None) as db:
            for name, column, value in damaged:
                row = {**rows[b"a.wav"], "path": name.encode(), column: value}
                db.execute(f"INSERT INTO songs VALUES ({', '.join('?' * len(row))})", [*row.values()])
            db.executescript("ALTER TABLE songs DROP COLUMN offset_ms; ALTER TABLE songs DROP COLUMN decoder;"
                             "PRAGMA user_version = 0; PRAGMA journal_mode = WAL")
        done = self.run_tavo(*STORE, "--from-store", "--format", "json", status=1)
        self.assertEqual(done.stderr.decode(), "".join(
            f"tavo: {name}: Its row in the store is damaged: {column} cannot be read.\n" for name, column, _ in damaged))
        self.assertEqual(self.objects(done.stdout)[0]["beats_ms"], json.loads(rows[b"a.wav"]["beats_ms"]))
        sentence = rows[b"bad.wav"]["sentence"]
        self.run_tavo(*STORE, "--from-store", "--failed", printed=f"bad.wav: {sentence}\n".encode())
        db.close()
        self.run_tavo(*STORE, "a.wav", message=b"1 known")  # upgrades the table
        with sqlite3.connect(self.folder / "x.db") as db:
            self.assertEqual(db.execute("SELECT count(offset_ms), count(decoder) FROM songs").fetchone(), (0, 0))
            self.assertEqual(db.execute("PRAGMA journal_mode").fetchone(), ("delete",))
            db.execute("PRAGMA user_version = 99")
        self.run_tavo(*STORE, "a.wav", status=1, message=b"written by a newer tavo")

    def test_shards(self):
        names = self.put_songs(12)

        def share(words, **variables):
            done = self.run_json("--mode", "highlight", "--shard", words, *names, env={**os.environ, **variables})
            return [result["file"] for result in done]

        shares = [share(f"{i}/3") for i in (1, 2, 3)]
        self.assertEqual(sorted(sum(shares, [])), sorted(names))
        self.assertTrue(all(shares))
        for i, expected in enumerate(shares):
            for engine in (f"SLURM_ARRAY_TASK_ID={10 + 5 * i} SLURM_ARRAY_TASK_MIN=10 SLURM_ARRAY_TASK_STEP=5 "
                           "SLURM_ARRAY_TASK_COUNT=3", f"JOB_COMPLETION_INDEX={i} TAVO_SHARDS=3",
                           f"AWS_BATCH_JOB_ARRAY_INDEX={i} AWS_BATCH_JOB_ARRAY_SIZE=3"):
                self.assertEqual(share("auto", **dict(word.split("=") for word in engine.split())), expected)
