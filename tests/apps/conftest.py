"""The program under test and files for it. MORVA_BUILD names the build folder."""

import os
import pathlib
import subprocess
import sys

import numpy as np
import pytest
import soundfile

SOURCE = pathlib.Path(__file__).parents[2]
BUILD = pathlib.Path(os.environ.get("MORVA_BUILD", SOURCE / "build/release"))
sys.path.append(str(SOURCE / "training"))
from morva_training import mvw  # noqa: E402


@pytest.fixture(scope="session")
def morva():
    def run(*arguments, status=0, **options):
        command = [str(BUILD / "morva"), *map(str, arguments)]
        done = subprocess.run(command, **{"capture_output": True, "text": True, "timeout": 300} | options)
        assert done.returncode == status, f"{command} ended with {done.returncode}:\n{done.stderr}"
        return done

    return run


@pytest.fixture
def model(tmp_path):
    """Writes a weight file and returns its path."""

    def write(values, name="model.mvw"):
        mvw.write(tmp_path / name, values)
        return tmp_path / name

    return write


@pytest.fixture
def recording(tmp_path):
    """Writes a sound file and returns its path."""

    def write(sound, rate, name="in.wav", **options):
        path = tmp_path / name
        path.parent.mkdir(parents=True, exist_ok=True)
        soundfile.write(path, sound, rate, **options)
        return path

    return write


def speechlike(rate: int, seconds: float, seed: int, channels: int = 1) -> np.ndarray:
    """Noise between 200 and 3000 Hz that comes and goes: full enough to align, with nothing at the band's edges."""
    rng = np.random.default_rng(seed)
    count = round(rate * seconds)
    spectrum = np.fft.rfft(rng.standard_normal((count, channels)), axis=0)
    hz = np.fft.rfftfreq(count, 1 / rate)
    spectrum[(hz < 200) | (hz > min(3000, 0.4 * rate))] = 0
    sound = np.fft.irfft(spectrum, count, axis=0)
    return sound / np.abs(sound).max() * 0.9 * np.hanning(count)[:, None]
