"""Builds the extension of the `maroset` package with the project's CMake build."""

import os
import shutil
import subprocess
import sys
from pathlib import Path

from setuptools import Extension, setup
from setuptools.command.build_ext import build_ext

ROOT = Path(__file__).resolve().parent


class CMakeBuild(build_ext):
    """Configures the project with only the Python binding, builds it and puts the module
    where setuptools packs the package."""

    def build_extension(self, ext):
        build_dir = Path(self.build_temp).resolve() / "cmake"
        configure = [
            "cmake", "-S", str(ROOT), "-B", str(build_dir),
            "-DCMAKE_BUILD_TYPE=Release",
            f"-DPython_EXECUTABLE={sys.executable}",
            "-DMAROSET_BUILD_TESTS=OFF", "-DMAROSET_BUILD_BENCH=OFF", "-DMAROSET_BUILD_CLI=OFF",
        ]
        if shutil.which("ninja"):
            configure += ["-G", "Ninja"]
        subprocess.run(configure, check=True)
        jobs = os.environ.get("CMAKE_BUILD_PARALLEL_LEVEL", str(os.cpu_count() or 2))
        subprocess.run(["cmake", "--build", str(build_dir), "--target", "maroset_python",
                        "-j", jobs], check=True)
        built = next((build_dir / "python" / "maroset").glob("_maroset*.so"))
        target = Path(self.get_ext_fullpath(ext.name))
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copy2(built, target)


setup(ext_modules=[Extension("maroset._maroset", sources=[])],
      cmdclass={"build_ext": CMakeBuild})
