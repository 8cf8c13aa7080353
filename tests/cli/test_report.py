"""Tests the report page in headless Chromium."""
import json
import os
import re
import struct
import subprocess
import xml.etree.ElementTree as ElementTree

from selenium import webdriver
from selenium.webdriver.chrome.service import Service
from selenium.webdriver.common.by import By
from selenium.webdriver.support.ui import WebDriverWait

from command_case import SONGS, Case, short_song, song, standard_song, wav

ARGUMENTS = """--headless=new --no-sandbox --disable-gpu --disable-quic --no-first-run --disable-background-networking
    --disable-component-update --disable-sync --disable-dev-shm-usage --mute-audio"""


class Browser(Case):
    @classmethod
    def setUpClass(cls):
        options = webdriver.ChromeOptions()
        options.binary_location = "/usr/bin/chromium"
        for argument in ARGUMENTS.split():
            options.add_argument(argument)
        options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
        cls.browser = cls.enterClassContext(webdriver.Chrome(options=options, service=Service("/usr/bin/chromedriver")))
        cls.script = cls.browser.execute_script

    def show(self, name, width=1200, dark=False):
        self.browser.execute_cdp_cmd("Emulation.setDeviceMetricsOverride", {
            "width": width, "height": 900, "deviceScaleFactor": 1, "mobile": width < 600})
        self.browser.execute_cdp_cmd("Emulation.setEmulatedMedia", {
            "features": [{"name": "prefers-color-scheme", "value": "dark" if dark else "light"}]})
        self.browser.get((self.folder / name).as_uri())
        self.browser.get_log("browser")

    def find(self, selector):
        return self.browser.find_elements(By.CSS_SELECTOR, selector)

    def click(self, *names):
        for name in names:
            self.find("#" + name)[0].click()

    def wait(self, condition):
        WebDriverWait(self.browser, 30, 0.1).until(lambda _: self.script(f"return {condition}"))

    def assert_plays(self):
        self.click("play")
        self.wait("player.playing() && player.now() > 300")
        self.click("play")
        self.wait("!player.playing()")
        self.assertEqual(self.browser.get_log("browser"), [])


