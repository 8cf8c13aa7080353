"""Helpers for the tests of the command. They make songs, run the command and read its output."""
import json
import os
import pathlib
import struct
import subprocess
import tempfile
import time
import unittest

TAVO, MAKE_SONG = os.environ["TAVO"], os.environ["MAKE_SONG"]
SONGS = pathlib.Path(os.environ["SONGS"], "formats")  # one song in every format

_songs = tempfile.TemporaryDirectory()


def song(**options):
    """Returns the path of a song, which is generated once for each set of options."""
    words = [word for k, v in sorted(options.items()) for word in ("--" + k.replace("_", "-"), str(v))]
    path = pathlib.Path(_songs.name, "".join(words) + ".wav")
    if not path.exists():
        subprocess.run([MAKE_SONG, path, *words], check=True)
    return path


def standard_song():
    return song(seconds=60, bpm=120, loud_at=20)


def short_song(seed=1):
    return song(seconds=8, bpm=120, loud_at=4, seed=seed)


def wav(seconds=2.0, rate=44100, channels=1, bits=16, tag=1, data_size=None, sample=b"\x12\x34"):
    """Returns a WAV file, without using the project's own writer."""
    frame = channels * bits // 8
    data = (sample * (frame * 8))[:frame] * round(seconds * rate)
    size = len(data) if data_size is None else data_size
    head = b"RIFF" + struct.pack("<I", 36 + len(data)) + b"WAVEfmt "
    head += struct.pack("<IHHIIHH", 16, tag, channels, rate, rate * frame, frame, bits)
    return head + b"data" + struct.pack("<I", size) + data


# Prefix for a command that makes root obey file permissions.
AS_ORDINARY_USER = [] if os.getuid() != 0 else [
    "setpriv", "--inh-caps=-all", "--bounding-set=-dac_override,-dac_read_search"]


def seconds(text):
    """Converts a time such as h:mm:ss.mmm or m:ss to seconds."""
    return sum(float(part) * 60 ** i for i, part in enumerate(reversed(text.split(":"))))


def children(pid):
    """Returns the process numbers of a process's children."""
    return [*map(int, pathlib.Path(f"/proc/{pid}/task/{pid}/children").read_text().split())]


def send(process, text):
    process.stdin.write(text)
    process.stdin.flush()


class Case(unittest.TestCase):
    def setUp(self):
        self.folder = pathlib.Path(self.enterContext(tempfile.TemporaryDirectory()))

    def put(self, name, content=None, source=None):
        path = self.folder / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(pathlib.Path(source or short_song()).read_bytes() if content is None else content)
        return path

    def assert_only(self, *names):
        """Checks that the folder contains exactly these files, including hidden ones."""
        self.assertEqual({p.name for p in self.folder.iterdir()}, set(names))

    def run_tavo(self, *arguments, status=0, printed=None, message=b"", before=(), **options):
        """Runs the command in the test's folder and checks its exit status. Also checks that the standard output
        equals `printed` and that the messages contain `message`. Arguments may be bytes."""
        options = {"input": b"", "cwd": self.folder, "timeout": 250, **options}
        done = subprocess.run([*before, TAVO, *arguments], capture_output=True, **options)
        details = (arguments, done.stdout, done.stderr)
        self.assertEqual(done.returncode, status, details)
        self.assertIn(printed, (None, done.stdout), details)
        self.assertIn(message, done.stderr, details)
        return done

    def start(self, *arguments, **options):
        """Starts the command in a session of its own. It is killed when the test ends."""
        options = {**dict.fromkeys(("stdin", "stdout", "stderr"), subprocess.PIPE), **options}
        process = self.enterContext(subprocess.Popen([TAVO, *arguments], cwd=self.folder, start_new_session=True,
                                                     **options))
        self.addCleanup(process.kill)  # before the context waits for the process
        return process

    def wait_until(self, condition):
        """Waits until the condition is true and returns its value."""
        for _ in range(3000):
            if found := condition():
                return found
            time.sleep(0.02)
        self.fail("it did not happen within a minute")

    def objects(self, text):
        """Parses one JSON object per line. The text must be valid UTF-8 without NaN or infinity."""
        self.assertTrue(text == b"" or text.endswith(b"\n"), text)
        return [json.loads(line.decode("utf-8"), parse_constant=self.fail)
                for line in text.split(b"\n")[:-1]]

    def run_json(self, *arguments, status=0, **options):
        """Runs the command and returns its results, without cpu_ms."""
        results = self.objects(self.run_tavo("--format", "json", *arguments, status=status, **options).stdout)
        for result in results:
            self.assertTrue(result.pop("cpu_ms", -1) >= 0 or result["status"] != "ok", result)
        return results
