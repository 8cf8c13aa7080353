"""Marker files, read by other programs or by rules that the editors publish."""
import csv
import io
import json
import re
import subprocess
import urllib.parse
import xml.etree.ElementTree as ElementTree

from command_case import Case, song, standard_song

NAME = "a<b>&\"c\" é.wav"  # as hard as a name can be for XML and for a URL
FPS = {  # frames a second, numbers a second in the timecode, numbers dropped a minute
    "23.976": (24000 / 1001, 24, 0), "24": (24, 24, 0), "25": (25, 25, 0), "29.97": (30000 / 1001, 30, 0),
    "29.97df": (30000 / 1001, 30, 2), "30": (30, 30, 0), "50": (50, 50, 0), "59.94": (60000 / 1001, 60, 0),
    "59.94df": (60000 / 1001, 60, 4), "60": (60, 60, 0)}
# What each element may hold, and the attributes that it must have: Final Cut Pro's DTD, as far as it is used.
FCPXML = {"fcpxml": ("resources project", "version"), "resources": ("format asset", ""),
          "format": ("", "id frameDuration"), "asset": ("", "id src start duration hasAudio"),
          "project": ("sequence", "name"), "sequence": ("spine", "format duration"), "spine": ("asset-clip", ""),
          "asset-clip": ("marker", "ref duration"), "marker": ("", "start duration value")}


def timecodes(base, dropped, count):
    """The names of so many frames from one hour on, counted one by one: a drop-frame timecode leaves
    out the first numbers of a minute, but not of each tenth one."""
    names = {}
    number = 3600 * base
    while len(names) < count:
        second, frame = divmod(number, base)
        if second % 60 or frame >= dropped or second // 60 % 10 == 0:
            name = f"{second // 3600:02}:{second // 60 % 60:02}:{second % 60:02}{';' if dropped else ':'}{frame:02}"
            names[name] = len(names)
        number += 1
    return names


def seconds(text):
    """hh:mm:ss.mmm, mm:ss.mmm or seconds, as Kdenlive takes them."""
    return sum(float(part) * 60 ** i for i, part in enumerate(reversed(text.split(":"))))


def chapters(path):
    said = subprocess.run(["ffprobe", "-v", "error", "-show_chapters", "-of", "json", path], check=True,
                          capture_output=True).stdout
    return [(float(c["start_time"]), float(c["end_time"]), c["tags"]["title"]) for c in json.loads(said)["chapters"]]


