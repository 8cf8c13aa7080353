"""Tests clips and decoding with ffmpeg, and the offset between the command's times and a player's."""
import os
import pathlib
import signal
import subprocess

import numpy as np
from command_case import Case, children, song, wav

SONG = song(seconds=20, bpm=120, loud_at=8)

ENCODED = {  # file name: options for ffmpeg
    "24.wav": "-c:a pcm_s24le", "float.wav": "-c:a pcm_f32le", "96k.wav": "-ar 96000", "4k.wav": "-ar 4000",
    "a.aiff": "", "alac.m4a": "-c:a alac", "a.opus": "", "a.webm": "-c:a libopus", "a.wma": "",
    "-b:c.mkv": "-c:a flac",
    "late.mkv": "-f lavfi -i testsrc=size=64x64:rate=10:duration=20 -itsoffset 0.5 -i SONG -map 1 -map 2"}
FAILING = {  # script that replaces ffmpeg: part of the message
    "kill -9 $$": "ffmpeg was ended by signal 9", "echo '[x @ 0x1] bad box.' >&2; echo y >&2; exit 1": "ffmpeg: bad box.",
    "head -c 300000 a.wav; exit 3": "ffmpeg ended with status 3.",
    "head -c 44 a.wav; cat /dev/zero": "longer than a file of its size can hold", "exit 0": "decodes nothing", "exec sleep 60": ""}
CLIPPED = {"a.wav": "", "a.mp3": "", "bare.mp3": "-write_xing 0", "a.m4a": "", "a.flac": "", "a.ogg": "", "a.aac": "", "a.webm": "-c:a libopus",
           "late.mkv": ENCODED["late.mkv"]}
ENCODERS = {  # file name: command for n.wav
    "n.flac": "flac --totally-silent n.wav", "constant.mp3": "lame --quiet -b 128 n.wav constant.mp3",
    "variable.mp3": "lame --quiet -V 2 n.wav variable.mp3", "bare.mp3": "lame --quiet -t n.wav bare.mp3",
    "mono.mp3": "lame --quiet -m m n.wav mono.mp3", "n.m4a": "ffmpeg -v error -i n.wav -c:a aac -b:a 128k n.m4a",
    "edited.m4a": "cp n.m4a edited.m4a", "tagged.m4a": "ffmpeg -v error -i n.wav -metadata comment=" + "x" * 84 + " tagged.m4a",
    "n.aac": "ffmpeg -v error -i n.wav -c:a aac -b:a 128k n.aac", "n.ogg": "oggenc --quiet n.wav"}
OFFSETS = {"edited.m4a": 47.891, "tagged.m4a": 47.891, "n.m4a": 23.220, "bare.mp3": -11.995, "mono.mp3": 25.057,
           "constant.mp3": 13.061, "variable.mp3": 13.061}  # ms; 0 for other files
RATE, FRAME = 44100, 1152  # Hz; samples of the longest compressed frame
NAMING_OTHERS = {"a.m3u8": b"#EXTM3U\n#EXT-X-TARGETDURATION:60\n#EXTINF:60,\na.ts\n#EXT-X-ENDLIST\n",
                 "a.ffconcat": b"ffconcat version 1.0\nfile a.ts\n", "a.mkv": b"ffconcat version 1.0\nfile a.ts\n"}


def find(part, sound):
    """Returns the index in `sound` at which `part` fits best."""
    size = 1 << (len(part) + len(sound)).bit_length()  # the FFT of a prime number is slow
    return np.fft.irfft(np.fft.rfft(sound, size) * np.fft.rfft(part, size).conj(), size).argmax()


