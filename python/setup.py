"""Builds the library, its private libraries and the command with CMake and adds them to the package."""

import os
import pathlib
import shutil
import subprocess
import tempfile

from setuptools import Distribution, setup
from setuptools.command.build_py import build_py
from wheel.bdist_wheel import bdist_wheel

SOURCE = pathlib.Path(__file__).resolve().parent.parent


class BuildWithLibrary(build_py):
    def run(self) -> None:
        super().run()
        package = pathlib.Path(self.build_lib, "tavo")
        with tempfile.TemporaryDirectory() as folder:
            build, prefix = f"{folder}/build", pathlib.Path(folder, "prefix")
            options = ["-DCMAKE_BUILD_TYPE=Release", "-DCMAKE_CXX_FLAGS_RELEASE=-O2", "-DCMAKE_INSTALL_LIBDIR=lib",
                       "-DTAVO_BUILD_TESTS=OFF", "-DTAVO_BUILD_JNI=OFF", "-DTAVO_BUILD_JAVA=OFF"]
            subprocess.run(["cmake", "-S", SOURCE, "-B", build, *options], check=True)
            subprocess.run(["cmake", "--build", build, "--parallel", str(os.cpu_count() or 1)], check=True)
            subprocess.run(["cmake", "--install", build, "--prefix", prefix, "--strip"], check=True)
            for name in ("bin", "lib"):
                shutil.rmtree(package / name, ignore_errors=True)
                (package / name).mkdir()
            shutil.copy2(prefix / "bin/tavo", package / "bin/tavo")
            shutil.copy2((prefix / "lib/libtavo.so.1").resolve(), package / "lib/libtavo.so.1")
            shutil.copytree(prefix / "lib/tavo", package / "lib/tavo")


class PlatformWheel(bdist_wheel):
    """A wheel for any Python 3 on this platform."""

    def get_tag(self) -> "tuple[str, str, str]":
        return ("py3", "none", super().get_tag()[2])


class BinaryDistribution(Distribution):
    def has_ext_modules(self) -> bool:
        return True


setup(cmdclass={"build_py": BuildWithLibrary, "bdist_wheel": PlatformWheel}, distclass=BinaryDistribution)
