#!/usr/bin/env python3
"""check_exports.py LIBRARY NAMES: the library's dynamic symbols are the names listed, no others,
it asks for no shared library beyond those that it may need, and it has no thread-local storage,
whose first use in a loaded library takes memory that may not be there."""
import subprocess
import sys

# A codec of a package in this list would tie the library to that package.
NEEDED = ("libwexaaudio.so", "liblog.so", "libc.so", "libm.so", "libstdc++.so", "libgcc_s.so",
          "libpthread.so", "ld-linux", "libasan.so", "libubsan.so", "libtsan.so")


def run(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def main():
    library, names = sys.argv[1:3]
    listed = set()
    with open(names, encoding="ascii") as lines:
        for line in lines:
            name = line.strip()
            if name and not name.startswith("#"):
                if name in listed:
                    print(f"listed twice: {name}")
                    return 1
                listed.add(name)
    symbols = [line.split() for line in run("nm", "-D", "--defined-only", library).splitlines()]
    exported = {words[-1].split("@")[0] for words in symbols}
    missing, extra = sorted(listed - exported), sorted(exported - listed)
    for name in missing:
        print(f"listed, not exported: {name}")
    for name in extra:
        print(f"exported, not listed: {name}")
    needed = [line.split("[")[1].rstrip("]") for line in run("readelf", "-d", library).splitlines()
              if "(NEEDED)" in line]
    foreign = [name for name in needed if not name.startswith(NEEDED)]
    for name in foreign:
        print(f"needs {name}")
    thread_local = "TLS" in run("readelf", "-lW", library).split()
    if thread_local:
        print("has thread-local storage")
    if not listed or not needed:
        print("nothing to compare")
        return 1
    return 1 if missing or extra or foreign or thread_local else 0


if __name__ == "__main__":
    sys.exit(main())
