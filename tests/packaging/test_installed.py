"""cmake --install into a folder, and programs built against what lies there, by both packages."""
import json
import os
import pathlib
import re
import struct
import subprocess
import sys
import tempfile
import unittest

MAKE_SONG, BUILD, CMAKE, CC, CXX, VERSION, LIBDIR = (sys.argv.pop(1) for _ in range(7))
STRICT = ["-Wall", "-Wextra", "-Wpedantic", "-Werror"]
MEDIA_SOURCE = """
#include <media_source/mtsrc.h>

#include <cstdio>

int main(int argc, char **argv) {
    if (argc != 2) return 2;
    const mtsrc_param param = {argv[1]};
    int32_t err = 0;
    mtsrc_ctx *source = mtsrc_init(&param, &err);
    mtsrc_format format = {};
    if (source == nullptr || mtsrc_getstream_format(source, &format) != 0) return 1;
    printf("%d\\n", static_cast<int>(format.sample_rate));
    return mtsrc_deinit(source) == -5 ? 0 : 1;
}
"""


def run(*command, **options):
    done = subprocess.run([str(part) for part in command], text=True, capture_output=True,
                          check=False, **options)
    if done.returncode != 0:
        raise AssertionError(f"{command}: {done.returncode}\n{done.stdout}{done.stderr}")
    return done.stdout


def example_lines(result):
    """What the example prints for the command's result, whose times are the shortest decimals
    that give back the library's single-precision numbers."""
    times = struct.unpack(f"{len(result['beats_ms'])}f",
                          struct.pack(f"{len(result['beats_ms'])}f", *result["beats_ms"]))
    return [f"highlight {result['hl_pos_ms']}", *(f"beat {time:.3f}" for time in times)]


class Installed(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(folder.cleanup)
        cls.folder = pathlib.Path(folder.name)
        # Installed, then moved: nothing may depend on where it was laid first.
        run(CMAKE, "--install", BUILD, "--prefix", cls.folder / "first place")
        cls.prefix = cls.folder / "prefix"
        (cls.folder / "first place").rename(cls.prefix)
        cls.lib = cls.prefix / LIBDIR
        cls.tavo = cls.prefix / "bin" / "tavo"
        cls.examples = cls.prefix / "share/doc/tavo/examples"
        cls.song = cls.folder / "song.wav"
        run(MAKE_SONG, cls.song, "--seconds", "40", "--bpm", "120")
        cls.result = json.loads(run(cls.tavo, "--format", "json", "--length", "30", cls.song))

    def pkg_config(self, *arguments):
        path = self.lib / "pkgconfig"
        return run("pkg-config", *arguments, "tavo",
                   env={**os.environ, "PKG_CONFIG_PATH": str(path)}).split()

    def build(self, compiler, source, *options):
        program = self.folder / f"{source.stem}.program"
        run(compiler, *options, *STRICT, source, *self.pkg_config("--cflags", "--libs"),
            "-pthread", "-o", program)
        return program

    def run_linked(self, program, *arguments):
        return run(program, *arguments, env={**os.environ, "LD_LIBRARY_PATH": str(self.lib)})

    def test_find_package(self):
        build = self.folder / "build"
        run(CMAKE, "-S", self.examples, "-B", build, f"-DCMAKE_C_COMPILER={CC}",
            f"-DCMAKE_PREFIX_PATH={self.prefix}")
        run(CMAKE, "--build", build)
        lines = run(build / "analyze_file", self.song).splitlines()
        self.assertEqual(lines, example_lines(self.result))
        self.assertGreater(len(lines), 10)

    def test_find_package_refuses_another_major_version(self):
        project = self.folder / "other"
        project.mkdir()
        (project / "CMakeLists.txt").write_text(
            "cmake_minimum_required(VERSION 3.16)\nproject(other C)\n"
            "find_package(tavo 999 QUIET)\nmessage(STATUS \"found ${tavo_FOUND}\")\n"
            "find_package(tavo QUIET)\nmessage(STATUS \"version ${tavo_VERSION}\")\n")
        said = run(CMAKE, "-S", project, "-B", project / "build", f"-DCMAKE_C_COMPILER={CC}",
                   f"-DCMAKE_PREFIX_PATH={self.prefix}")
        self.assertIn("found 0", said)
        self.assertIn(f"version {VERSION}\n", said)

    def test_pkg_config(self):
        program = self.build(CC, self.examples / "analyze_file.c", "-std=c99")
        lines = self.run_linked(program, self.song).splitlines()
        self.assertEqual(lines, example_lines(self.result))

    def test_example_in_the_header(self):
        header = (self.prefix / "include/tavo/tavo.h").read_text()
        (example,) = re.findall(r" \* @code\{\.c\}\n(.*?) \* @endcode\n", header, re.DOTALL)
        source = self.folder / "header_example.c"
        source.write_text(re.sub(r"^ \* ?", "", example, flags=re.MULTILINE))
        program = self.build(CC, source, "-std=c99")
        highlight = json.loads(run(self.tavo, "--format", "json", "--mode", "highlight",
                                   "--length", "30", self.song))["hl_pos_ms"]
        self.assertEqual(self.run_linked(program, self.song), f"{highlight}\n")

    def test_media_source_headers(self):
        source = self.folder / "media_source.cpp"
        source.write_text(MEDIA_SOURCE)
        program = self.build(CXX, source, "-std=c++17")
        self.assertEqual(self.run_linked(program, self.song), "44100\n")

    def test_versions(self):
        self.assertEqual(run(self.tavo, "--version"), f"tavo {VERSION}\n")
        self.assertEqual(self.pkg_config("--modversion"), [VERSION])
        soname = "libtavo.so." + VERSION.split(".", maxsplit=1)[0]
        self.assertIn(f"soname: [{soname}]", run("readelf", "-d", self.lib / "libtavo.so"))
        self.assertEqual(os.readlink(self.lib / "libtavo.so"), soname)

    def test_libraries_are_found_beside_each_other(self):
        environment = {k: v for k, v in os.environ.items() if k != "LD_LIBRARY_PATH"}
        found = dict(re.findall(r"(\S+) => (\S.*) \(", run("ldd", self.tavo, env=environment)))
        for name, folder in (("libtavo.so." + VERSION.split(".", maxsplit=1)[0], self.lib),
                             ("libwexaaudio.so", self.lib / "tavo"),
                             ("liblog.so", self.lib / "tavo")):
            self.assertEqual(pathlib.Path(found[name]).resolve().parent, folder.resolve(), name)

    def test_no_common_names_in_the_libraries_folder(self):
        names = [path.name for path in self.lib.iterdir() if path.name.startswith("lib")]
        self.assertTrue(names)
        self.assertEqual([name for name in names if not name.startswith("libtavo")], [])

    def test_nothing_remembers_the_build(self):
        for path in self.prefix.rglob("*"):
            if path.suffix in (".pc", ".cmake", ".h") or ".so" in path.name or path == self.tavo:
                self.assertNotIn(os.fsencode(os.path.realpath(BUILD)), path.read_bytes(), path)


if __name__ == "__main__":
    unittest.main()
