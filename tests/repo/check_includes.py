#!/usr/bin/env python3
"""check_includes.py ROOT: folders may include downwards only.

Prints every include that goes the wrong way and exits 1 when there is one. A root without sources
is an error, not a pass.
"""
import pathlib
import re
import sys

SHARED = {"core/tavo.h", "core/tavo_ctx.h"}  # from everywhere
ALLOWED = {
    "dsp": set(),
    "highlight": {"dsp"},
    "media_source": set(),
    "pcm": {"media_source", "platform"},
    "beat": {"dsp", "platform"},
    "platform": {"media_source"},
    "core": {"media_source", "pcm", "highlight", "beat", "dsp", "platform"},
    "jni": {"core"},
    "cli": {"core"},
}
# Single headers that a folder may take from one it may not include otherwise.
SINGLE = {"cli": {"media_source/mtsrc.h", "highlight/power_envelope.h"}, "platform": {"android/log.h"}}
INCLUDE = re.compile(r'^\s*#\s*include\s*"([^"]+)"', re.MULTILINE)


def wrong_includes(root):
    sources = 0
    wrong = []
    for folder, allowed in ALLOWED.items():
        for path in sorted((root / folder).rglob("*")):
            if path.suffix not in (".h", ".cpp", ".c"):
                continue
            sources += 1
            for target in INCLUDE.findall(path.read_text(encoding="utf-8")):
                place = target.split("/")[0] if "/" in target else ""
                ok = (
                    place in allowed | {folder}
                    or target in SHARED
                    or target in SINGLE.get(folder, set())
                )
                # The stand-in takes the codec library's interface and nothing else.
                if folder == "platform" and place == "media_source":
                    ok = target in ("media_source/wexaaudio.h", "media_source/mtsrc_io.h")
                if not ok:
                    wrong.append(f"{path.relative_to(root)}: {target}")
    return sources, wrong


def main():
    root = pathlib.Path(sys.argv[1])
    sources, wrong = wrong_includes(root)
    for line in wrong:
        print(line)
    if sources == 0:
        print(f"no sources under {root}")
    return 1 if wrong or sources == 0 else 0


if __name__ == "__main__":
    sys.exit(main())
