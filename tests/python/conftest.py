"""The installed package against the command line built from the same tree (MORVA_COMMAND)."""

import os
import subprocess
from pathlib import Path

import pytest
import soundfile

ROOT = Path(__file__).resolve().parents[2]


@pytest.fixture(scope="session")
def command():
    program = Path(os.environ.get("MORVA_COMMAND", ROOT / "build/release/morva"))

    def run(*arguments):
        return subprocess.run([program, *map(str, arguments)], check=True, capture_output=True, text=True).stdout

    return run


@pytest.fixture(scope="session")
def speech():
    """Ten seconds of noisy speech at 48000 Hz, float."""
    return soundfile.read(ROOT / "examples/audio/noisy.flac", dtype="float32")[0]


@pytest.fixture
def write(tmp_path):
    """Writes a sound, as floating point unless told otherwise, so that nothing is rounded on the way."""

    def write(name, sound, rate, subtype="FLOAT"):
        path = tmp_path / name
        path.parent.mkdir(parents=True, exist_ok=True)
        soundfile.write(path, sound, rate, subtype=subtype)
        return path

    return write
