"""Files that the command writes - label tracks, click tracks, pictures: whole or not there."""
import os
import signal
import struct
import subprocess
import time

from command_case import AS_ORDINARY_USER, TAVO, Case, file_limit, short_song, wav

# What writes which file for song.wav, and what is in it.
LABELS = (["--format", "labels"], "song.wav.labels.txt", b"highlight")
PICTURE = (["--plot", "p.svg"], "p.svg", b"highlight")
CLICK = (["--click", "c.wav"], "c.wav", b"RIFF")
ALL = (LABELS, PICTURE, CLICK)


class Outputs(Case):
    def setUp(self):
        super().setUp()
        self.song = self.put("song.wav")

    def test_beside_each_other_and_only_when_asked(self):
        before = self.song.read_bytes()
        self.run_tavo("song.wav")
        self.assert_only("song.wav")
        done = self.run_tavo("--plot", "[p,q].svg", *CLICK[0], *LABELS[0], "song.wav")
        self.assertEqual(done.stdout, b"song.wav.labels.txt\n")
        self.assert_only("song.wav", "song.wav.labels.txt", "c.wav", "[p,q].svg")
        self.assertEqual(self.song.read_bytes(), before)
        mask = os.umask(0)
        os.umask(mask)
        for name in ("song.wav.labels.txt", "c.wav", "[p,q].svg"):
            self.assertEqual((self.folder / name).stat().st_mode & 0o777, 0o666 & ~mask, name)
        track = (self.folder / "c.wav").read_bytes()
        self.assertEqual(track[:4] + track[8:12], b"RIFFWAVE")
        self.assertEqual(struct.unpack("<I", track[40:44])[0], len(track) - 44)
        self.assertGreater(max(struct.unpack(f"<{(len(track) - 44) // 2}h", track[44:])), 3000)

    def test_what_exists_stays(self):
        for arguments, name, content in ALL:
            target = self.put(name, b"mine\n")
            done = self.run_tavo(*arguments, "song.wav", status=1)
            self.assertIn(b"--force", done.stderr)
            self.assertEqual((done.stdout, target.read_bytes()), (b"", b"mine\n"))
            self.run_tavo(*arguments, "--force", "song.wav")
            self.assertIn(content, target.read_bytes())
        self.assert_only("song.wav", *(name for _, name, _ in ALL))

    def test_places_that_cannot_be_written(self):
        before = self.song.read_bytes()
        (self.folder / "link.svg").symlink_to("/dev/null")
        for option, place in (("--click", "song.wav"), ("--click", "."), ("--click", "nowhere/c.wav"),
                              ("--plot", "song.wav"), ("--plot", "./song.wav"), ("--plot", "."),
                              ("--plot", "nowhere/p.svg"), ("--plot", "link.svg"), ("--plot", "/dev/null")):
            (result,) = self.run_json("--force", option, place, "song.wav", status=1)
            self.assertRegex(result["error"], "click|picture|cannot be written", (option, place))
        self.assertEqual(self.song.read_bytes(), before)
        self.assertTrue((self.folder / "link.svg").is_symlink())
        self.assert_only("song.wav", "link.svg")

    def test_failures_leave_nothing(self):
        self.put("silent.wav", wav(seconds=3, sample=bytes(32)))
        self.put("bad.wav", b"RIFF" * 40)
        for arguments, _, _ in ALL:
            self.run_tavo(*arguments, "silent.wav", status=1)
            self.run_tavo(*arguments, "bad.wav", status=1)
            done = self.run_tavo(*arguments, "song.wav", status=1, **file_limit(64))
            self.assertRegex(done.stderr, b"cannot be written: file too large|the disk may be full")
            self.assertEqual(done.stdout, b"")
        self.assert_only("song.wav", "silent.wav", "bad.wav")

    def test_another_folder(self):
        self.put("x/song.wav")
        self.put("y/song.wav", source=short_song(seed=7))
        out = self.folder / "out"
        out.mkdir()
        for _ in range(2):  # the second is refused whichever is done first
            done = self.run_tavo(*LABELS[0], "--force", "-o", "out", "-j", "2", "x", "y", status=1)
            self.assertEqual(done.stdout, b"out/song.wav.labels.txt\n")
            self.assertTrue(done.stderr.startswith(b"tavo: y/song.wav: Its file out/song.wav."))
        self.assertEqual(os.listdir(out) + os.listdir(self.folder / "x"), [LABELS[1], "song.wav"])
        os.chmod(out, 0o555)
        done = self.run_tavo(*LABELS[0], "--force", "-o", "out", "x", status=1, before=AS_ORDINARY_USER)
        self.assertIn(b"cannot be written: permission denied", done.stderr)

    def test_each_file_once(self):
        self.put("other.wav")
        done = self.run_tavo(*LABELS[0], "song.wav", "./song.wav", "other.wav")
        self.assertEqual(done.stdout.count(b"\n"), 2)
        self.assertEqual(done.stderr, b"tavo: ./song.wav: named more than once, done once.\n")
        (self.folder / LABELS[1]).write_bytes(b"mine\n")
        done = self.run_tavo(*LABELS[0], "--skip-existing", "song.wav", "other.wav", ".")
        self.assertEqual((done.stdout, (self.folder / LABELS[1]).read_bytes()), (b"", b"mine\n"))
        self.assertIn(b"4 inputs left out", done.stderr)

    def test_names_as_long_as_they_may_be(self):
        names = ["\u00e9" * 120 + ending for ending in ("-one.wav", "-two.wav")]  # 248 bytes
        for name in names:
            self.put(name)
        written = self.run_tavo(*LABELS[0], "-o", ".", *names).stdout.decode().splitlines()
        self.assertEqual(len(set(written)), 2)
        for path in written:
            self.assertTrue(path.endswith(".labels.txt") and (self.folder / path).is_file())

    def test_a_stop_while_drawing(self):
        # A stop at any moment: no picture, or all of it. About half of the time is drawing.
        self.put_hours_of_silence("song.wav", 3)
        arguments = [TAVO, *PICTURE[0], "--mode", "highlight", "song.wav"]
        start = time.monotonic()
        subprocess.run(arguments, cwd=self.folder, check=True, stdout=subprocess.DEVNULL)
        took = time.monotonic() - start
        picture = self.folder / "p.svg"
        whole = picture.read_bytes()
        for part in (0.5, 0.7, 0.8, 0.9, 0.95):
            picture.unlink(missing_ok=True)
            stop = ["timeout", "--preserve-status", "--signal=INT", str(part * took)]
            done = subprocess.run(stop + arguments, cwd=self.folder, capture_output=True)
            if picture.exists():
                self.assertEqual(picture.read_bytes(), whole)
            else:
                self.assertEqual(done.returncode, 128 + signal.SIGINT)
                self.assert_only("song.wav")
