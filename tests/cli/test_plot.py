"""Pictures: well-formed, with marks where the results say, and whole or not there."""
import os
import re
import signal
import struct
import subprocess
import time
import xml.etree.ElementTree as ElementTree

from command_case import TAVO, Case, main, short_song, song, standard_song, wav

SVG = "{http://www.w3.org/2000/svg}"
FULL_SCALE = 32768


def seconds(label):
    total = 0.0
    for part in label.split(":"):
        total = 60 * total + float(part)
    return total


class Picture:
    def __init__(self, path):
        self.bytes = path.read_bytes()
        self.root = ElementTree.fromstring(self.bytes)
        assert self.root.tag == SVG + "svg", self.root.tag
        self.named = {e.get("id"): e for e in self.root.iter() if e.get("id")}
        self.texts = [e.text for e in self.root.iter(SVG + "text")]
        self.title = self.root.find(SVG + "title").text
        self.times = [(float(e.get("x")), seconds(e.text)) for e in self.named["times"]]

    def x_of(self, ms):
        """By the labels of the time axis, as a reader of the picture finds it."""
        (x0, s0), (x1, s1) = self.times[0], self.times[-1]
        return x0 + (ms / 1000 - s0) * (x1 - x0) / (s1 - s0)

    def ticks(self):
        return [float(x) for x in re.findall(r"M(-?[\d.]+) ", self.named["beats"].get("d"))]

    def points(self, name):
        return [(float(x), float(y))
                for x, y in re.findall(r"[ML]([-\d.]+) ([-\d.]+)", self.named[name].get("d"))]