class Markers(Case):
    def setUp(self):
        super().setUp()
        self.put(NAME, source=standard_song())

    def write(self, form, *arguments, fps=()):
        """The file that the format makes, and the marks it should have: start and end in seconds, name."""
        (result,) = self.run_json(*arguments, NAME)
        done = self.run_tavo("--format", form, "--force", *fps, *arguments, NAME)
        marks = [(ms / 1000, ms / 1000, f"beat {i}") for i, ms in enumerate(result.get("beats_ms", []), 1)]
        if "hl_pos_ms" in result:
            start = result["hl_pos_ms"]
            marks.insert(0, (start / 1000, result.get("hl_end_ms", min(start + 30000, 60000)) / 1000, "highlight"))
        return (self.folder / done.stdout.decode().strip()).read_text(), marks

    def assert_marks(self, found, expected, delta=0.0006):
        self.assertEqual([mark[-1] for mark in found], [mark[-1] for mark in expected])
        for mark, wanted in zip(found, expected):
            for time, right in zip(mark[:-1], wanted[:-1]):
                self.assertAlmostEqual(time, right, delta=delta)

    def test_lines(self):
        for words in ("", "--length 12", "--mode highlight", "--mode beats"):
            arguments = words.split()
            text, marks = self.write("labels", *arguments)
            labels = [line.split("\t") for line in text.splitlines()]
            self.assert_marks([(float(a), float(b), name) for a, b, name in labels], marks)
            text, _ = self.write("kdenlive", *arguments)
            guides = [line.split(" ", 1) for line in text.splitlines()]
            self.assert_marks([(seconds(time), name) for time, name in guides], [(m[0], m[2]) for m in marks])
            text, _ = self.write("reaper", *arguments)
            rows = list(csv.DictReader(io.StringIO(text), strict=True))
            self.assert_marks([(seconds(r["Start"]), seconds(r["End"] or r["Start"]), r["Name"]) for r in rows], marks)
            for row, (start, end, _) in zip(rows, marks):
                self.assertRegex(row["#"], r"R\d+" if end > start else r"M\d+")
                self.assertAlmostEqual(seconds(row["Length"] or "0"), end - start, delta=0.002)
        text, marks = self.write("losslesscut", "--length", "12")
        starts = [mark[0] for mark in marks[1:]] + [60.0]
        segments = [(a, b, f"beat {i}") for i, (a, b) in enumerate(zip(starts, starts[1:]), 1)]
        self.assert_marks([(float(a), float(b), name) for a, b, name in csv.reader(io.StringIO(text))],
                          [marks[0]] + segments)

    def test_chapters_in_an_m4a(self):
        for words in ("--length 12", "--length 12 --mode highlight"):
            text, marks = self.write("ffmetadata", *words.split())
            self.put("chapters", text.encode())
            subprocess.run(["ffmpeg", "-v", "error", "-y", "-i", NAME, "-i", "chapters", "-map_chapters", "1",
                            "song.m4a"], check=True, cwd=self.folder)
            points = [(0.0, "start")] + [(start, name) for start, _, name in marks]
            points += [(marks[0][1], "after")] if len(marks) == 1 else []
            ends = [start for start, _ in points[1:]] + [60.0]
            self.assert_marks(chapters(self.folder / "song.m4a"),
                              [(start, end, name) for (start, name), end in zip(points, ends)], 0.002)

    def test_frames(self):
        """In a song of some minutes, whose starts drop frames."""
        self.put(NAME, source=song(seconds=190, bpm=120, rate=8000, channels=1))
        for fps, (rate, base, dropped) in FPS.items():
            text, marks = self.write("edl", "--mode", "beats", fps=("--fps", fps))
            self.assertTrue(text.startswith(f"TITLE: {NAME}\nFCM: {'' if dropped else 'NON-'}DROP FRAME\n"))
            number = timecodes(base, dropped, 200 * base)
            events = re.findall(r"\n(\d{3,})  001      V     C        (\S+) (\S+) \2 \3\n"
                                r" \|C:ResolveColor\w+ \|M:(.*) \|D:1\n", text)
            self.assertEqual([int(event[0]) for event in events], [*range(1, len(marks) + 1)])
            self.assert_marks([(number[e[1]] / rate, e[3]) for e in events], [(m[0], m[2]) for m in marks],
                              0.501 / rate)
            self.assertTrue(all(number[e[2]] == number[e[1]] + 1 for e in events))

    def test_fcpxml(self):
        for fps in ("29.97df", "25"):
            text, marks = self.write("fcpxml", "--length", "12", fps=("--fps", fps))
            self.assertTrue(text.startswith('<?xml version="1.0" encoding="UTF-8"?>\n<!DOCTYPE fcpxml>'))
            root = ElementTree.fromstring(text)
            for element in root.iter():
                children, attributes = (set(words.split()) for words in FCPXML[element.tag])
                self.assertLessEqual(attributes, element.attrib.keys(), element.tag)
                self.assertLessEqual({child.tag for child in element}, children)
            asset, clip = root.find("resources/asset"), root.find(".//asset-clip")
            self.assertEqual((asset.get("name"), asset.get("id")), (NAME, clip.get("ref")))
            self.assertEqual(urllib.parse.unquote(asset.get("src")), f"file://{self.folder / NAME}")
            rate, _, dropped = FPS[fps]
            self.assertEqual(root.find(".//sequence").get("tcFormat"), "DF" if dropped else "NDF")
            found = []
            for marker in clip:
                times = [[int(n) for n in marker.get(key)[:-1].split("/")] for key in ("start", "duration")]
                start, length = (top / bottom for top, bottom in times)
                self.assertAlmostEqual(start * rate, round(start * rate), delta=1e-6)  # a whole frame
                found.append((start, start + length, marker.get("value")))
            self.assert_marks(found, [(a, max(b, a + 1 / rate), name) for a, b, name in marks], 1.001 / rate)

    def test_cue_points(self):
        for mode in ("beats", "both"):
            arguments = ["--mode", mode, "--length", "12", "-q", NAME]
            (result,) = self.run_json(*arguments)
            done = self.run_tavo("--format", "cue", "--click", "c.wav", "--force", *arguments)
            self.assertEqual(done.stdout, b"c.wav\n")
            track = (self.folder / "c.wav").read_bytes()
            self.assertEqual(int.from_bytes(track[4:8], "little"), len(track) - 8)
            points = [(ms / 1000, f"beat {i}") for i, ms in enumerate(result["beats_ms"], 1)]
            if mode == "both":
                begin = result["hl_pos_ms"] / 1000
                points = [(0.0, "highlight")] + [(start - begin, name) for start, name in points]
                region = b"ltxt\x14\0\0\0\x01\0\0\0" + (12 * 11025).to_bytes(4, "little") + b"rgn "
                self.assertIn(region, track)
            self.assert_marks([(c[0], c[2]) for c in chapters(self.folder / "c.wav")], points, 1 / 11025)
