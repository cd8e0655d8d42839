"""Builds ostra._core with CMake, from the tree that this folder is in."""

import os
import re
import subprocess
import sys
from pathlib import Path

from setuptools import Extension, setup
from setuptools.command.build_ext import build_ext

ROOT = Path(__file__).resolve().parent.parent


class BuildWithCMake(build_ext):
    def build_extension(self, extension):
        build = ROOT / "build" / "wheel"
        options = [
            "-DCMAKE_BUILD_TYPE=Release",
            "-DCMAKE_UNITY_BUILD=ON",
            "-DOSTRA_PYTHON=ON",
            "-DOSTRA_TESTS=OFF",
            "-DOSTRA_TOOLS=OFF",
            "-DOSTRA_INSTALL=OFF",
            "-DOSTRA_SYMBOLS=ON",  # a compiler cache then has most objects from quickstart; stripped below
            "-DOSTRA_FMT_HEADERS=ON",  # nothing but libusb, libudev and the system's own is needed where it runs
            f"-DPython_EXECUTABLE={sys.executable}",
        ]
        subprocess.run(["cmake", "-S", str(ROOT), "-B", str(build), "-G", "Ninja", *options], check=True)
        subprocess.run(["cmake", "--build", str(build), "--target", "ostra_python"], check=True)
        target = Path(self.get_ext_fullpath(extension.name)).resolve()
        target.parent.mkdir(parents=True, exist_ok=True)
        module = build / "python" / "ostra" / target.name
        subprocess.run(["strip", "--strip-unneeded", "-o", str(target), str(module)], check=True)


version = re.search(r"project\(ostra VERSION (\S+)", (ROOT / "CMakeLists.txt").read_text()).group(1)
setup(version=version, ext_modules=[Extension("ostra._core", sources=[])], cmdclass={"build_ext": BuildWithCMake})
