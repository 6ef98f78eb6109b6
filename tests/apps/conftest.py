"""The program under test, and sounds and models for it. MORVA_BUILD names the build folder."""

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


def lag_and_likeness(before, after, rate):
    """Samples by which `after` is late, and how alike the two are once that is undone."""
    hz = np.fft.rfftfreq(len(before), 1 / rate)
    band = (hz > 250) & (hz < 0.95 * min(3000, 0.4 * rate))
    x, y, turns = np.fft.rfft(before)[band], np.fft.rfft(after)[band], 2 * np.pi * hz[band] / rate
    both = y * np.conj(x)
    lag = -np.sum(turns * np.abs(both) * np.angle(both)) / np.sum(turns**2 * np.abs(both))
    return lag, np.real(np.sum(both * np.exp(1j * turns * lag))) / (np.linalg.norm(x) * np.linalg.norm(y))


# The shipped models, changed so that their answer is known without running them.


def constant_mask(mask: int = 1, name: str = "NC_small_16k.mvw") -> dict:
    """A cleaner or a noise-level model whose mask is 0 or 1 in all bins but the topmost, whatever it hears."""
    values = mvw.read(SOURCE / "models" / name)
    values["TimeStamp"] = b"%d" % mask  # by which the engine tells models apart
    weights, biases = values.get("WeightNonLinear", [])[-1:], values.get("BaesNonLinear", [])[-1:]
    if "WeightOutput" in values:
        weights, biases = [values["WeightOutput"]], [values["BiasOutput"]]
    weights[0][:] = 0
    biases[0][:] = 100 if mask else -100
    return values


def noise_level(mask: int = 0) -> dict:
    """A noise-level model that takes all that it hears for noise, or nothing."""
    return constant_mask(mask, "noise_level_16k.mvw")


def loudness_voice() -> dict:
    """A voice-activity model that scores how loud the newest frame is against silence."""
    values = mvw.read(SOURCE / "models/VAD_weight.mvw")
    features, inputs, hidden = 61, 5 * 61, 1
    newest = np.zeros((hidden + inputs, 1))
    newest[-features:] = 1 / features  # the mean log energy of its bands
    values |= {"MU": np.zeros(features), "SD": np.ones(features)}
    values |= {"WeightGRU": np.zeros((hidden + inputs, hidden)), "BaesGRU": np.zeros(hidden)}
    values |= {"WeightLinear": [newest], "BaesLinear": [np.zeros(1)]}
    values |= {"WeightNonLinear": [np.zeros((hidden, 1))], "BaesNonLinear": [np.zeros(1)]}
    return values | {"Test_MINMAX": np.array([0.0, 12.0]), "Test_BestF1": np.array([6.0])}
