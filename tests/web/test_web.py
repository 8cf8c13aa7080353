"""Tests tavo.html in a browser: it opens files of every format, with the same results as the command."""
import base64
import os
import pathlib
import subprocess

from selenium.webdriver.common.by import By
from selenium.webdriver.support.ui import Select

from command_case import standard_song
from test_report import Browser

PAGE = pathlib.Path(os.environ["PAGE"])
KEYS = ("hl_pos_ms", "bpm", "beats_ms", "duration_ms")
CODECS = {"flac": "flac", "mp3": "libmp3lame", "m4a": "aac", "ogg": "libvorbis", "opus": "libopus",
          "webm": "libopus", "aac": "aac"}
FORMATS = {"labels": ".labels.txt", "kdenlive": ".guides.txt", "llc": "-proj.llc", "ffmetadata": ".ffmetadata.txt",
           "edl": ".edl", "reaper": ".reaper.csv"}
# Records the songs that the page sends to the engine and the files that it saves.
SPY = """window.wavs = {}; window.saved = {};
const work_ = work; work = (request, transfer) => {
  if (request.name) { wavs[request.name] = request.wav.slice(0); }
  return work_(request, transfer).then((reply) => { if (request.format) saved[request.format] = reply; return reply; });
};"""
AS_BASE64 = """const bytes = new Uint8Array(wavs[arguments[0]]); let text = "";
for (let i = 0; i < bytes.length; i += 32768) text += String.fromCharCode(...bytes.subarray(i, i + 32768));
return btoa(text);"""


def found(result):
    return {key: result[key] for key in KEYS if key in result}


class Page(Browser):
    def test_size(self):
        self.assertLess(PAGE.stat().st_size, 350_000)

    def test_eight_formats(self):
        source = self.put("song.wav", source=standard_song())
        names = ["song.wav"]
        for ending, codec in CODECS.items():
            names.append("song." + ending)
            subprocess.run(["ffmpeg", "-v", "error", "-i", source, "-c:a", codec, self.folder / names[-1]], check=True)
        self.put("bad.mp3", b"no song" * 99)
        self.put("tavo.html", source=PAGE)
        self.show("tavo.html")
        self.script(SPY)
        (chooser,) = self.find("#files")
        chooser.send_keys("\n".join(str(self.folder / name) for name in [*names, "bad.mp3"]))
        self.wait("document.getElementById('status').textContent === '9 songs done'")
        rows = [row.text for row in self.find("tbody tr")]
        self.assertIn("cannot decode", rows[-1])
        for name, row in zip(names, rows):
            self.assertIn("BPM", row, name)
        for name in ("song.wav", "song.flac"):
            wav = self.put("mono/" + name, base64.b64decode(self.script(AS_BASE64, name)))
            (native,) = self.run_json("--length", "30", wav)
            self.browser.find_element(By.XPATH, f"//button[text()='{name}']").click()
            self.assertEqual(found(self.script("return shown.song")), found(native), name)
            for word, suffix in FORMATS.items():
                stem = "song" if word == "llc" else name
                self.run_tavo("-f", word, "-l", "30", "--force", wav)
                Select(self.find("#format")[0]).select_by_value(f"{word} {suffix}")
                self.click("save")
                self.wait(f"saved.{word} !== undefined")
                self.assertEqual(self.script(f"return saved.{word}"), (self.folder / f"mono/{stem}{suffix}").read_text())
                self.script(f"delete saved.{word}")
        self.assertEqual(self.script("return performance.getEntriesByType('resource')"
                                     ".map((entry) => entry.name).filter((name) => !/^(blob|data):/.test(name))"), [])
        self.browser.switch_to.frame("song")
        self.wait("beats.length > 0")
        self.assert_plays()
        self.browser.switch_to.default_content()
