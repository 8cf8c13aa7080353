"""Checks that a folder includes only the headers of folders below it, and that the library exports and imports only
the intended names. Also makes each check fail once. Arguments: the repository, the library."""
import pathlib
import re
import subprocess
import sys
import tempfile
import unittest

ROOT, LIBRARY = (pathlib.Path(sys.argv.pop(1)) for _ in range(2))
ALLOWED = {  # for each folder, the folders that it may include
    "include": set(),
    "common": {"include"},
    "dsp": {"include", "common"},
    "media_source": {"include", "common"},
    "pcm": {"include", "common", "media_source"},
    "highlight": {"include", "common", "dsp"},
    "beat": {"include", "common", "dsp"},
    "core": {"include", "common", "dsp", "media_source", "pcm", "highlight", "beat"},
    **dict.fromkeys(("jni", "java", "python", "cli", "desktop"), {"include"}),
}
EXCEPTIONS = {  # other headers that a folder may include
    "desktop": {"android/log.h", "media_source/wexaaudio.h", "media_source/mtsrc_io.h"},
}
# libtavo.so may need only these libraries. It must not depend on a package with codecs.
NEEDED = ("libwexaaudio.so", "liblog.so", "libc.so", "libm.so", "libstdc++.so", "libgcc_s.so", "libpthread.so",
          "ld-linux", "libasan.so", "libubsan.so", "libtsan.so")
# The compiler and the linker add these names. They differ between toolchains and sanitizers.
RUNTIME = re.compile(r"_ITM_\w+|__gmon_start__|__cxa_\w+|__gxx_personality_v0|_ZSt9terminatev|_Unwind_\w+"
                     r"|__stack_chk_\w+|__tls_\w+|__emutls_\w+|__aarch64_\w+|__(a|t|ub)san_\w+")
# Android's headers or compiler use other names for these functions.
SPELLINGS = {"__errno_location": "__errno", "bcmp": "memcmp"}


def includes(root):
    """Yields each include of the project's sources: the folder, the file and the included path."""
    for folder in ALLOWED:
        for path in sorted((root / folder).rglob("*")):
            if path.suffix in (".h", ".cpp", ".c"):
                for target in re.findall(r'^\s*#\s*include\s*"([^"]+)"', path.read_text('utf-8'), re.MULTILINE):
                    yield folder, path.relative_to(root), target


def find_wrong_includes(root):
    return [f"{path}: {target}" for folder, path, target in includes(root)
            if target.split("/")[0] not in ALLOWED[folder] | {folder}
            and target not in EXCEPTIONS.get(folder, set())]


def run(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def find_differences(library, names):
    """Returns names that are only in the library or only in the list, and needed libraries that are not in NEEDED. Adds
    TLS if there is thread-local storage, because its first use allocates memory, which may fail."""
    symbols = run("nm", "-D", "--defined-only", library).splitlines()
    exported = [line.split()[-1].split("@")[0] for line in symbols if line.split()[1] != "A"]  # A: a symbol version
    needed = re.findall(r"\(NEEDED\).*\[(.*)\]", run("readelf", "-d", library))
    foreign = {name for name in needed if not name.startswith(NEEDED)}
    storage = {word for word in run("readelf", "-lW", library).split() if word == "TLS"}
    return {*names} ^ {*exported} | foreign | storage


def imports(library):
    """Returns the functions that the library imports, except those of the codec library."""
    names = {line.split()[0].split("@")[0] for line in run("nm", "-Du", "--format=posix", library).splitlines()}
    return {SPELLINGS.get(name, name) for name in names if not re.match(r"x[a-z0-9]+_", name)
            and not RUNTIME.fullmatch(name)}


def words_of(path):
    return [word for line in (ROOT / path).read_text().splitlines() if line[:1] != "#" for word in line.split()]


class Repository(unittest.TestCase):
    def test_include_directions(self):
        self.assertGreater(len([*includes(ROOT)]), 100)
        self.assertEqual(find_wrong_includes(ROOT), [])
        for source, target, right in (
                ("dsp/a.cpp", "dsp/b.h", True), ("core/a.cpp", "beat/b.h", True), ("beat/a.cpp", "highlight/b.h", False),
                ("desktop/a.c", "media_source/wexaaudio.h", True), ("desktop/x/a.cpp", "media_source/mtsrc_ctx.h", False)):
            with self.subTest(source=source, target=target), tempfile.TemporaryDirectory() as folder:
                path = pathlib.Path(folder, source)
                path.parent.mkdir(parents=True)
                path.write_text(f'#include "{target}"\n')
                self.assertEqual(find_wrong_includes(pathlib.Path(folder)), [] if right else [f"{source}: {target}"])

    def test_exports(self):
        names = words_of("packaging/exports.txt")
        self.assertEqual(len(names), len(set(names)))
        self.assertEqual(find_differences(LIBRARY, names), set())
        self.assertEqual(find_differences(LIBRARY, {"tavo_other", *names} - {"tavo_init"}), {"tavo_other", "tavo_init"})
        # These must be refused: libc has thread-local storage, and libwexaaudio_av.so needs libavcodec.
        libc = re.search(r"\S+/libc\.so\S*", pathlib.Path("/proc/self/maps").read_text())[0]
        self.assertIn("TLS", find_differences(libc, []))
        self.assertIn("libav", " ".join(find_differences(LIBRARY.parent / "libwexaaudio_av.so", [])))

    def test_imports(self):
        """Android has every function that the library imports."""
        known = words_of("tests/android/imports.txt")
        self.assertEqual(imports(LIBRARY) - {*known}, set())
        self.assertIn("pthread_create", imports(LIBRARY))
        self.assertIn("dlopen", imports(LIBRARY.parent / "libwexaaudio.so") - {*known})


if __name__ == "__main__":
    unittest.main()
