"""The page that plays, in a real browser: Debian's Chromium without a window."""
import os
import pathlib
import re
import time

from selenium import webdriver
from selenium.webdriver.chrome.options import Options
from selenium.webdriver.chrome.service import Service
from selenium.webdriver.common.by import By
from selenium.webdriver.support.ui import WebDriverWait

from command_case import Case, short_song, standard_song

SONGS = pathlib.Path(os.environ["SONGS"]) / "formats"  # one song in every format
ARGUMENTS = ["--headless=new", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
             "--disable-background-networking", "--disable-component-update", "--disable-sync",
             "--disable-dev-shm-usage", "--mute-audio"]


class Report(Case):
    @classmethod
    def setUpClass(cls):
        options = Options()
        options.binary_location = "/usr/bin/chromium"
        for argument in ARGUMENTS:
            options.add_argument(argument)
        options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
        cls.browser = webdriver.Chrome(options=options, service=Service("/usr/bin/chromedriver"))
        cls.addClassCleanup(cls.browser.quit)

    def show(self, name, width=1200, dark=False):
        self.browser.execute_cdp_cmd("Emulation.setDeviceMetricsOverride", {
            "width": width, "height": 900, "deviceScaleFactor": 1, "mobile": width < 600})
        self.browser.execute_cdp_cmd("Emulation.setEmulatedMedia", {
            "features": [{"name": "prefers-color-scheme", "value": "dark" if dark else "light"}]})
        self.browser.get((self.folder / name).as_uri())
        self.browser.get_log("browser")

    def script(self, text, *arguments):
        return self.browser.execute_script(text, *arguments)

    def click(self, name):
        self.browser.find_element(By.ID, name).click()

    def wait(self, condition):
        WebDriverWait(self.browser, 30, 0.1).until(lambda _: self.script(f"return {condition}"))

    def assert_plays(self):
        self.click("play")
        self.wait("player.playing() && player.now() > 300")
        self.click("play")
        self.wait("!player.playing()")
        self.assertEqual(self.browser.get_log("browser"), [])

    def test_a_song(self):
        self.put("song.wav", source=standard_song())
        (result,) = self.run_json("--length", "12", "--report", "page.html", "song.wav")
        outside = re.search(r'(src|href)="|https?://(?!www\.w3\.org/2000/svg)', (self.folder / "page.html").read_text())
        self.assertIsNone(outside)
        self.show("page.html")
        self.assertEqual(len(self.browser.find_elements(By.CSS_SELECTOR, "line.beat")), result["beat_count"])
        self.assertEqual(self.script("return beats"), result["beats_ms"])
        self.assert_plays()

        self.click("gohl")
        self.wait(f"Math.abs(player.now() - {result['hl_pos_ms']}) < 1")
        self.click("next")
        first = next(ms for ms in result["beats_ms"] if ms > result["hl_pos_ms"] + 30)
        self.wait(f"Math.abs(player.now() - {first}) < 1")
        self.script("seek(arguments[0])", result["hl_end_ms"] - 200)
        self.click("loop")
        self.click("play")
        self.wait(f"player.now() < {result['hl_pos_ms'] + 3000}")  # past its end, back at its start
        self.click("play")

        timeline = self.browser.find_element(By.ID, "timeline")
        webdriver.ActionChains(self.browser).move_to_element(timeline).click().perform()
        self.wait("Math.abs(player.now() - song.length_ms / 2) < song.length_ms / 100")
        self.click("tobeat")
        self.assertAlmostEqual(self.script("return view.to - view.from"), 2000, delta=1)
        timeline.send_keys("0")
        self.assertEqual(self.script("return [view.from, view.to]"), [0, self.script("return song.length_ms")])
        self.browser.find_element(By.CSS_SELECTOR, "#beattimes button").click()
        self.wait(f"Math.abs(player.now() - {result['beats_ms'][0]}) < 1")
        self.wait("document.getElementById('status').textContent.endsWith('copied.')")
        self.assertEqual(self.browser.get_log("browser"), [])

    def test_screens(self):
        self.put("song.wav", source=standard_song())
        self.run_tavo("--report", "page.html", "song.wav")
        self.run_tavo("--report", "index.html", "song.wav", "song.wav")
        for page in ("page.html", "index.html"):
            papers = []
            for width, dark in ((1200, False), (1200, True), (360, True)):
                with self.subTest(page=page, width=width, dark=dark):
                    self.show(page, width, dark)
                    self.assertLessEqual(self.script("return document.documentElement.scrollWidth"), width)
                    papers.append(self.script("return getComputedStyle(document.body).backgroundColor"))
                    self.assertGreater(len(self.browser.get_screenshot_as_png()), 5000)
            self.assertEqual(papers[1], papers[2])
            self.assertNotEqual(papers[0], papers[1])

    def test_every_format_and_name_plays(self):
        names = {"song.wav": "a #1 100% <b>&.wav", "song.flac": os.fsdecode(b"\xff'\".flac"), "song.ogg": "[x] @DATA@.ogg",
                 "constant.mp3": "é.mp3", "song.aac": "bare.aac"}
        (self.folder / "deep").mkdir()
        for source, name in names.items():
            self.put("deep/" + name, source=SONGS / source)
            for embed in ([], ["--embed"]):
                with self.subTest(name=name, embed=embed):
                    self.run_tavo("--report", "page.html", "--force", *embed, "deep/" + name)
                    if embed:
                        os.rename(self.folder / "deep" / name, self.folder / "moved")
                    self.show("page.html")
                    self.assertEqual(self.browser.find_element(By.ID, "name").text.encode("utf-8", "replace").decode(),
                                     os.fsencode(name).decode("utf-8", "replace"))
                    note = self.browser.find_element(By.ID, "status").text
                    self.assertEqual("--embed" in note, name == "bare.aac" and not embed, note)
                    self.assert_plays()
        self.show("page.html")

    def test_index(self):
        names = ["b.wav", "a.wav", "bad.wav", "c.wav"]
        for i, name in enumerate(names):
            self.put(name, source=short_song(seed=i))
        self.put("bad.wav", content=b"RIFF" + bytes(60))
        results = self.run_json("-j", "2", "--report", "all.html", *names, status=1)
        self.show("all.html")

        def shown():
            return [row.find_element(By.TAG_NAME, "td").text for row in
                    self.browser.find_elements(By.CSS_SELECTOR, "tbody tr") if row.is_displayed()]

        self.assertEqual(shown(), names)
        heads = self.browser.find_elements(By.CSS_SELECTOR, "thead button")
        heads[0].click()
        self.assertEqual(shown(), sorted(names))
        heads[3].click()
        starts = {result["file"]: result.get("hl_pos_ms", 1e9) for result in results}
        self.assertEqual([starts[name] for name in shown()], sorted(starts.values()))
        self.assertEqual(shown()[-1], "bad.wav")
        self.browser.find_element(By.ID, "search").send_keys("B")
        self.assertEqual(sorted(shown()), ["b.wav", "bad.wav"])
        self.browser.find_element(By.LINK_TEXT, "b.wav").click()
        self.wait("document.getElementById('name').textContent === 'b.wav'")
        self.assert_plays()
        self.assertEqual(len(list((self.folder / "all_songs").iterdir())), 3)

    def test_nothing_is_lost(self):
        self.put("a.wav")
        self.put("page.html", content=b"mine")
        for inputs in (["a.wav"], ["a.wav", "a.wav"]):
            done = self.run_tavo("--report", "page.html", *inputs, status=1)
            self.assertIn(b"--force", done.stderr)
            self.assertEqual((self.folder / "page.html").read_bytes(), b"mine")
        self.run_tavo("--report", "a.wav", "--force", "a.wav", status=1)
        self.run_tavo("--report", "none/page.html", "a.wav", status=1)
        self.run_tavo("--embed", "a.wav", status=2)

