#!/usr/bin/env python3
"""The checks of this folder find what they are for."""
import pathlib
import subprocess
import sys
import tempfile
import unittest

HERE = pathlib.Path(__file__).parent
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

    def test_names(self):
        for change, said in ((lambda lines: [l for l in lines if l != "tavo_init"], "exported, not listed: tavo_init\n"),
                             (lambda lines: lines + ["tavo_other"], "listed, not exported: tavo_other\n")):
            self.assertEqual(self.changed_list(change), (1, said))


if __name__ == "__main__":
    unittest.main()
