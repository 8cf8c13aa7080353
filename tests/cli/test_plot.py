"""Pictures: well-formed, with marks where the results say."""
import os
import re
import struct
import xml.etree.ElementTree as ElementTree

from command_case import Case, seconds, song, standard_song, wav

SVG = "{http://www.w3.org/2000/svg}"
MARKS = {"highlight": {"highlight", "region"}, "beats": {"beats"}, "both": {"highlight", "region", "beats"}}


class Picture:
    def __init__(self, path):
        self.root = ElementTree.parse(path).getroot()
        assert self.root.tag == SVG + "svg", self.root.tag
        self.named = {e.get("id"): e for e in self.root.iter() if e.get("id")}
        self.texts = [e.text for e in self.root.iter(SVG + "text")]
        self.times = [(float(e.get("x")), seconds(e.text)) for e in self.named["times"]]

    def x_of(self, ms):
        """By the labels of the time axis, as a reader of the picture finds it."""
        (x0, s0), (x1, s1) = self.times[0], self.times[-1]
        return x0 + (ms / 1000 - s0) * (x1 - x0) / (s1 - s0)

    def number(self, name, attribute):
        return float(self.named[name].get(attribute))

    def points(self, name, pattern=r"[ML]([-\d.]+) ([-\d.]+)"):
        return [(float(x), float(y)) for x, y in re.findall(pattern, self.named[name].get("d"))]


class Plot(Case):
    def draw(self, name, *arguments):
        (result,) = self.run_json("--plot", "out.svg", "--force", *arguments, name)
        return result, Picture(self.folder / "out.svg")

    def assert_at(self, picture, places, times_ms):
        self.assertEqual(len(places), len(times_ms))
        for x, ms in zip(places, times_ms):
            self.assertAlmostEqual(x, picture.x_of(ms), delta=1)

    def test_marks_stand_where_the_results_say(self):
        self.put("song.wav", source=standard_song())
        for mode, marks in MARKS.items():
            result, picture = self.draw("song.wav", "--mode", mode, "--length", "12")
            words = " ".join(picture.texts)
            self.assertEqual(picture.named.keys() & MARKS["both"], marks)
            self.assertEqual(("BPM" in words, "highlight 0:" in words), (mode != "highlight", mode != "beats"))
            if mode != "highlight":
                self.assert_at(picture, [x for x, _ in picture.points("beats")], result["beats_ms"])
                label = "beats from the highlight on" if mode == "both" else "beats"
                self.assertIn(f"{result['beat_count']} {label}, {result['bpm']} BPM", picture.texts)
            if mode != "beats":
                left = picture.number("region", "x")
                edges = [picture.number("highlight", "x1"), picture.number("highlight", "x2"), left]
                self.assert_at(picture, edges, 3 * [result["hl_pos_ms"]])
                self.assert_at(picture, [left + picture.number("region", "width")], [result["hl_end_ms"]])
        self.assertIn("prefers-color-scheme: dark", picture.root.find(SVG + "style").text)
        self.assertNotIn("region", self.draw("song.wav", "--mode", "highlight")[1].named)

    def test_the_sound(self):
        # 10 s: half a full-scale square wave (mean square 1/4) from 4 s on, silence before.
        rate, level = 8000, 32768 // 2
        loud = b"".join(struct.pack("<h", level if i // 40 % 2 else -level) for i in range(6 * rate))
        self.put("steps.wav", wav(seconds=10, rate=rate)[:44] + bytes(2 * 4 * rate) + loud)
        _, picture = self.draw("steps.wav", "--mode", "highlight")
        points, edge = picture.points("waveform"), picture.x_of(4000)
        middle = (min(y for _, y in points) + max(y for _, y in points)) / 2
        self.assertLess(max(abs(y - middle) for x, y in points if x < edge - 1.5), 0.2)
        self.assertGreater(min(abs(y - middle) for x, y in points if x > edge + 1.5), 20)
        # Windows of 6 s at 0, 2 and 4 s, drawn at their middles: 2, 4 and 6 s of sound in each.
        curve = picture.points("loudness")
        self.assert_at(picture, [x for x, _ in curve], (3000, 5000, 7000))
        heights = [y for _, y in curve]
        self.assertEqual(heights, sorted(heights, reverse=True))
        # 10 log10(1 + part / 4) for a third, two thirds and the whole: 0.348, 0.669, 0.969. The
        # greatest stands for a mean square of 1/4, -6.0 dB, the mean (0.662) for 0.165, -7.8 dB.
        for words in ("waveform, peak 50 %", "-6.0 dB", "loudness, mean -7.8 dB", "silence"):
            self.assertIn(words, picture.texts)
        self.assertAlmostEqual(picture.number("mean", "y1"), sum(heights) / 3, delta=0.5)

    def test_margins_that_are_not_searched_are_shaded(self):
        # (length, shaded): values every 2 s over 6 s, rises from value 9 (in songs under 90 s: 0) to
        # value n - 25 (n - 10), and to the end of the window there.
        for length, shaded in ((60, (0, 0, 42, 60)), (100, (0, 18, 52, 100)), (20, (0, 0, 0, 20))):
            self.put("song.wav", source=song(seconds=length, bpm=120, rate=8000, channels=1))
            _, picture = self.draw("song.wav", "--mode", "highlight")
            boxes = picture.points("unsearched", r"M([\d.]+) [\d.]+H([\d.]+)")
            self.assert_at(picture, [x for box in boxes for x in box], [1000 * s for s in shaded])
        self.assertNotIn("unsearched", self.draw("song.wav", "--mode", "beats")[1].named)

    def test_names(self):
        for name, title in ((b"a<b>&\"c\"' ]]>.wav", "a<b>&\"c\"' ]]>.wav"),
                            (b"tab\tcaf\xc3\xa9 \xff\xef\xbf\xbf.wav", "tab\ufffdcaf\u00e9 \ufffd\ufffd.wav"),
                            (b"w" * 250 + b".wav", "w" * 250 + ".wav")):
            self.put(os.fsdecode(name))
            _, picture = self.draw(name)
            self.assertEqual(picture.root.find(SVG + "title").text, title)
            shown = picture.texts[0]
            self.assertTrue(shown == title or (shown[:45] == title[:45] and shown[-1] == "\u2026"))
            self.assertLess(len(shown), 60)
