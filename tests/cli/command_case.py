"""What the tests of the command share: running it, songs, files that cannot be used."""
import json
import os
import pathlib
import shutil
import struct
import subprocess
import sys
import tempfile
import unittest

TAVO, MAKE_SONG = (os.path.abspath(sys.argv.pop(1)) for _ in range(2))
HIT_GRID_S = 0.5  # 120 BPM, first hit at 0.5 s
LOUD_S = 20.0

_songs = tempfile.TemporaryDirectory()


def song(name="song.wav", **options):
    """A song, made once for each set of options. Returns its path."""
    key = "-".join(f"{k}{v}" for k, v in sorted(options.items()))
    path = pathlib.Path(_songs.name, f"{key}-{name}")
    if not path.exists():
        arguments = [f"--{k.replace('_', '-')}={v}".split("=") for k, v in options.items()]
        subprocess.run([MAKE_SONG, path, *sum(arguments, [])], check=True,
                       stdout=subprocess.DEVNULL)
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


class Case(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def put(self, name, content=None, source=None):
        path = self.folder / name
        path.parent.mkdir(parents=True, exist_ok=True)
        if content is None:
            shutil.copy(source or short_song(), path)
        else:
            path.write_bytes(content)
        return path

    def run_tavo(self, *arguments, status=0, **options):
        """Runs in the case's folder; arguments may be bytes. Output is bytes."""
        options.setdefault("stdin", subprocess.DEVNULL)
        if "input" in options:
            options.pop("stdin")
        done = subprocess.run([TAVO, *arguments], capture_output=True, cwd=self.folder,
                              timeout=250, **options)
        self.assertEqual(done.returncode, status, (arguments, done.stdout, done.stderr))
        return done

    def objects(self, text):
        """Each line one JSON object in strict UTF-8, NaN and the like refused."""
        self.assertTrue(text == b"" or text.endswith(b"\n"), text)

        def refuse(word):
            raise ValueError(word)

        return [json.loads(line.decode("utf-8"), parse_constant=refuse)
                for line in text.split(b"\n")[:-1]]

    def run_json(self, *arguments, status=0, **options):
        done = self.run_tavo("--format", "json", *arguments, status=status, **options)
        return self.objects(done.stdout)


def children_of(pid):
    try:
        text = pathlib.Path(f"/proc/{pid}/task/{pid}/children").read_text()
    except FileNotFoundError:
        return []
    return [int(word) for word in text.split()]


def main():
    if not os.access(TAVO, os.X_OK) or not os.access(MAKE_SONG, os.X_OK):
        sys.exit("the command or make_song is missing")
    unittest.main()
