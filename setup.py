"""Builds the kel_images Python module with the project's CMake, for pip.

`pip install --no-build-isolation --no-index .` needs nothing beyond Debian's packages: the
backend is setuptools, and CMake compiles the library and the extension together.
"""

import os
import re
import subprocess
import sys
from pathlib import Path

from setuptools import Extension, setup
from setuptools.command.build_ext import build_ext

ROOT = Path(__file__).resolve().parent


def library_version():
    """The version the public header declares, so that the package and the library agree."""
    header = (ROOT / "include" / "kel_images.h").read_text()
    return ".".join(re.search(rf"#define KEL_IMAGES_VERSION_{part} (\d+)", header).group(1)
                    for part in ("MAJOR", "MINOR", "PATCH"))


class CMakeBuild(build_ext):
    """Configures a Release build of the module alone and lets CMake put it into the package."""

    def build_extension(self, ext):
        package_dir = Path(self.get_ext_fullpath(ext.name)).resolve().parent
        build_dir = Path(self.build_temp).resolve() / "cmake"
        configure = [
            "cmake", "-S", str(ROOT), "-B", str(build_dir), "-G", "Ninja",
            "-DCMAKE_BUILD_TYPE=Release", "-DKEL_BUILD_PYTHON=ON", "-DKEL_BUILD_TESTS=OFF",
            "-DKEL_BUILD_BENCH=OFF", "-DKEL_BUILD_EXAMPLES=OFF", "-DKEL_BUILD_TOOLS=OFF",
            f"-DPython3_EXECUTABLE={sys.executable}",
            f"-DKEL_PYTHON_PACKAGE_DIR={package_dir}",
        ]
        subprocess.run(configure, check=True)
        jobs = os.environ.get("CMAKE_BUILD_PARALLEL_LEVEL", "2")
        subprocess.run(["cmake", "--build", str(build_dir), "--target", "_kel_images", "-j", jobs],
                       check=True)
        if not Path(self.get_ext_fullpath(ext.name)).exists():
            sys.exit("kel_images: CMake found no python3 with numpy and pybind11 to build for")


setup(
    name="kel_images",
    version=library_version(),
    description="Bit-exact integer routines on small greyscale pictures, over numpy",
    packages=["kel_images"],
    package_dir={"": "python"},
    package_data={"kel_images": ["__init__.pyi", "py.typed"]},
    ext_modules=[Extension("kel_images._kel_images", sources=[])],
    cmdclass={"build_ext": CMakeBuild},
    install_requires=["numpy"],
    python_requires=">=3.9",
    zip_safe=False,
)