class Plot(Case):
    def draw(self, name, *arguments):
        (result,) = self.run_json("--plot", "out.svg", "--force", *arguments, name)
        return result, Picture(self.folder / "out.svg")

    def assert_only(self, *names):
        self.assertEqual(sorted(p.name for p in self.folder.iterdir()), sorted(names))

    def put_silence(self, name, seconds):
        """A song of zeros at 8000 Hz that takes no place on the disk."""
        head = wav(seconds=1, rate=8000)
        size = 2 * 8000 * seconds
        with open(self.folder / name, "wb") as file:
            file.write(head[:4] + struct.pack("<I", 36 + size) + head[8:40])
            file.write(struct.pack("<I", size))
            file.truncate(44 + size)

    def test_marks_stand_where_the_results_say(self):
        self.put("song.wav", source=standard_song())
        result, picture = self.draw("song.wav", "--length", "12")
        start = result["hl_pos_ms"]
        mark = picture.named["highlight"]
        self.assertEqual(mark.get("x1"), mark.get("x2"))
        self.assertAlmostEqual(float(mark.get("x1")), picture.x_of(start), delta=1)
        region = picture.named["region"]
        self.assertAlmostEqual(float(region.get("x")), picture.x_of(start), delta=1)
        end = float(region.get("x")) + float(region.get("width"))
        self.assertAlmostEqual(end, picture.x_of(start + 12000), delta=1)
        self.assertEqual(len(picture.ticks()), result["beat_count"])
        for x, ms in zip(picture.ticks(), result["beats_ms"]):
            self.assertAlmostEqual(x, picture.x_of(ms), delta=1)
        self.assertIn(f"{result['bpm']} BPM", picture.texts)
        self.assertIn("highlight 0:", " ".join(picture.texts))

    def test_each_mode_draws_what_it_finds(self):
        self.put("song.wav", source=standard_song())
        for mode, marks in (("highlight", {"highlight"}), ("beats", {"beats"}),
                            ("both", {"highlight", "beats"})):
            with self.subTest(mode=mode):
                result, picture = self.draw("song.wav", "--mode", mode)
                self.assertEqual(picture.named.keys() & {"highlight", "beats", "region"}, marks)
                self.assertEqual("BPM" in " ".join(picture.texts), mode != "highlight")
                if "beats" in marks:
                    self.assertEqual(len(picture.ticks()), result["beat_count"])

    def test_the_sound(self):
        # 10 s: half a full-scale square wave (mean square 1/4) from 4 s on, silence before.
        rate, level = 8000, FULL_SCALE // 2
        loud = b"".join(struct.pack("<h", level if i // 40 % 2 else -level)
                        for i in range(6 * rate))
        whole = wav(seconds=10, rate=rate)
        self.put("steps.wav", whole[:44] + bytes(2 * 4 * rate) + loud)
        _, picture = self.draw("steps.wav", "--mode", "highlight")
        points = picture.points("waveform")
        middle = (min(y for _, y in points) + max(y for _, y in points)) / 2
        edge = picture.x_of(4000)
        for x, y in points:
            if x < edge - 1.5:
                self.assertAlmostEqual(y, middle, delta=0.2)
            elif x > edge + 1.5:
                self.assertGreater(abs(y - middle), 20)
        self.assertIn("peak 50 %", picture.texts)
        # Windows of 6 s at 0, 2 and 4 s, drawn at their middles: 2, 4 and 6 s of sound in each.
        curve = picture.points("loudness")
        self.assertEqual(len(curve), 3)
        for (x, _), ms in zip(curve, (3000, 5000, 7000)):
            self.assertAlmostEqual(x, picture.x_of(ms), delta=1)
        self.assertEqual([y for _, y in curve], sorted((y for _, y in curve), reverse=True))
        # 10 log10(1 + part / 4) for a third, two thirds and the whole: 0.348, 0.669, 0.969.
        self.assertIn("0.97", picture.texts)
        self.assertIn("mean 0.66", picture.texts)
        mean = float(picture.named["mean"].get("y1"))
        self.assertAlmostEqual(mean, sum(y for _, y in curve) / 3, delta=0.5)

    def test_time_axes(self):
        self.put("short.wav", source=song(seconds=1.5, bpm=120))
        self.put_silence("long.wav", 3 * 3600)
        for name, last in (("short.wav", 1.5), ("long.wav", 3 * 3600)):
            with self.subTest(name=name):
                _, picture = self.draw(name, "--mode", "highlight")
                places = [x for x, _ in picture.times]
                gaps = [b - a for a, b in zip(places, places[1:])]
                self.assertTrue(5 <= len(places) <= 15, places)
                self.assertGreater(min(gaps), 70)
                self.assertLess(max(gaps) - min(gaps), 0.3)
                self.assertGreater(picture.times[-1][1], 0.8 * last)
                self.assertGreater(places[0], 0)
                self.assertLess(places[-1], 1170)

    def test_a_crowd_of_beats_is_stacked(self):
        self.put("crowd.wav", source=song(seconds=1500, bpm=120, rate=8000, channels=1))
        result, picture = self.draw("crowd.wav", "--mode", "beats")
        self.assertGreater(result["beat_count"], 500)
        self.assertEqual(len(picture.ticks()), result["beat_count"])
        self.assertLess(len(set(picture.ticks())), result["beat_count"])
        for x, ms in zip(picture.ticks(), result["beats_ms"]):
            self.assertAlmostEqual(x, picture.x_of(ms), delta=2.1)  # the middle of 4 pixels

    def test_names(self):
        for name, title in ((b"a<b>&\"c\"' ]]>.wav", "a<b>&\"c\"' ]]>.wav"),
                            (b"caf\xc3\xa9 \xff\xfe.wav", "café \ufffd\ufffd.wav"),
                            (b"tab\tnewline\n\x01.wav", "tab\ufffdnewline\ufffd\ufffd.wav"),
                            (b"no character \xef\xbf\xbf.wav", "no character \ufffd.wav"),
                            (b"[1,2].wav", "[1,2].wav")):
            with self.subTest(name=name):
                os.replace(self.put("plain.wav"), os.path.join(os.fsencode(self.folder), name))
                self.run_tavo("--plot", b"out.svg", "--force", name)
                picture = Picture(self.folder / "out.svg")
                self.assertEqual((picture.title, picture.texts[0]), (title, title))
        os.replace(self.put("plain.wav"), self.folder / ("w" * 250 + ".wav"))
        _, picture = self.draw("w" * 250 + ".wav")
        self.assertEqual(picture.title, "w" * 250 + ".wav")
        self.assertTrue(len(picture.texts[0]) < 130 and picture.texts[0].endswith("…"))

    def test_the_same_on_every_run(self):
        self.put("song.wav")
        self.assertEqual(self.draw("song.wav")[1].bytes, self.draw("song.wav")[1].bytes)

    def test_beside_other_files(self):
        self.put("song.wav")
        self.run_tavo("--plot", "[p,q].svg", "--click", "c.wav", "--format", "labels", "song.wav")
        self.assert_only("song.wav", "song.wav.labels.txt", "c.wav", "[p,q].svg")

    def test_more_than_one_file_is_wrong_usage(self):
        self.put("a.wav")
        self.put("b.wav")
        for arguments in (["a.wav", "b.wav"], ["."], ["-"], ["--files-from", "l", "a.wav"]):
            with self.subTest(arguments=arguments):
                done = self.run_tavo("--plot", "p.svg", *arguments, status=2)
                self.assertIn(b"--plot takes exactly one audio file", done.stderr)
        self.run_tavo("--plot", "p", "--click", "p", "a.wav", status=2)
        self.assert_only("a.wav", "b.wav")

    def test_what_exists_stays(self):
        before = self.put("song.wav").read_bytes()
        self.put("p.svg", b"mine\n")
        done = self.run_tavo("--plot", "p.svg", "song.wav", status=1)
        self.assertIn(b"--force", done.stderr)
        self.assertEqual((self.folder / "p.svg").read_bytes(), b"mine\n")
        (self.folder / "link.svg").symlink_to("/dev/null")
        for place in ("song.wav", "./song.wav", ".", "link.svg", "/dev/null"):
            with self.subTest(place=place):
                self.run_tavo("--force", "--plot", place, "song.wav", status=1)
        self.assertEqual((self.folder / "song.wav").read_bytes(), before)
        self.assertTrue((self.folder / "link.svg").is_symlink())
        self.run_tavo("--force", "--plot", "p.svg", "song.wav")
        self.assertTrue(Picture(self.folder / "p.svg").named["beats"] is not None)
        self.assert_only("song.wav", "p.svg", "link.svg")

    def test_failures_leave_nothing(self):
        self.put("song.wav")
        self.put("silent.wav", wav(seconds=3, sample=bytes(32)))
        self.put("bad.wav", b"RIFF" * 40)
        for name in ("silent.wav", "bad.wav", "missing.wav"):
            self.run_tavo("--plot", "p.svg", name, status=1)
        done = self.run_tavo("--plot", "nowhere/p.svg", "song.wav", status=1)
        self.assertIn(b"nowhere/p.svg cannot be written", done.stderr)
        self.assertEqual(done.stdout, b"")
        limit = ["prlimit", "--fsize=4096", TAVO, "--plot", "p.svg", "song.wav"]
        done = subprocess.run(limit, capture_output=True, cwd=self.folder)
        self.assertEqual(done.returncode, 1)
        self.assertIn(b"cannot be written: file too large", done.stderr)
        self.assert_only("song.wav", "silent.wav", "bad.wav")

    def test_a_stop_while_drawing(self):
        # A stop at any moment: no picture, or all of it. About half of the time is drawing.
        self.put_silence("song.wav", 3 * 3600)
        arguments = [TAVO, "--plot", "p.svg", "--mode", "highlight", "song.wav"]
        start = time.monotonic()
        subprocess.run(arguments, cwd=self.folder, check=True, stdout=subprocess.DEVNULL)
        took = time.monotonic() - start
        for part in (0.2, 0.5, 0.6, 0.7, 0.8, 0.9, 0.95):
            (self.folder / "p.svg").unlink(missing_ok=True)
            run = subprocess.Popen(arguments, cwd=self.folder, stdout=subprocess.DEVNULL,
                                   stderr=subprocess.DEVNULL)
            time.sleep(part * took)
            run.send_signal(signal.SIGINT)
            status = run.wait(60)
            if (self.folder / "p.svg").exists():
                Picture(self.folder / "p.svg")
                self.assert_only("song.wav", "p.svg")
            else:
                self.assertIn(status, (128 + signal.SIGINT, -signal.SIGINT))
                self.assert_only("song.wav")


if __name__ == "__main__":
    main()