class Ffmpeg(Case):
    def encode(self, name, words):
        subprocess.run(["ffmpeg", "-nostdin", "-v", "error", "-i", SONG, *words.replace("SONG", str(SONG)).split(),
                        "file:" + name], cwd=self.folder, check=True)
        return self.folder / name

    def fake(self, script):
        program = self.put("bin/ffmpeg", b"#!/bin/sh\n" + script.encode() + b"\n")
        program.chmod(0o755)
        return {"env": {"PATH": f"{program.parent}:/usr/bin:/bin"}}

    def sound(self, path, filters="aresample=async=1:first_pts=0"):
        """Returns the samples that a player plays."""
        words = ["-i", path, "-af", filters, "-ac", "1", "-ar", str(RATE), "-f", "s16le", "-"]
        done = subprocess.run(["ffmpeg", "-nostdin", "-v", "error", *words], cwd=self.folder, check=True, capture_output=True)
        return np.frombuffer(done.stdout, np.int16).astype(float)

    def test_clips_start_and_end_at_the_players_time(self):
        for name, words in CLIPPED.items():
            self.encode(name, words)
        (self.folder / "clips").mkdir()
        for result in self.run_json("-m", "highlight", "-l", "5", "--clip", "clips", "."):
            (path,) = self.folder.glob(f"clips/{result['file'][2:]}.clip.*")
            clip, source = self.sound(path), self.sound(result["file"])
            self.assertAlmostEqual(len(clip), (result["hl_end_ms"] - result["hl_pos_ms"]) * RATE / 1000, delta=FRAME, msg=path)
            start = (result["hl_pos_ms"] - result["offset_ms"]) * RATE / 1000
            self.assertAlmostEqual(find(clip, source), start, delta=RATE / 1000, msg=path)
        self.assertEqual(len(os.listdir(self.folder / "clips")), len(CLIPPED))

    def test_offset_is_the_delay_of_the_library(self):
        """Finds part of the noise in the audio that a player plays and in the audio that the library decodes."""
        noise = np.random.default_rng(1).normal(0, 9000, 6 * RATE)
        samples = np.clip(noise + np.roll(noise, 1), -32768, 32767).astype("<i2").repeat(2)  # stereo
        self.put("n.wav", wav(channels=2, seconds=0)[:40] + samples.nbytes.to_bytes(4, "little") + samples.tobytes())
        part = self.sound("n.wav")[3 * RATE:4 * RATE]
        for name, command in ENCODERS.items():
            subprocess.run(command.split(), check=True, cwd=self.folder)
            path = self.folder / name
            if name == "edited.m4a":  # its edit list states the delay of Apple's encoder
                self.put(name, path.read_bytes().replace(b"\0\0\4\0\0\1\0\0", b"\0\0\x08\x40\0\1\0\0", 1))
            if name == "tagged.m4a":  # Apple's tag states the same delay and overrides the edit list
                tag = b"".join((len(atom) + 4).to_bytes(4, "big") + atom for atom in (
                    b"mean\0\0\0\0com.apple.iTunes", b"name\0\0\0\0iTunSMPB", b"data\0\0\0\1\0\0\0\0 00000000 00000840 00000000 00040998"))
                before, comment = path.read_bytes().split(b"\xa9cmt", 1)
                self.put(name, before + b"----" + tag + comment[len(tag):])
            (result,) = self.run_json("-m", "beats", "--force", "--click", "click.wav", name)  # the clicks are quiet
            late = (find(part, self.sound("click.wav")) - find(part, self.sound(name, "anull"))) * 1000 / RATE
            self.assertAlmostEqual(result["offset_ms"], late, delta=0.2, msg=name)
            self.assertEqual(result["offset_ms"], OFFSETS.get(name, 0), name)

    def test_clip_fades(self):
        self.put("a.wav", source=SONG)
        for name, fade in (("whole.wav", "0"), ("faded.wav", "2")):
            self.run_tavo("-l", "5", "--fade", fade, "--clip", name, "a.wav")
        whole, faded = self.sound("whole.wav"), self.sound("faded.wav")
        for second, level in ((0.0, 0.05), (0.95, 0.5), (2.45, 1.0), (3.95, 0.5), (4.9, 0.025)):
            part = slice(round(second * RATE), round((second + 0.1) * RATE))
            self.assertAlmostEqual(faded[part] @ whole[part] / (whole[part] @ whole[part]), level, delta=0.03, msg=second)

    def test_clip_that_fails_leaves_nothing(self):
        self.put("a.wav")
        half = self.fake('for last; do :; done; echo half > "${last#file:}"; echo no room >&2; exit 1')
        self.run_tavo("-l", "2", "--clip", "c.mp3", "a.wav", status=1, message=b"The clip c.mp3 cannot be written. ffmpeg: no room.", **half)
        self.run_tavo("-l", "2", "--clip", "c.txt", "a.wav", status=1, message=b"output format for 'file:c.txt'")
        self.assert_only("a.wav", "bin")

    def test_ffmpeg_decodes_refused_files(self):
        for name, words in ENCODED.items():
            self.encode(name, words)
        self.put("notes.txt", b"This is a letter, not a song.\n" * 99)
        results = self.run_json("--mode", "highlight", "-j", "2", "--report", "page.html", ".")
        self.assertEqual({r["file"][2:] for r in results}, set(ENCODED))
        for result in results:
            late = 500 if "late" in result["file"] else 0
            self.assertEqual(result["decoder"], "ffmpeg", result)
            self.assertAlmostEqual(result["duration_ms"], 20000 + late, delta=100, msg=result)
            self.assertAlmostEqual(result["hl_pos_ms"], 8000 + late, delta=400, msg=result)
        self.run_tavo("24.wav", status=1, message=b"ffmpeg, which may read it, is not installed", env={"PATH": "bin"})

    def test_a_pipe_is_read_like_a_file(self):
        for path in (SONG, self.encode("a.m4a", ""), self.encode("a.opus", "")):
            (piped,) = self.run_json("/dev/stdin", input=path.read_bytes())
            self.assertEqual(piped, {**self.run_json(path)[0], "file": "/dev/stdin"})
        self.run_tavo("/dev/stdin", input=b"RIFF", status=1, message=b"Only 4 bytes")

    def test_files_cannot_name_other_files(self):
        self.encode("a.ts", "")
        self.assertEqual(self.run_json("a.ts")[0]["decoder"], "ffmpeg")
        for name, content in NAMING_OTHERS.items():
            self.put(name, content)
            self.run_tavo(name, status=1, message=b"Format not on whitelist")

    def test_failing_ffmpeg_fails_only_its_file(self):
        self.put("a.wav")
        self.put("b.mkv", b"no song at all" * 9)
        for script, message in FAILING.items():
            fake = self.fake(script)
            if not message:
                break
            results = self.run_json("b.mkv", "a.wav", status=1, **fake)
            self.assertEqual([r["status"] for r in results], ["failed", "ok"])
            self.assertIn(message, results[0]["error"])
        idle = self.start("b.mkv", **fake)
        stopped = self.start("-f", "json", "b.mkv", **fake)
        (worker,) = self.wait_until(lambda: children(stopped.pid))
        (child,) = self.wait_until(lambda: children(worker))
        stopped.send_signal(signal.SIGINT)
        self.assertEqual(stopped.wait(10), 130)
        self.assertFalse(pathlib.Path(f"/proc/{child}").exists())
        self.assertIn(b"ffmpeg made no progress for 30 s", idle.communicate(timeout=60)[1])
