#!/usr/bin/env python3
"""check_includes.py ROOT: folders may include downwards only.

Prints every include that goes the wrong way and exits 1 when there is one. A root without sources
is an error, not a pass.
"""
import pathlib
import re
import sys

# Each folder and the floors below it that it may include.
ALLOWED = {
    "common": set(),
    "dsp": {"common"},
    "media_source": {"common"},
    "pcm": {"common", "media_source"},
    "highlight": {"common", "dsp"},
    "beat": {"common", "dsp"},
    "core": {"common", "dsp", "media_source", "pcm", "highlight", "beat"},
    "jni": {"core"},
    "java": {"core"},
    "python": {"core"},
    "cli": {"common", "core"},
    "desktop": set(),
}
PUBLIC = {"core/tavo.h"}  # from everywhere
# Single headers that a folder may take from one it may not include otherwise.
SINGLE = {
    "cli": {"media_source/mtsrc.h", "highlight/power_envelope.h", "highlight/search.h"},
    # The stand-in takes the codec library's interface and nothing else.
    "desktop": {"android/log.h", "media_source/wexaaudio.h", "media_source/mtsrc_io.h"},
}
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
                    or target in PUBLIC
                    or target in SINGLE.get(folder, set())
                )
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
