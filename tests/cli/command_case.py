"""What the tests of the command share: running it, songs, what its output holds."""
import json
import os
import pathlib
import resource
import struct
import subprocess
import tempfile
import unittest

TAVO, MAKE_SONG = os.environ["TAVO"], os.environ["MAKE_SONG"]
LOUD_S = 20.0

_songs = tempfile.TemporaryDirectory()


def song(**options):
    """A song, made once for each set of options. Returns its path."""
    arguments = [f"--{k.replace('_', '-')}={v}" for k, v in sorted(options.items())]
    path = pathlib.Path(_songs.name, "".join(arguments) + ".wav")
    if not path.exists():
        subprocess.run([MAKE_SONG, path, *" ".join(arguments).replace("=", " ").split()],
                       check=True, stdout=subprocess.DEVNULL)
    return path


def standard_song():
    return song(seconds=60, bpm=120, loud_at=LOUD_S)


def short_song(seed=1):
    return song(seconds=8, bpm=120, loud_at=4, seed=seed)


def wav(seconds=2.0, rate=44100, channels=1, bits=16, tag=1, data_size=None, sample=b"\x12\x34"):
    """A WAV file's bytes, written independently of the project's own writer."""
    frame = channels * bits // 8
    data = (sample * (frame * 8))[:frame] * round(seconds * rate)
    size = len(data) if data_size is None else data_size
    head = b"RIFF" + struct.pack("<I", 36 + len(data)) + b"WAVEfmt "
    head += struct.pack("<IHHIIHH", 16, tag, channels, rate, rate * frame, frame, bits)
    return head + b"data" + struct.pack("<I", size) + data


# Words before a command that make root obey file permissions.
AS_ORDINARY_USER = [] if os.getuid() != 0 else [
    "setpriv", "--inh-caps=-all", "--bounding-set=-dac_override,-dac_read_search"]


def file_limit(size):
    """Options of a run: no file grows beyond so many bytes."""
    return {"preexec_fn": lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (size, size))}


class Case(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)
        os.chmod(self.folder, 0o755)

    def put(self, name, content=None, source=None):
        path = self.folder / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(pathlib.Path(source or short_song()).read_bytes() if content is None else content)
        return path

    def put_hours_of_silence(self, name, hours):
        """A song at 8000 Hz that takes no place on the disk."""
        size = 2 * 8000 * 3600 * hours
        head = wav(seconds=0, rate=8000, data_size=size)
        os.truncate(self.put(name, head), len(head) + size)

    def assert_only(self, *names):
        """The folder holds these files and nothing else, hidden ones counted."""
        self.assertEqual({p.name for p in self.folder.iterdir()}, set(names))

    def run_tavo(self, *arguments, status=0, before=(), **options):
        """Runs in the case's folder; arguments may be bytes. Output is bytes."""
        if "input" not in options:
            options["stdin"] = subprocess.DEVNULL
        done = subprocess.run([*before, TAVO, *arguments], capture_output=True, cwd=self.folder, timeout=250,
                              **options)
        self.assertEqual(done.returncode, status, (arguments, done.stdout, done.stderr))
        return done

    def objects(self, text):
        """Each line one JSON object in strict UTF-8, NaN and the like refused."""
        self.assertTrue(text == b"" or text.endswith(b"\n"), text)
        return [json.loads(line.decode("utf-8"), parse_constant=self.fail)
                for line in text.split(b"\n")[:-1]]

    def run_json(self, *arguments, status=0, **options):
        """The results, without the time that each took."""
        results = self.objects(self.run_tavo("--format", "json", *arguments, status=status, **options).stdout)
        for result in results:
            if result["status"] == "ok":
                self.assertGreaterEqual(result["cpu_ms"], 0)
            result.pop("cpu_ms", None)
        return results
