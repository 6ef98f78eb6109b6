"""Puts the engine library, the models and the licences into the package.

The library is taken from MORVA_LIBRARY, else from ../build/release, else built there. It is loaded at
run time and links to no Python, so one wheel serves every Python version.
"""

import os
import shutil
import subprocess
from pathlib import Path

from setuptools import Distribution, setup
from setuptools.command.build_py import build_py
from wheel.bdist_wheel import bdist_wheel

ROOT = Path(__file__).resolve().parent.parent


def engine_library() -> Path:
    chosen = os.environ.get("MORVA_LIBRARY")
    if chosen:
        return Path(chosen)
    library = ROOT / "build/release/libmorva.so"
    if not library.exists():
        subprocess.run(["cmake", "--preset", "release"], cwd=ROOT, check=True)
        subprocess.run(
            ["cmake", "--build", "--preset", "release", "--target", "morva"],
            cwd=ROOT,
            check=True,
        )
    return library


def math_library_licence() -> Path | None:
    """The engine carries the math library, whose licence asks for its text to go along."""
    roots = [Path(os.environ["MKLROOT"])] if "MKLROOT" in os.environ else []
    folders = [*roots, *(root / "licensing" for root in roots), ROOT / ".deps/mkl"]
    found = (folder / name for folder in folders for name in ("LICENSE.txt", "license.txt"))
    return next(filter(Path.exists, found), None)


class BuildWithEngine(build_py):
    def run(self):
        super().run()
        bundled = Path(self.build_lib) / "morva/_bundled"
        shutil.rmtree(bundled, ignore_errors=True)
        (bundled / "models").mkdir(parents=True)
        shutil.copyfile(engine_library(), bundled / "libmorva.so")
        licences = bundled / "licenses"
        licences.mkdir()
        shutil.copyfile(ROOT / "LICENSE", licences / "LICENSE")
        if (mkl := math_library_licence()) is not None:
            shutil.copyfile(mkl, licences / "LICENSE.onemkl")
        for model in (ROOT / "models").iterdir():
            if model.suffix in (".mvw", ".md", ".json"):
                shutil.copyfile(model, bundled / "models" / model.name)


class PlatformWheel(bdist_wheel):
    def finalize_options(self):
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
