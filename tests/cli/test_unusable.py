"""Files that cannot be used: a clear sentence, exit status 1, and the others go on."""
import os
import pwd

from command_case import Case, main, wav

ASF = bytes.fromhex("3026b2758e66cf11a6d900aa0062ce6c")

# name, content, what the sentence says
CASES = [
    ("empty.wav", b"", "empty"),
    ("fifteen.wav", b"RIFF\0\0\0\0WAVEfmt", "too short to be audio: it has 15 bytes"),
    ("text.wav", b"This is a letter, not a song.\n" * 99, "not recognised"),
    ("movie.wma", ASF + bytes(500), "ASF (Windows Media), a format that is refused"),
    ("8.wav", wav(bits=8), "8-bit samples"),
    ("24.wav", wav(bits=24), "24-bit samples"),
    ("32.wav", wav(bits=32), "32-bit samples"),
    ("float.wav", wav(bits=32, tag=3), "32-bit floating-point"),
    ("alaw.wav", wav(bits=8, tag=6), "format tag 6"),
    ("96k.wav", wav(rate=96000), "96000 Hz"),
    ("0.9s.wav", wav(seconds=0.9), "lasts 0.900 s"),
    ("1s.wav", wav(seconds=1.0), "lasts 1.000 s"),
    ("7999.wav", wav(rate=7999), "7999 Hz"),
    ("no-channels.wav", wav(seconds=0.0)[:22] + b"\0\0" + wav()[24:], "0 channels"),
    ("no-data.wav", wav()[:36], "no usable audio stream"),
    ("lies.wav", wav(seconds=0.5, data_size=10_000_000), "lasts 0.500 s"),
    ("lies-all.wav", wav(seconds=0.5, data_size=0xFFFFFFFF), "lasts 0.500 s"),
]


class Unusable(Case):
    def test_each(self):
        for name, content, said in CASES:
            with self.subTest(name=name):
                self.put(name, content)
                done = self.run_tavo("--format", "json", name, status=1)
                (result,) = self.objects(done.stdout)
                self.assertEqual((result["file"], result["status"]), (name, "failed"))
                self.assertIn(said, result["error"])
                self.assertRegex(result["error"], r"^[A-Z].*\.$")
                self.assertEqual(done.stderr.decode(), f"tavo: {name}: {result['error']}\n")
                self.assertNotIn("beats_ms", result)

    def test_text_keeps_standard_output_clean(self):
        done = self.run_tavo("missing.wav", status=1)
        self.assertEqual(done.stdout, b"")
        self.assertEqual(done.stderr, b"tavo: missing.wav: The file does not exist.\n")

    def test_a_lie_about_more_is_no_harm(self):
        self.put("long.wav", wav(seconds=7.0, data_size=0xFFFFFFFF))
        (result,) = self.run_json("--mode", "highlight", "long.wav")
        self.assertEqual(result["duration_ms"], 7000)

    def test_silence_has_no_beats(self):
        self.put("silence.wav", wav(seconds=7.0, sample=b"\0"))
        (result,) = self.run_json("--mode", "beats", "silence.wav", status=1)
        self.assertIn("No beats", result["error"])
        self.assertEqual(result["duration_ms"], 7000)

    def test_not_a_file(self):
        os.mkfifo(self.folder / "pipe")
        (self.folder / "loop").symlink_to("loop")
        (self.folder / "empty").mkdir()
        results = self.run_json("pipe", "/dev/zero", "loop", "empty", "missing", status=1)
        said = ["device, pipe", "device, pipe", "symbolic link", "no audio files", "does not exist"]
        for result, words in zip(results, said, strict=True):
            self.assertIn(words, result["error"])

    def test_not_readable(self):
        os.chmod(self.folder, 0o755)
        (self.folder / "closed").mkdir(mode=0o700)
        self.put("closed/in.wav")
        os.chmod(self.put("secret.wav"), 0)
        other = {}
        if os.getuid() == 0:  # root reads everything
            nobody = pwd.getpwnam("nobody")
            other = {"user": nobody.pw_uid, "group": nobody.pw_gid, "extra_groups": []}
        else:
            os.chmod(self.folder / "closed", 0)
            self.addCleanup(os.chmod, self.folder / "closed", 0o700)
        results = self.run_json("secret.wav", "closed", "closed/in.wav", status=1, **other)
        for result in results:
            self.assertIn("permission denied", result["error"])
        self.assertEqual([r["file"] for r in results], ["secret.wav", "closed", "closed/in.wav"])

    def test_a_broken_file_in_the_middle(self):
        self.put("a.wav")
        self.put("b.wav", b"RIFF")
        self.put("c.wav")
        for jobs in ("1", "3"):
            with self.subTest(jobs=jobs):
                results = self.run_json("-j", jobs, "a.wav", "b.wav", "c.wav", status=1)
                self.assertEqual([r["file"] for r in results], ["a.wav", "b.wav", "c.wav"])
                self.assertEqual([r["status"] for r in results], ["ok", "failed", "ok"])
                self.assertEqual(results[0]["beats_ms"], results[2]["beats_ms"])


if __name__ == "__main__":
    main()
