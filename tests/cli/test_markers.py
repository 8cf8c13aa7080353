"""Tests marker files with programs that read them, or against the published rules of the editors."""
import csv
import json
import os
import pathlib
import re
import subprocess
import urllib.parse
import xml.etree.ElementTree as ElementTree

from command_case import TAVO, Case, seconds, song, standard_song

EDITORS = pathlib.Path(__file__).parents[2] / "docs/EDITORS.md"
NAME = "a<b>&\"c\" é.wav"  # must be escaped in XML and in a URL
FPS = {  # frames per second, frame numbers per second in a timecode, numbers skipped per minute
    "23.976": (24000 / 1001, 24, 0), "24": (24, 24, 0), "25": (25, 25, 0), "29.97": (30000 / 1001, 30, 0),
    "29.97df": (30000 / 1001, 30, 2), "30": (30, 30, 0), "50": (50, 50, 0), "59.94": (60000 / 1001, 60, 0),
    "59.94df": (60000 / 1001, 60, 4), "60": (60, 60, 0)}
CLIP = "project/sequence/spine/asset-clip"
FCPXML = {  # elements and their required attributes, from Final Cut Pro's DTD
    ".": "version", "resources": "", "resources/format": "id frameDuration",
    "resources/asset": "id src start duration hasAudio", "project": "name", "project/sequence": "format duration",
    "project/sequence/spine": "", CLIP: "ref duration", CLIP + "/marker": "start duration value"}


def timecodes(base, dropped):
    """Maps the timecodes of five minutes, starting at one hour, to frame numbers. Drop-frame timecode skips the first
    frame numbers of each minute, except every tenth minute."""
    places = ((minute, second, frame) for minute in range(5) for second in range(60) for frame in range(base)
              if second or frame >= dropped or minute % 10 == 0)
    return {f"01:{minute:02}:{second:02}{';' if dropped else ':'}{frame:02}": number
            for number, (minute, second, frame) in enumerate(places)}


def until_next(points, end):
    """Returns ranges from each point to the next, and from the last point to the end of the song."""
    ends = [start for start, _ in points[1:]] + [end]
    return [(start, end, name) for (start, name), end in zip(points, ends)]


def chapters(path):
    output = subprocess.run(["ffprobe", "-v", "error", "-show_chapters", "-of", "json", path], check=True,
                          capture_output=True).stdout
    return [(float(c["start_time"]), float(c["end_time"]), c["tags"]["title"]) for c in json.loads(output)["chapters"]]


