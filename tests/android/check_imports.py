#!/usr/bin/env python3
"""check_imports.py LIBRARY LIST: all that LIBRARY takes from outside is in LIST, or is the codec
library's, whose functions media_source/wexaaudio.h declares."""
import re
import subprocess
import sys

# The compiler's and the linker's own, which every toolchain brings in its own form.
RUNTIME = re.compile(
    r"_ITM_\w+|__gmon_start__|__cxa_\w+|__gxx_personality_v0|_ZSt9terminatev|_Unwind_\w+"
    r"|__stack_chk_\w+|__tls_\w+|__emutls_\w+|__aarch64_\w+"
)
# Where the headers or the compiler for Android name a function otherwise.
SPELLINGS = {"__errno_location": "__errno", "bcmp": "memcmp"}


def imports(library):
    listing = subprocess.run(
        ["nm", "--dynamic", "--undefined-only", "--format=posix", library],
        check=True, capture_output=True, text=True,
    ).stdout
    names = {line.split()[0].split("@")[0] for line in listing.splitlines()}
    names = {name for name in names if not RUNTIME.fullmatch(name)}
    return {SPELLINGS.get(name, name) for name in names if not re.match(r"x[a-z0-9]+_", name)}


def main():
    with open(sys.argv[2], encoding="utf-8") as lines:
        allowed = {name for line in lines if not line.startswith("#") for name in line.split()}
    found = imports(sys.argv[1])
    for name in sorted(found - allowed):
        print(f"{name}: not known to exist on Android")
    if not found:
        print("the library takes nothing: the listing cannot be right")
    return 0 if found and found <= allowed else 1


sys.exit(main())