class Report(Browser):
    def test_song_page(self):
        self.put("song.wav", source=standard_song())
        (result,) = self.run_json("--length", "12", "--report", "page.html", "song.wav")
        self.assertNotRegex((self.folder / "page.html").read_text(),
                            r'(src|href)="|https?://(?!www\.w3\.org/2000/svg)')  # the page loads nothing
        self.show("page.html")
        self.assertEqual(len(self.find(".beat")), result["beat_count"])
        self.assertEqual(self.script("return beats"), result["beats_ms"])
        self.assert_plays()

        start = result["hl_pos_ms"]
        first, second, *_ = (ms for ms in result["beats_ms"] if ms > start + 30)
        for button, ms in (("gohl", start), ("next", first), ("next", second), ("prev", first)):
            self.click(button)
            self.wait(f"Math.abs(player.now() - {ms}) < 1 && timeline.ariaValueText === clock({ms})")
        self.script("seek(arguments[0])", result["hl_end_ms"] - 200)
        self.click("loop", "play")
        self.wait(f"player.now() < {start + 3000}")  # the loop started again
        self.wait("scheduled.length > 0")  # clicks
        self.click("play")

        self.click("timeline")
        self.wait("Math.abs(player.now() - songEnd / 2) < songEnd / 100")
        self.click("tobeat")
        self.assertAlmostEqual(self.script("return view.span"), 2000, delta=1)
        self.find("#timeline")[0].send_keys("0")
        self.assertTrue(self.script("return view.from === 0 && view.span === songEnd"))
        self.find("#beattimes button")[0].click()
        self.wait("Math.abs(player.now() - beats[0]) < 1")
        self.wait("document.getElementById('status').textContent.endsWith('copied.')")

        # The saved picture shows the same part of the song.
        self.click("tobeat", "out", "out", "out")
        start, span = self.script("return [view.from, view.span]")
        root = ElementTree.fromstring(self.script("return pictureSvg()"))
        lines = [e for e in root.iter() if e.get("class") in ("beat", "start")]
        times = [start + float(e.get("points").split(",")[0]) * span / 1200 for e in lines]
        for shown, ms in zip(times, [*result["beats_ms"], result["hl_pos_ms"]], strict=True):
            self.assertAlmostEqual(shown, ms, delta=2)
        self.assertEqual({e.get("stroke") for e in lines}, {"rgb(27, 27, 27)", "rgb(194, 78, 0)"})
        self.assertIn("song.wav", [e.text for e in root])
        self.assertEqual(self.browser.get_log("browser"), [])

    def test_waveform_and_loudness(self):
        def view(name, *arguments):
            self.run_tavo("--report", "page.html", "--force", *arguments, name)
            return json.loads(re.search(r'id="data">\n(.*)', (self.folder / "page.html").read_text())[1])

        # The song is silent for 4 s and then a square wave at half of full scale for 6 s.
        rate, level = 8000, 32768 // 2
        loud = b"".join(struct.pack("<h", level if i // 40 % 2 else -level) for i in range(6 * rate))
        self.put("steps.wav", wav(seconds=10, rate=rate)[:44] + bytes(2 * 4 * rate) + loud)
        page = view("steps.wav", "--mode", "highlight")
        wave = page["wave"]  # pairs for 4000 columns of 2.5 ms; the wave starts at column 1600
        self.assertEqual((len(wave), {*wave[:3198]}, {*wave[3202:]}), (8000, {0}, {-127, 127}))
        # The square wave fills a third of the first window, two thirds of the second and all of the third.
        for value, expected in zip(page["loudness"], (0.348, 0.669, 0.969), strict=True):
            self.assertAlmostEqual(value, expected, delta=0.001)
        for seconds, searched in ((60, [0, 42000]), (100, [18000, 52000])):
            self.put("song.wav", source=song(seconds=seconds, bpm=120, rate=8000, channels=1))
            self.assertEqual(view("song.wav", "--mode", "highlight")["searched_ms"], searched)
        # The page shows player times: players skip an MP3 file's encoder delay.
        subprocess.run(["lame", "--quiet", standard_song(), self.folder / "song.mp3"], check=True)
        (result,) = self.run_json("--report", "page.html", "--force", "--length", "12", "song.mp3")
        self.show("page.html")
        self.assertGreater(result["offset_ms"], 10)
        shifted = [ms - result["offset_ms"] for ms in (0, result["hl_pos_ms"], result["hl_end_ms"], *result["beats_ms"])]
        times = self.script("return [soundStart, song.hl_pos_ms, song.hl_end_ms, ...beats]")
        for ms, expected in zip(times, shifted, strict=True):
            self.assertAlmostEqual(ms, expected, delta=0.01)

    def test_pages_fit_the_screen_and_its_colours(self):
        self.put("song.wav", source=standard_song())
        self.run_tavo("--report", "page.html", "song.wav")
        self.run_tavo("--report", "index.html", "song.wav", "song.wav")
        for page in ("page.html", "index.html"):
            papers = []
            for width, dark in ((1200, False), (1200, True), (360, True)):
                self.show(page, width, dark)
                self.assertLessEqual(self.script("return document.documentElement.scrollWidth"), width, page)
                papers.append(self.script("return getComputedStyle(document.body).backgroundColor"))
            self.assertTrue(papers[0] != papers[1] == papers[2], (page, papers))

    def test_every_format_and_name_plays(self):
        for source, name in (("song.wav", b"a #1 100% <b>&.wav"), ("song.flac", b"\xff'\".flac"),
                             ("song.ogg", b"[x] @DATA@ <!--<script>.ogg"), ("constant.mp3", b"\xc3\xa9.mp3"),
                             ("song.aac", b"bare.aac")):
            for embed in ([], ["--embed"]):
                with self.subTest(name=name, embed=embed):
                    path = self.put("deep/" + os.fsdecode(name), source=SONGS / source)
                    self.run_tavo("--report", "page.html", "--length", "99", "--force", *embed, path)
                    if embed:
                        path.unlink()
                    self.show("page.html")
                    self.assertEqual(self.find("#name")[0].text, name.decode("utf-8", "replace"))
                    note = self.find("#status")[0].text
                    self.assertEqual("--embed" in note, name == b"bare.aac" and not embed, note)
                    self.assert_plays()
                    # At the end of the song, Loop starts the highlight again, and Play starts the song again, once.
                    self.click("loop", "play")
                    self.script("seek(songEnd - 300)")
                    self.wait("player.now() < songEnd - 1000")
                    self.click("loop")
                    self.script("seek(songEnd - 300)")
                    self.wait("!player.playing()")
                    self.script("window.starts = 0; const play = embedded.play;"
                                "embedded.play = () => { ++starts; return play.call(embedded); };")
                    self.assert_plays()
                    self.assertEqual(self.script("return starts"), len(embed))

    def test_index(self):
        names = ["b \"#1.wav", "a.wav", "bad <i>&.wav", "c.wav"]
        for i, name in enumerate(names):
            self.put(name, source=short_song(seed=i))
        self.put(names[2], content=b"RIFF" + bytes(60))
        results = self.run_json("-j", "2", "--report", "all.html", *names, status=1)
        self.show("all.html")

        def shown():
            return [cell.text for cell in self.find("tbody td:first-child") if cell.is_displayed()]

        self.assertEqual(shown(), names)
        heads = self.find("thead button")
        heads[0].click()
        self.assertEqual(shown(), sorted(names))
        heads[3].click()
        starts = {result["file"]: result.get("hl_pos_ms", 1e9) for result in results}
        self.assertEqual([starts[name] for name in shown()], sorted(starts.values()))
        self.find("#search")[0].send_keys("B")
        self.assertEqual(sorted(shown()), [names[0], names[2]])
        self.browser.find_element(By.LINK_TEXT, names[0]).click()
        self.wait(f"document.getElementById('name').textContent === '{names[0]}'")
        self.assert_plays()
        self.assertEqual(len(list((self.folder / "all_songs").iterdir())), 3)
