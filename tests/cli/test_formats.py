"""Checks that a song has the same result in every format, except for changes by the encoder."""
import array
import operator
import random
import subprocess

from command_case import SONGS, Case, wav

# The delay of an encoder shifts the song relative to the analysis frames, which can shift beats by one frame (23 ms).
# So an encoded song is compared with a lossless one that has the same delay.
LATE = {"constant.mp3": "late_576.flac", "variable.mp3": "late_576.flac", "variable_bare.mp3": "late_576.flac",
        "song.aac": "late_1024.flac", "song.m4a": "late_1024.flac", "song.ogg": "song.flac"}


ENCODERS = {
    "n.flac": "flac --totally-silent n.wav", "constant.mp3": "lame --quiet -b 128 n.wav constant.mp3",
    "variable.mp3": "lame --quiet -V 2 n.wav variable.mp3", "bare.mp3": "lame --quiet -t n.wav bare.mp3",
    "mono.mp3": "lame --quiet -m m n.wav mono.mp3", "n.m4a": "ffmpeg -v error -i n.wav -c:a aac -b:a 128k n.m4a",
    "edited.m4a": "cp n.m4a edited.m4a", "tagged.m4a": "ffmpeg -v error -i n.wav -metadata comment=" + "x" * 84 + " tagged.m4a",
    "n.aac": "ffmpeg -v error -i n.wav -c:a aac -b:a 128k n.aac",
    "n.ogg": "oggenc --quiet n.wav"}


def lag(sound, reference):
    """Returns the delay of one sound relative to another in milliseconds, both at 11025 Hz."""
    part = reference[30000:32000]
    lags = range(-700, 700)
    return max(lags, key=lambda k: sum(map(operator.mul, part, sound[30000 + k:]))) / 11.025


def share_near(beats, others):
    """Returns the fraction of the beats that are within 25 ms of one of the others."""
    return sum(any(abs(beat - other) <= 25 for other in others) for beat in beats) / len(beats)


class Formats(Case):
    def test_the_same_song(self):
        for mode in ("highlight", "beats", "both"):
            results = self.run_json("--mode", mode, *LATE, *LATE.values(), "song.wav", cwd=SONGS)
            found = {result.pop("file"): result for result in results}
            plain = found["song.wav"]
            self.assertEqual(found["song.flac"], plain)  # FLAC is lossless
            # The result is a whole second, because a WAV file can only seek to whole seconds.
            self.assertEqual(plain.get("hl_pos_ms"), None if mode == "beats" else 31000)
            self.assertEqual(plain.get("beat_count", 0) > 20, mode != "highlight")
            for name, late in LATE.items():
                with self.subTest(mode=mode, name=name):
                    self.assertEqual(found[name].get("bpm"), plain.get("bpm"))
                    if mode != "beats":
                        self.assertAlmostEqual(found[name]["hl_pos_ms"], 31000, delta=400)  # resolution of the refinement
                    if mode != "highlight":
                        beats, others = found[name]["beats_ms"], found[late]["beats_ms"]
                        self.assertGreaterEqual(min(share_near(beats, others), share_near(others, beats)), 0.95)

    def player_sound(self, name):
        """Returns the samples as FFmpeg plays them."""
        return array.array("h", subprocess.run(
            ["ffmpeg", "-v", "error", "-i", name, "-f", "s16le", "-ac", "1", "-ar", "11025", "-"], check=True,
            capture_output=True, cwd=self.folder).stdout)

    def library_sound(self, name):
        """Returns the samples as the library analyses them, plus clicks far below the noise."""
        self.run_tavo("-q", "-m", "beats", "--force", "--click", "click.wav", name)
        return array.array("h", (self.folder / "click.wav").read_bytes()[44:])

    def test_times_of_players(self):
        noise = random.Random(1)
        levels = [noise.gauss(0, 9000) for _ in range(6 * 44100)]
        samples = array.array("h", (max(min(int(a + b), 32767), -32768) for a, b in zip(levels, levels[1:])))
        samples = array.array("h", (sample for sample in samples for _ in range(2)))  # stereo
        self.put("n.wav", wav(channels=2, seconds=0)[:40] + (2 * len(samples)).to_bytes(4, "little") + samples.tobytes())
        player, library = self.player_sound("n.wav"), self.library_sound("n.wav")
        for name, command in ENCODERS.items():
            subprocess.run(command.split(), check=True, cwd=self.folder)
            if name == "edited.m4a":  # with the delay of Apple's encoder
                self.put(name, (self.folder / name).read_bytes().replace(
                    (1024).to_bytes(4, "big") + b"\0\1\0\0", (2112).to_bytes(4, "big") + b"\0\1\0\0", 1))
            if name == "tagged.m4a":  # the same delay in Apple's tag, which counts for more than the edit list
                tag = b"".join((len(atom) + 4).to_bytes(4, "big") + atom for atom in (
                    b"mean\0\0\0\0com.apple.iTunes", b"name\0\0\0\0iTunSMPB", b"data\0\0\0\1\0\0\0\0 00000000 00000840 00000000 00040998"))
                whole = (self.folder / name).read_bytes()
                comment = whole.index(b"\xa9cmt")
                self.put(name, whole[:comment] + b"----" + tag + whole[comment + 4 + len(tag):])
            with self.subTest(name=name):
                (result,) = self.run_json("-m", "beats", name)
                late = lag(self.library_sound(name), library) - lag(self.player_sound(name), player)
                self.assertAlmostEqual(result["offset_ms"], late, delta=0.2)
                offsets = {"edited.m4a": 47.891, "tagged.m4a": 47.891, "n.m4a": 23.220, "bare.mp3": -11.995, "mono.mp3": 25.057}
                self.assertEqual(result["offset_ms"], offsets.get(name, 13.061 if "mp3" in name else 0))
