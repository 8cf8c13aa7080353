"""Tests the files that the command writes. Each is complete or does not exist."""
import os
import resource

from command_case import AS_ORDINARY_USER, Case, short_song, wav

LABELS = ["--format", "labels"]
ALL = (  # arguments, the file written for song.wav, part of its content
    (LABELS, "song.wav.labels.txt", b"highlight"), (["--click", "c.wav"], "c.wav", b"RIFF"),
    (["--report", "page.html"], "page.html", b"song.wav"), (["--clip", "k.wav", "-l", "2"], "k.wav", b"RIFF"))


class Outputs(Case):
    def setUp(self):
        super().setUp()
        self.song = self.put("song.wav")

    def test_files_are_written_only_on_request(self):
        before = self.song.read_bytes()
        self.run_tavo("song.wav")
        self.assert_only("song.wav")
        self.addCleanup(os.umask, os.umask(0o027))
        self.run_tavo("--report", "[p,q].html", "--click", "c.wav", *LABELS, "song.wav",
                      printed=b"song.wav.labels.txt\n")
        written = ("song.wav.labels.txt", "c.wav", "[p,q].html")
        self.assert_only("song.wav", *written)
        self.assertEqual(self.song.read_bytes(), before)
        self.assertEqual([(self.folder / name).stat().st_mode & 0o777 for name in written], 3 * [0o640])

    def test_existing_files_are_kept_without_force(self):
        names = {"song.wav", "page_songs"}
        for arguments, name, content in (*ALL, (["--report", "page.html", "song.wav"], "page.html", b"song.wav")):
            target = self.put(name, b"mine\n")
            names.add(name)
            self.run_tavo(*arguments, "song.wav", status=1, message=b"--force", printed=b"")
            self.assertEqual(target.read_bytes(), b"mine\n")
            self.run_tavo(*arguments, "--force", "song.wav")
            self.assertIn(content, target.read_bytes())
        self.assert_only(*names)

    def test_unwritable_places_are_reported(self):
        before = self.song.read_bytes()
        for option, places in (("--click", "song.wav . nowhere/c.wav"), ("--report", "song.wav ./song.wav . nowhere/page.html"),
                               ("--clip", "song.wav ./song.wav nowhere/c.wav")):
            for place in places.split():
                (result,) = self.run_json("--force", "-l", "2", option, place, "song.wav", status=1)
                self.assertRegex(result["error"], "click|page|clip would|cannot be written", (option, place))
        self.put("kept/file", b"mine\n")
        for link, target, songs in (("page.html", "song.wav", 1), ("page.html", "nowhere", 2), ("page_songs", "kept", 2)):
            (self.folder / link).symlink_to(target)
            self.run_tavo("--force", "--report", "page.html", *songs * ["song.wav"], status=1, message=link.encode())
            self.assertEqual((self.folder / link).readlink().name, target)
            (self.folder / link).unlink()
        self.assertEqual(os.listdir(self.folder / "kept"), ["file"])
        self.assertEqual(self.song.read_bytes(), before)
        self.assert_only("song.wav", "kept")

    def test_failures_leave_nothing(self):
        self.put("silent.wav", wav(seconds=3, sample=bytes(32)))
        self.put("bad.wav", b"RIFF" * 40)
        for arguments, _, _ in ALL:
            self.run_tavo(*arguments, "silent.wav", status=1)
            self.run_tavo(*arguments, "bad.wav", status=1)
            done = self.run_tavo(*arguments, "song.wav", status=1, printed=b"",
                                 preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (64, 64)))
            self.assertRegex(done.stderr, b"cannot be written: file too large|the disk may be full|clip k.wav cannot be written")
        self.assert_only("song.wav", "silent.wav", "bad.wav")

    def test_output_dir(self):
        self.put("x/song.wav")
        self.put("y/song.wav", source=short_song(seed=7))
        out = self.folder / "out"
        out.mkdir()
        for _ in range(2):  # y/song.wav is refused even if its analysis ends first
            self.run_tavo(*LABELS, "--force", "-o", "out", "-j", "2", "x", "y", status=1,
                          message=b"tavo: y/song.wav: Its file out/song.wav.", printed=b"out/song.wav.labels.txt\n")
        self.assertEqual(os.listdir(out) + os.listdir(self.folder / "x"), ["song.wav.labels.txt", "song.wav"])
        os.chmod(out, 0o555)
        self.run_tavo(*LABELS, "--force", "-o", "out", "x", status=1, before=AS_ORDINARY_USER,
                      message=b"cannot be written: permission denied")

    def test_each_file_is_written_once(self):
        self.put("other.wav")
        self.run_tavo(*LABELS, "song.wav", "./song.wav", "other.wav",
                      message=b"tavo: ./song.wav: named more than once, done once.\n",
                      printed=b"song.wav.labels.txt\nother.wav.labels.txt\n")
        mine = self.put("song.wav.labels.txt", b"mine\n")
        self.run_tavo(*LABELS, "--skip-existing", "song.wav", "other.wav", ".", message=b"4 inputs left out", printed=b"")
        self.assertEqual(mine.read_bytes(), b"mine\n")
        # The names of these songs are too long to be part of a marker file's name.
        names = ["\u00e9" * 120 + ending for ending in ("-one.wav", "-two.wav")]
        for name in names:
            self.put(name)
        written = self.run_tavo(*LABELS, "-o", ".", *names).stdout.decode().splitlines()
        self.assertEqual(len({(self.folder / path).resolve(strict=True) for path in written}), 2)
        self.assertRegex(" ".join(written), r"\.labels\.txt \S+\.labels\.txt$")
