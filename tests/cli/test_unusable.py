"""Files that cannot be used: a clear sentence, exit status 1, and nothing of a result."""
import os

from command_case import AS_ORDINARY_USER, Case, wav

ASF = bytes.fromhex("3026b2758e66cf11a6d900aa0062ce6c")

# name, content, what the sentence says
CASES = [
    ("empty.wav", b"", "empty"),
    ("fifteen.wav", b"RIFF\0\0\0\0WAVEfmt", "too short to be audio: it has 15 bytes"),
    ("text.wav", b"This is a letter, not a song.\n" * 99, "not recognised"),
    ("movie.wma", ASF + bytes(500), "ASF (Windows Media), a format that is refused"),
    ("8.wav", wav(bits=8), "8-bit samples"),
    ("24.wav", wav(bits=24), "24-bit samples"),
    ("float.wav", wav(bits=32, tag=3), "32-bit floating-point"),
    ("alaw.wav", wav(bits=8, tag=6), "format tag 6"),
    ("96k.wav", wav(rate=96000), "96000 Hz"),
    ("1s.wav", wav(seconds=1.0), "lasts 1.000 s"),
    ("7999.wav", wav(rate=7999), "7999 Hz"),
    ("no-channels.wav", wav(seconds=0.0)[:22] + b"\0\0" + wav()[24:], "0 channels"),
    ("no-data.wav", wav()[:36], "no usable audio stream"),
    ("lies.wav", wav(seconds=0.5, data_size=0xFFFFFFFF), "lasts 0.500 s"),
    ("silence.wav", wav(seconds=7.0, sample=b"\0"), "No beats were found"),
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

    def test_not_a_file(self):
        os.mkfifo(self.folder / "pipe")
        (self.folder / "loop").symlink_to("loop")
        (self.folder / "empty").mkdir()
        results = self.run_json("pipe", "/dev/zero", "loop", "empty", "missing", status=1)
        said = ["device, pipe", "device, pipe", "symbolic link", "no audio files", "does not exist"]
        for result, words in zip(results, said, strict=True):
            self.assertIn(words, result["error"])

    def test_not_readable(self):
        self.put("closed/in.wav")
        os.chmod(self.put("secret.wav"), 0)
        os.chmod(self.folder / "closed", 0)
        self.addCleanup(os.chmod, self.folder / "closed", 0o700)
        names = ["secret.wav", "closed", "closed/in.wav"]
        results = self.run_json(*names, status=1, before=AS_ORDINARY_USER)
        self.assertEqual([r["file"] for r in results], names)
        for result in results:
            self.assertIn("permission denied", result["error"])
