#!/usr/bin/env python3
"""The checks of this folder find what they are for."""
import pathlib
import shutil
import subprocess
import sys
import tempfile
import unittest

HERE = pathlib.Path(__file__).parent
RELIABILITY = HERE.parent.parent / "scripts" / "reliability.py"
sys.path.insert(0, str(RELIABILITY.parent))
import reliability  # noqa: E402: found through the line above

LIBRARY, NAMES = sys.argv.pop(1), sys.argv.pop(1)


def check(script, *arguments):
    done = subprocess.run([sys.executable, HERE / script, *arguments], capture_output=True,
                          text=True)
    return done.returncode, done.stdout


class Includes(unittest.TestCase):
    def tree(self, files):
        self.folder = tempfile.TemporaryDirectory()
        self.addCleanup(self.folder.cleanup)
        for name, text in files.items():
            path = pathlib.Path(self.folder.name, name)
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_text(text)
        return self.folder.name

    def test_directions(self):
        cases = [
            ("dsp/a.cpp", "dsp/b.h", 0),
            ("dsp/a.cpp", "common/tavo_ctx.h", 0),
            ("dsp/a.cpp", "beat/b.h", 1),
            ("highlight/a.h", "dsp/b.h", 0),
            ("highlight/a.h", "pcm/b.h", 1),
            ("media_source/a.cpp", "desktop/b.h", 1),
            ("beat/a.cpp", "highlight/b.h", 1),
            ("core/a.cpp", "beat/b.h", 0),
            ("core/a.cpp", "jni/b.h", 1),
            ("cli/a.cpp", "common/limits.h", 0),
            ("java/a.cpp", "beat/b.h", 1),
            ("cli/a.cpp", "media_source/mtsrc.h", 0),
            ("cli/a.cpp", "media_source/mtsrc_ctx.h", 1),
            ("cli/a.cpp", "highlight/power_envelope.h", 0),
            ("cli/a.cpp", "highlight/search.h", 0),
            ("cli/a.cpp", "highlight/region.h", 1),
            ("desktop/wexaaudio/a.cpp", "media_source/mtsrc_ctx.h", 1),
        ]
        for source, target, expected in cases:
            with self.subTest(source=source, target=target):
                code, text = check("check_includes.py", self.tree({source: f'#include "{target}"\n'}))
                self.assertEqual(code, expected, text)
                self.assertEqual(f"{source}: {target}" in text, expected == 1)

    def test_no_sources_is_no_pass(self):
        self.assertEqual(check("check_includes.py", self.tree({"README": ""}))[0], 1)


class Exports(unittest.TestCase):
    def changed_list(self, change):
        lines = pathlib.Path(NAMES).read_text().splitlines()
        with tempfile.NamedTemporaryFile("w", suffix=".txt") as file:
            file.write("\n".join(change(lines)))
            file.flush()
            return check("check_exports.py", LIBRARY, file.name)

    def test_a_name_too_few(self):
        code, text = self.changed_list(lambda lines: [l for l in lines if l != "tavo_init"])
        self.assertEqual(code, 1)
        self.assertEqual(text, "exported, not listed: tavo_init\n")

    def test_a_name_too_many(self):
        code, text = self.changed_list(lambda lines: lines + ["tavo_other"])
        self.assertEqual(code, 1)
        self.assertEqual(text, "listed, not exported: tavo_other\n")


class Reliability(unittest.TestCase):
    def test_figures_make_the_document(self):
        root = pathlib.Path(tempfile.mkdtemp())
        self.addCleanup(shutil.rmtree, root)
        figures = root / "docs" / "figures"
        figures.mkdir(parents=True)
        for name, (_, sources, _) in reliability.SETS.items():
            for source in sources:
                with open(figures / f"{source}.txt", "a") as file:
                    file.write(f"# 1 s\nfigure {name} case=a trials=1234 leaked=0\n")
        for file, _ in reliability.NOTES.values():
            (figures / file).write_text("place\treason\n")

        self.assertEqual(check(RELIABILITY, root), (0, ""))
        self.assertEqual(check(RELIABILITY, "--check", root), (0, ""))
        document = root / "docs" / "RELIABILITY.md"
        text = document.read_text()
        self.assertIn("| a | 1,234 | 0 |", text)
        self.assertIn("- `place`: reason", text)

        document.write_text(text.replace("1,234", "1,235"))  # typed by hand
        self.assertEqual(check(RELIABILITY, "--check", root)[0], 1)
        one = figures / "limits.txt"
        for wrong in ("", "# 1 s\n", "# 1 s\nfigure limits case=a trials=1 leaked=2\n",
                      "# 1 s\nfigure limits a=1\nfigure limits b=1\n"):
            one.write_text(wrong)
            self.assertEqual(check(RELIABILITY, root)[0], 1, wrong)
        one.unlink()
        self.assertEqual(check(RELIABILITY, root)[0], 1)


if __name__ == "__main__":
    unittest.main()
