"""Label tracks: their content, and files that are whole or not there."""
import os
import pwd
import resource
import subprocess

from command_case import TAVO, Case, main, short_song, standard_song


def labels(path):
    """start, end, name of each line."""
    lines = path.read_text().splitlines()
    return [(float(a), float(b), name) for a, b, name in (line.split("\t") for line in lines)]


class Labels(Case):
    def test_content(self):
        self.put("song.wav", source=standard_song())
        for length, seconds in ((None, 30.0), ("12", 12.0)):
            arguments = ["--length", length] if length else []
            (result,) = self.run_json(*arguments, "song.wav")
            done = self.run_tavo("--format", "labels", "--force", *arguments, "song.wav")
            self.assertEqual(done.stdout, b"song.wav.labels.txt\n")
            track = labels(self.folder / "song.wav.labels.txt")
            start = result["hl_pos_ms"] / 1000
            self.assertEqual(track[0], (start, min(start + seconds, 60.0), "highlight"))
            self.assertEqual(len(track), 1 + result["beat_count"])
            for (a, b, name), time, count in zip(track[1:], result["beats_ms"], range(1, 10000)):
                self.assertAlmostEqual(a, time / 1000, places=5)
                self.assertEqual((b, name), (a, f"beat {count}"))

    def test_an_existing_track_stays(self):
        self.put("song.wav")
        track = self.put("song.wav.labels.txt", b"mine\n")
        done = self.run_tavo("--format", "labels", "song.wav", status=1)
        self.assertIn(b"--force", done.stderr)
        self.assertEqual((done.stdout, track.read_bytes()), (b"", b"mine\n"))
        self.run_tavo("--format", "labels", "--force", "song.wav")
        self.assertIn("highlight", track.read_text())
        self.assertEqual(len(list(self.folder.iterdir())), 2)

    def test_output_dir(self):
        self.put("in/song.wav")
        (self.folder / "out").mkdir()
        self.run_tavo("--format", "labels", "-o", "out", "in")
        self.assertEqual([p.name for p in (self.folder / "out").iterdir()],
                         ["song.wav.labels.txt"])
        self.assertEqual([p.name for p in (self.folder / "in").iterdir()], ["song.wav"])
        mode = (self.folder / "out/song.wav.labels.txt").stat().st_mode
        mask = os.umask(0)
        os.umask(mask)
        self.assertEqual(mode & 0o777, 0o666 & ~mask)

    def test_two_songs_of_one_name(self):
        self.put("x/song.wav")
        self.put("y/song.wav", source=short_song(seed=7))
        (self.folder / "out").mkdir()
        for _ in range(2):
            done = self.run_tavo("--format", "labels", "--force", "-o", "out", "-j", "2", "x", "y",
                                 status=1)
            self.assertEqual(done.stdout, b"out/song.wav.labels.txt\n")
            self.assertTrue(done.stderr.startswith(b"tavo: y/song.wav: Its label track would"))

    def test_a_failed_file_has_no_track(self):
        self.put("bad.wav", b"RIFF" * 40)
        self.run_tavo("--format", "labels", "bad.wav", status=1)
        self.assertEqual([p.name for p in self.folder.iterdir()], ["bad.wav"])

    def test_an_unwritable_folder(self):
        os.chmod(self.folder, 0o755)
        self.put("song.wav")
        out = self.folder / "out"
        out.mkdir(mode=0o555)
        other = {}
        if os.getuid() == 0:
            nobody = pwd.getpwnam("nobody")
            other = {"user": nobody.pw_uid, "group": nobody.pw_gid, "extra_groups": []}
        done = self.run_tavo("--format", "labels", "-o", "out", "song.wav", status=1, **other)
        self.assertIn(b"cannot be written: permission denied", done.stderr)
        self.assertEqual(list(out.iterdir()), [])

    def test_a_file_size_limit(self):
        self.put("song.wav")
        limit = lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (64, 64))
        done = subprocess.run([TAVO, "--format", "labels", "song.wav"], capture_output=True,
                              cwd=self.folder, preexec_fn=limit)
        self.assertEqual(done.returncode, 1)
        self.assertIn(b"cannot be written: file too large", done.stderr)
        self.assertEqual([p.name for p in self.folder.iterdir()], ["song.wav"])

    def test_a_full_disk(self):
        # Only root may mount; everybody else has the size limit above.
        disk = self.folder / "disk"
        disk.mkdir()
        self.put("song.wav")
        mounted = subprocess.run(["mount", "-t", "tmpfs", "-o", "size=8k", "none", disk],
                                 capture_output=True)
        if mounted.returncode != 0:
            self.skipTest("no mount here: " + mounted.stderr.decode().strip())
        self.addCleanup(subprocess.run, ["umount", disk], check=True)
        try:
            (disk / "filler").write_bytes(bytes(65536))
        except OSError:
            pass
        done = self.run_tavo("--format", "labels", "-o", "disk", "song.wav", status=1)
        self.assertIn(b"no space left", done.stderr.lower())
        self.assertEqual([p.name for p in disk.iterdir()], ["filler"])


if __name__ == "__main__":
    main()
