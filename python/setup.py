"""Puts the engine library, the models and the licences into the package.

They are taken from the install tree MORVA_STAGE, else from one of ../build/release, which is built if need be.
The library is loaded at run time and links to no Python, so one wheel serves every Python version; the tag of its
platform is MORVA_WHEEL_PLATFORM, else that of this machine.
"""

import os
import shutil
import subprocess
import tempfile
from pathlib import Path

from setuptools import Distribution, setup
from setuptools.command.build_py import build_py
from wheel.bdist_wheel import bdist_wheel

ROOT = Path(__file__).resolve().parent.parent
LIBRARIES = ("lib/libmorva.so", "lib/libmorva.dylib", "bin/morva.dll")


def cmake(*arguments):
    subprocess.run(["cmake", *arguments], cwd=ROOT, check=True)


def install_tree(folder: str) -> Path:
    if "MORVA_STAGE" in os.environ:
        return Path(os.environ["MORVA_STAGE"])
    if not (ROOT / "build/release/libmorva.so").exists():
        cmake("--preset", "release")
        cmake("--build", "--preset", "release", "--target", "morva")
    cmake("--install", "build/release", "--component", "engine", "--prefix", folder)
    return Path(folder)


class BuildWithEngine(build_py):
    def run(self):
        super().run()
        bundled = Path(self.build_lib) / "morva/_bundled"
        shutil.rmtree(bundled, ignore_errors=True)
        with tempfile.TemporaryDirectory() as folder:
            tree = install_tree(folder)
            shutil.copytree(tree / "share/morva/models", bundled / "models")
            shutil.copytree(tree / "share/doc/morva", bundled / "licenses", ignore=shutil.ignore_patterns("CHANGELOG*"))
            library = next(file for name in LIBRARIES if (file := tree / name).exists())
            shutil.copyfile(library, bundled / library.name)


class PlatformWheel(bdist_wheel):
    def finalize_options(self):
        self.plat_name = self.plat_name or os.environ.get("MORVA_WHEEL_PLATFORM")
        super().finalize_options()
        self.root_is_pure = False

    def get_tag(self):
        return "py3", "none", super().get_tag()[2]


class WithBinary(Distribution):
    def has_ext_modules(self):
        return True


setup(
    cmdclass={"build_py": BuildWithEngine, "bdist_wheel": PlatformWheel},
    distclass=WithBinary,
)
