"""Tests the installed files. Programs are built with the CMake package and with pkg-config."""
import array
import json
import os
import pathlib
import platform
import re
import subprocess
import tempfile
import unittest

MAKE_SONG, BUILD, CMAKE, GENERATOR, CC, CXX, VERSION, LIBDIR = (
    os.environ[name] for name in "MAKE_SONG BUILD CMAKE GENERATOR CC CXX VERSION LIBDIR".split())
SONAME = "libtavo.so." + VERSION.split(".", maxsplit=1)[0]
ROOT = pathlib.Path(__file__).parents[2]
STRICT = ["-Wall", "-Wextra", "-Wpedantic", "-Werror"]


def run(*command, **options):
    return subprocess.run(command, check=True, text=True, stdout=subprocess.PIPE, **options).stdout


class Installed(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = pathlib.Path(cls.enterClassContext(tempfile.TemporaryDirectory()))
        # The folder is then moved, because nothing may depend on its original path.
        run(CMAKE, "--install", BUILD, "--prefix", cls.folder / "first place")
        cls.prefix = (cls.folder / "first place").rename(cls.folder / "prefix")
        cls.lib = cls.prefix / LIBDIR
        cls.tavo = cls.prefix / "bin" / "tavo"
        cls.documents = cls.prefix / "share/doc/tavo"
        cls.song = cls.folder / "song.wav"
        run(MAKE_SONG, cls.song, "--seconds", "40", "--bpm", "120")

    def result(self, *words):
        return json.loads(run(self.tavo, "--format", "json", "--length", "30", *words, self.song))

    def pkg_config(self, *arguments):
        environment = {**os.environ, "PKG_CONFIG_PATH": str(self.lib / "pkgconfig")}
        return run("pkg-config", *arguments, "tavo", env=environment).split()

    def build_and_run(self, compiler, source, *options):
        """Returns the program's output for the song. It must not write a file, such as a click track."""
        program = source.with_suffix(".program")
        run(compiler, *options, *STRICT, source, *self.pkg_config("--cflags", "--libs"), "-o", program)
        with tempfile.TemporaryDirectory() as empty:
            output = run(program, self.song, cwd=empty, env={**os.environ, "LD_LIBRARY_PATH": str(self.lib)})
            self.assertEqual(os.listdir(empty), [])
        return output

    def test_documents_link_to_what_is_installed(self):
        links = [document.parent / target for document in self.documents.rglob("*.md")
                 for target in re.findall(r"\]\(([^)#\s]+)[^)]*\)", document.read_text("utf-8"))
                 if "://" not in target]
        self.assertGreater(len(links), 5)
        self.assertEqual([link for link in links if not link.exists()], [])

    def test_example(self):
        build = self.folder / "build"
        run(CMAKE, "-S", self.documents / "examples", "-B", build, "-G", GENERATOR, f"-DCMAKE_C_COMPILER={CC}",
            f"-DCMAKE_PREFIX_PATH={self.prefix}")
        run(CMAKE, "--build", build)
        result = self.result()
        beats = [f"beat {time:.3f}" for time in array.array("f", result["beats_ms"])]  # in single precision
        self.assertGreater(len(beats), 5)
        expected = [f"stream {result['sample_rate']} Hz, channels {result['channels']}, {result['duration_ms']} ms",
                    f"highlight {result['hl_pos_ms']}", f"tempo {result['bpm']}", *beats]
        self.assertEqual(run(build / "analyze_file", self.song).splitlines(), expected)
        source = self.documents / "examples/analyze_file.c"
        self.assertEqual(self.build_and_run(CC, source, "-std=c99").splitlines(), expected)
        run(MAKE_SONG, self.folder / "short.wav", "--seconds", "1")
        for arguments, status, reason in (([source], 1, "(-3)"), (["missing"], 1, "(-7)"),
                                          ([self.folder / "short.wav"], 1, "(-8)"), ([], 2, "usage"),
                                          (["a", "1", "b"], 2, "usage")):
            done = subprocess.run([build / "analyze_file", *arguments], text=True, capture_output=True)
            self.assertEqual((done.returncode, done.stdout), (status, ""), arguments)
            self.assertIn(reason, done.stderr)

    def test_headers(self):
        (example,) = re.findall(r" \* @code\{\.c\}\n(.*?) \* @endcode\n",
                                (self.prefix / "include/tavo/tavo.h").read_text(), re.DOTALL)
        source = self.folder / "header_example.c"
        source.write_text(re.sub(r"^ \* ?", "", example, flags=re.MULTILINE))
        self.assertEqual(self.build_and_run(CC, source, "-std=c99"), f"{self.result('-m', 'highlight')['hl_pos_ms']}\n")
        headers = [path.name for path in (self.prefix / "include").rglob("*.h")]
        self.assertEqual(headers, ["tavo.h"])

    def test_versions(self):
        self.assertEqual(run(self.tavo, "--version"), f"tavo {VERSION}\n")
        self.assertEqual(self.pkg_config("--modversion"), [VERSION])
        self.assertIn("-pthread", self.pkg_config("--libs"))
        self.assertIn("-lwexaaudio", self.pkg_config("--libs", "--static"))
        self.assertIn(f"soname: [{SONAME}]", run("readelf", "-d", self.lib / "libtavo.so"))
        self.assertEqual(os.readlink(self.lib / "libtavo.so"), SONAME)

    def test_libraries(self):
        """Libraries find each other by relative paths. Those with common names are in a folder of their own."""
        self.assertEqual({path.name.split(".")[0] for path in self.lib.glob("lib*")}, {"libtavo"})
        environment = {k: v for k, v in os.environ.items() if k != "LD_LIBRARY_PATH"}
        found = dict(re.findall(r"(\S+) => (\S.*) \(", run("ldd", self.tavo, env=environment)))
        for name, folder in ((SONAME, self.lib), ("libwexaaudio.so", self.lib / "tavo"),
                             ("liblog.so", self.lib / "tavo")):
            self.assertEqual(pathlib.Path(found[name]).resolve().parent, folder.resolve(), name)
        words = [self.tavo, "--store", "postgresql://127.0.0.1:9/x", self.song]  # loads a module
        self.assertIn("refused", subprocess.run(words, text=True, capture_output=True, env=environment).stderr)

    def test_hardened(self):
        for path, also in ((self.lib / "libtavo.so", ["Fortify Source functions"]),
                           (self.lib / "tavo/libwexaaudio.so", ["Fortify Source functions"]),
                           (self.lib / "tavo/libwexaaudio_av.so", []), (self.lib / "tavo/libtavo_postgresql.so", []),
                           (self.tavo, ["Fortify Source functions", "Position Independent Executable"])):
            report = subprocess.run(["hardening-check", path], text=True, stdout=subprocess.PIPE).stdout
            for property_name in ("Stack protected", "Read-only relocations", "Immediate binding", *also):
                self.assertIn(f" {property_name}: yes", report, path)
            # hardening-check does not recognise control-flow protection here, so the test looks for its instruction.
            if platform.machine() == "x86_64":
                self.assertIn("endbr64", run("objdump", "-d", path), path)

    def test_interface_only_grows(self):
        """Compares the interface with packaging/tavo.abi. UPDATE_ABI=1 rewrites that file for new functions."""
        kept = ROOT / "packaging/tavo.abi"
        names = ROOT.joinpath("packaging/exports.txt").read_text().split("# version TAVO_1:")[1].split("# version")[0]
        sources = [f"core/{path.name}" for path in ROOT.glob("core/*.cpp")] + ["media_source/mtsrc.cpp", "beat/click_track.cpp"]

        def library(promised):
            version_script, built = self.folder / "promised.map", self.folder / "promised.so"
            version_script.write_text("TAVO_1 { global: %s; local: *; };" % "; ".join(promised))
            run(CXX, "-std=c++17", "-g", "-fPIC", "-I.", "-Idesktop/log", f"-fdebug-prefix-map={ROOT}=.", "-shared", *sources,
                f"-Wl,--version-script={version_script}", f"-Wl,-soname,{SONAME}", "-o", built, cwd=ROOT)
            return built

        def compare(promised):
            return subprocess.run(["abidiff", "--no-added-syms", kept, library(promised)], text=True, stdout=subprocess.PIPE)

        promised = names.split("\n", 1)[1].split()
        if "UPDATE_ABI" in os.environ:
            run("abidw", "--exported-interfaces-only", "--no-corpus-path", "--no-comp-dir-path", "--no-show-locs",
                "--no-elf-needed", "--headers-dir", "include", "--drop-private-types", "--out-file", kept,
                library(promised), cwd=ROOT)
        done = compare(promised)
        self.assertEqual(done.returncode, 0, done.stdout)
        self.assertIn("1 Removed function", compare([name for name in promised if name != "tavo_has_audio"]).stdout)

    def test_nothing_remembers_the_build(self):
        for path in self.prefix.rglob("*"):
            if path.suffix in (".pc", ".cmake", ".h") or ".so" in path.name or path == self.tavo:
                self.assertNotIn(os.fsencode(os.path.realpath(BUILD)), path.read_bytes(), path)
