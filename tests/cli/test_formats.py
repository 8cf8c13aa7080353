"""The same song gives the same result in every format, up to what its encoder changes."""
from command_case import SONGS, Case

# An encoder's delay moves the song between the frames of the analysis, which moves beats by a frame of
# 23 ms either way. So an encoded song is compared with one that has lost nothing and comes as late.
LATE = {"constant.mp3": "late_576.flac", "variable.mp3": "late_576.flac", "variable_bare.mp3": "late_576.flac",
        "song.aac": "late_1024.flac", "song.m4a": "late_1024.flac", "song.ogg": "song.flac"}


def share_near(beats, others):
    """The share of the beats that have one of the others within 25 ms."""
    return sum(any(abs(beat - other) <= 25 for other in others) for beat in beats) / len(beats)


class Formats(Case):
    def test_the_same_song(self):
        for mode in ("highlight", "beats", "both"):
            results = self.run_json("--mode", mode, *LATE, *LATE.values(), "song.wav", cwd=SONGS)
            found = {result.pop("file"): result for result in results}
            plain = found["song.wav"]
            self.assertEqual(found["song.flac"], plain)  # nothing is lost
            # A whole second, which a seek in the WAV file reaches as well.
            self.assertEqual(plain.get("hl_pos_ms"), None if mode == "beats" else 31000)
            self.assertEqual(plain.get("beat_count", 0) > 20, mode != "highlight")
            for name, late in LATE.items():
                with self.subTest(mode=mode, name=name):
                    self.assertEqual(found[name].get("bpm"), plain.get("bpm"))
                    if mode != "beats":
                        self.assertAlmostEqual(found[name]["hl_pos_ms"], 31000, delta=400)  # of the finest search
                    if mode != "highlight":
                        beats, others = found[name]["beats_ms"], found[late]["beats_ms"]
                        self.assertGreaterEqual(min(share_near(beats, others), share_near(others, beats)), 0.95)