class Markers(Case):
    def setUp(self):
        super().setUp()
        self.put(NAME, source=standard_song())

    def write(self, form, words, only=""):
        """Writes a marker file. Returns its path and the expected marks: (start, end, name), in seconds."""
        (result,) = self.run_json(*words.split(), NAME)
        done = self.run_tavo("--format", form, "--force", *only.split(), *words.split(), NAME)
        late = self.late = result["offset_ms"]
        self.end = (result["duration_ms"] - late) / 1000
        beats = [(ms - late) / 1000 for ms in result.get("beats_ms", [])]
        marks = [(at, at, f"beat {i}") for i, at in enumerate(beats, 1)]
        if "hl_pos_ms" in result:
            start = result["hl_pos_ms"]
            end = result.get("hl_end_ms", min(start + 30000, result["duration_ms"]))
            marks.insert(0, ((start - late) / 1000, (end - late) / 1000, "highlight"))
        return self.folder / done.stdout.decode().strip(), marks

    def assert_marks(self, found, expected, delta=0.0006):
        """Checks that names are equal and times approximately equal."""
        self.assertEqual([mark[-1] for mark in found], [mark[-1] for mark in expected])
        for mark, wanted in zip(found, expected):
            for time, right in zip(mark[:-1], wanted[:-1], strict=True):
                self.assertAlmostEqual(time, right, delta=delta)

    def test_lines(self):
        for words in ("", "--length 12", "--mode highlight", "--mode beats"):
            path, marks = self.write("labels", words)
            labels = [line.split("\t") for line in path.read_text().splitlines()]
            self.assert_marks([(float(a), float(b), name) for a, b, name in labels], marks)
            path, _ = self.write("kdenlive", words)
            guides = [line.split(" ", 1) for line in path.read_text().splitlines()]
            self.assert_marks([(seconds(time), name) for time, name in guides], [(m[0], m[2]) for m in marks])
            path, _ = self.write("reaper", words)
            rows = list(csv.DictReader(path.read_text().splitlines(), strict=True))
            self.assert_marks([(seconds(r["Start"]), seconds(r["End"] or r["Start"]), r["Name"]) for r in rows], marks)
            regions = ["R1"] if marks[0][2] == "highlight" else []
            self.assertEqual([r["#"] for r in rows], regions + [f"M{i + 1}" for i in range(len(rows) - len(regions))])
            self.assert_marks([(seconds(r["Length"] or "0"), r["Name"]) for r in rows],
                              [(end - start, name) for start, end, name in marks], 0.002)
        path, marks = self.write("llc", "--length 12")
        self.assertEqual(path.name, NAME[:-4] + "-proj.llc")
        project = json.loads(path.read_text())
        self.assertEqual((project["version"], project["mediaFileName"]), (1, NAME))
        segments = [(cut["start"], cut["end"], cut["name"]) for cut in project["cutSegments"]]
        self.assert_marks(segments, marks[:1] + until_next([(m[0], m[2]) for m in marks[1:]], self.end))

    def test_chapters(self):
        """The song is an MP3 file, because players skip its encoder delay."""
        subprocess.run(["lame", "--quiet", standard_song(), self.folder / NAME], check=True)
        for words in ("--length 12", "--length 12 --mode highlight"):
            path, marks = self.write("ffmetadata", words)
            points = [(0.0, "start")] + [(start, name) for start, _, name in marks]
            points += [(marks[0][1], "after")] if len(marks) == 1 else []
            self.assert_marks(chapters(path), until_next(points, self.end))
            self.assertGreater(self.late, 10)

    def test_frames(self):
        """The song lasts several minutes, because drop-frame timecode skips numbers at each minute."""
        self.put(NAME, source=song(seconds=190, bpm=120, rate=8000, channels=1))
        for fps, (rate, base, dropped) in FPS.items():
            path, marks = self.write("edl", "--mode beats", "--fps " + fps)
            text = path.read_text()
            self.assertTrue(text.startswith(f"TITLE: {NAME}\nFCM: {'' if dropped else 'NON-'}DROP FRAME\n"))
            number = timecodes(base, dropped)
            events = re.findall(r"\n(\d{3,})  001      V     C        (\S+) (\S+) \2 \3\n"
                                r" \|C:ResolveColor\w+ \|M:(.*) \|D:1\n", text)
            self.assertEqual([int(event[0]) for event in events], [*range(1, len(marks) + 1)])
            self.assert_marks([(number[start] / rate, name) for _, start, _, name in events],
                              [(m[0], m[2]) for m in marks], 0.501 / rate)
            self.assertTrue(all(number[end] == number[start] + 1 for _, start, end, _ in events))

    def test_otio(self):
        path, marks = self.write("otio", "--length 12", "--fps 29.97")
        time_line = json.loads(path.read_text())
        (clip,) = time_line["tracks"]["children"][0]["children"]
        self.assertEqual((time_line["OTIO_SCHEMA"], clip["OTIO_SCHEMA"], clip["name"]), ("Timeline.1", "Clip.1", NAME))
        self.assertEqual(urllib.parse.unquote(clip["media_reference"]["target_url"]), f"file://{self.folder / NAME}")

        def at(time):
            self.assertEqual(time["OTIO_SCHEMA"], "RationalTime.1")
            return time["value"] / time["rate"]
        found = [(at(m["marked_range"]["start_time"]), at(m["marked_range"]["duration"]), m["name"])
                 for m in clip["markers"]]
        self.assert_marks(found, [(a, b - a, name) for a, b, name in marks], 1.001 / 29.97)

    def test_recipes(self):
        """The commands in docs/EDITORS.md work in a shell."""
        subprocess.run(["lame", "--quiet", standard_song(), self.folder / "song.mp3"], check=True)
        (result,) = self.run_json("song.mp3")
        start = f"{(result['hl_pos_ms'] - result['offset_ms']) / 1000:.3f}"
        recipes = re.findall(r"^\$ (tavo .*--print .*)$", EDITORS.read_text(), re.MULTILINE)
        printed = [subprocess.run(["bash", "-c", recipe], check=True, capture_output=True, text=True, cwd=self.folder,
                                  env={**os.environ, "PATH": f"{os.path.dirname(TAVO)}:{os.environ['PATH']}"}).stdout
                   for recipe in recipes]
        self.assertEqual(printed[0], f"#TITLE:song\n#MP3:song.mp3\n#PREVIEWSTART:{start}\n")
        self.assertRegex(printed[1], r"^#TITLE:song;\n#SAMPLESTART:\d+\.\d{3};\n#SAMPLELENGTH:15\.000;\n$")
        self.assertRegex(printed[2], r"^beet modify -y 'path:song\.mp3' bpm=\d+\n$")
        self.assertRegex(printed[3], r"^#EXTVLCOPT:start-time=[\d.]+\n#EXTVLCOPT:stop-time=[\d.]+\nsong\.mp3\n$")
        self.assertEqual(len(printed), 4)

    def test_fcpxml(self):
        for fps in ("29.97df", "25"):
            path, marks = self.write("fcpxml", "--length 12", "--fps " + fps)
            self.assertTrue(path.read_text().startswith('<?xml version="1.0" encoding="UTF-8"?>\n<!DOCTYPE fcpxml>'))
            root = ElementTree.parse(path).getroot()
            self.assertEqual(set(root.iter()), {element for path in FCPXML for element in root.findall(path)})
            for path, attributes in FCPXML.items():
                self.assertTrue(all(e.attrib.keys() >= set(attributes.split()) for e in root.findall(path)), path)
            asset, clip = root.find("resources/asset"), root.find(CLIP)
            self.assertEqual((asset.get("name"), asset.get("id")), (NAME, clip.get("ref")))
            self.assertEqual(urllib.parse.unquote(asset.get("src")), f"file://{self.folder / NAME}")
            rate, _, dropped = FPS[fps]
            self.assertEqual(root.find("project/sequence").get("tcFormat"), "DF" if dropped else "NDF")
            found = []
            for marker in clip:
                times = [[int(n) for n in marker.get(key)[:-1].split("/")] for key in ("start", "duration")]
                start, length = (top / bottom for top, bottom in times)
                self.assertAlmostEqual(start * rate, round(start * rate), delta=1e-6)  # on a frame
                found.append((start, start + length, marker.get("value")))
            self.assert_marks(found, [(a, max(b, a + 1 / rate), name) for a, b, name in marks], 1.001 / rate)
