"""The shipped weight files do their work on synthetic material: speech from espeak-ng, made noises.

The real figures come from bench/quality; here only what must never break is held.
"""

from __future__ import annotations

import shutil
import subprocess
from pathlib import Path

import metrics
import numpy as np
import pytest
from scipy.io import wavfile
from scipy.signal import resample_poly

from morva_training import mvw
from morva_training.convert import gated_network, layout_of, plain_network
from morva_training.engine import NoiseLevelModel, NoiseModel, VoiceModel
from morva_training.voice import block_labels

MODELS = Path(__file__).resolve().parents[2] / "models"
SUPPRESSORS = ("NC_small_8k", "NC_small_16k", "c6.xs.f.ca03f4")
MACS_PER_SECOND = {"c6.xs.f.ca03f4": 100e6, "NC_small_16k": 50e6, "NC_small_8k": 50e6}


def weight_of(stem: str) -> mvw.Weight:
    path = MODELS / f"{stem}.mvw"
    if not path.exists():
        pytest.skip(f"{path.name} is not shipped yet")
    return mvw.read(path)


@pytest.fixture(scope="module")
def speech(tmp_path_factory: pytest.TempPathFactory) -> np.ndarray:
    """About six seconds at 32 kHz, 16-bit scale, a second of silence first."""
    if not shutil.which("espeak-ng"):
        pytest.skip("espeak-ng is not installed")
    path = tmp_path_factory.mktemp("speech") / "speech.wav"
    text = "The boat was moored at the far end of the harbour. Please bring seven copies of the green report."
    subprocess.run(["espeak-ng", "-v", "en-gb", "-s", "150", "-w", str(path), text], check=True)
    rate, samples = wavfile.read(path)
    samples = resample_poly(samples.astype(float), 32000, rate)
    samples *= 3000 / np.sqrt(np.mean(np.square(samples)))
    return np.concatenate([np.zeros(32000), samples, np.zeros(16000)]).astype(np.float32)


def at(samples: np.ndarray, rate: int) -> np.ndarray:
    return resample_poly(samples, 1, 32000 // rate).astype(np.float32)


def cleaned(weight: mvw.Weight, samples: np.ndarray) -> np.ndarray:
    model = NoiseModel(weight)
    hop = model.layout.hop
    return np.concatenate([model.process(samples[i : i + hop]) for i in range(0, len(samples) // hop * hop, hop)])


def pink(count: int, seed: int = 1) -> np.ndarray:
    spectrum = np.fft.rfft(np.random.default_rng(seed).standard_normal(count))
    spectrum /= np.sqrt(np.arange(len(spectrum)) + 10.0)
    noise = np.fft.irfft(spectrum, count)
    return (noise / noise.std()).astype(np.float32)


@pytest.mark.parametrize("stem", SUPPRESSORS)
def test_steady_noise_is_removed(stem: str) -> None:
    weight = weight_of(stem)
    rate = layout_of(weight).rate
    noise = 500 * pink(4 * rate)
    result = cleaned(weight, noise)
    assert metrics.level_db(noise[rate:]) - metrics.level_db(result[rate:]) > 20


@pytest.mark.parametrize("stem", SUPPRESSORS)
def test_noisy_speech_gets_better_and_clean_speech_stays(stem: str, speech: np.ndarray) -> None:
    weight = weight_of(stem)
    rate = layout_of(weight).rate
    clean = at(speech, rate)
    noisy = clean + 1000 * pink(len(clean))
    before = metrics.si_sdr(clean, noisy)
    after = metrics.si_sdr(*metrics.aligned(clean, cleaned(weight, noisy), rate))
    assert after > before + 2
    assert metrics.si_sdr(*metrics.aligned(clean, cleaned(weight, clean), rate)) > 18


@pytest.mark.parametrize("stem", SUPPRESSORS)
def test_cost(stem: str) -> None:
    weight = weight_of(stem)
    layout = layout_of(weight)
    macs = gated_network(weight).macs_per_frame() * layout.rate / layout.hop
    assert macs <= MACS_PER_SECOND[stem]
    assert layout.frame * 1000 == 20 * layout.rate


@pytest.mark.parametrize("level_db", [25.0, 45.0, 65.0])
@pytest.mark.parametrize("colour", ["white", "pink", "pink under speech"])
def test_noise_level(level_db: float, colour: str, speech: np.ndarray) -> None:
    weight = weight_of("noise_level_16k")
    noise = np.random.default_rng(3).standard_normal(64000) if colour == "white" else pink(64000)
    noise = (noise * 10 ** (level_db / 20)).astype(np.float32)
    if "speech" in colour:
        clean = np.resize(at(speech, 16000), 64000)
        noise = noise + clean / np.sqrt(np.mean(clean**2)) * 10 ** (min(level_db + 20, 70) / 20)
    model = NoiseLevelModel(weight)
    levels = [model.level(noise[i : i + 160].astype(np.float32)) for i in range(0, 64000, 160)]
    assert abs(np.median(levels[200:]) - level_db) < 2


def voice_scores(samples: np.ndarray) -> np.ndarray:
    weight = weight_of("VAD_weight")
    assert plain_network(weight).features == 305
    model = VoiceModel(weight)
    return np.array([model.score(samples[i : i + 80]) for i in range(0, len(samples) // 80 * 80, 80)])


def test_voice_is_found(speech: np.ndarray) -> None:
    clean = at(speech, 8000)
    voice, weight = block_labels(clean)
    scores = voice_scores(clean + 30 * pink(len(clean)))
    sure = weight[: len(scores)] >= 1.0
    assert metrics.roc_auc(scores[sure], voice[: len(scores)][sure]) > 0.95
    start = int(np.argmax(voice))
    assert (scores[start : start + 6] > 0.5).any(), "the first word must be noticed"


def typing(rng: np.random.Generator, seconds: int) -> np.ndarray:
    out = np.zeros(8000 * seconds)
    for start in np.cumsum(rng.uniform(600, 2000, 9 * seconds)).astype(int):
        if start + 200 < len(out):
            click = rng.standard_normal(200) * np.exp(-np.arange(200) / 30) * rng.uniform(1000, 6000)
            out[start : start + 200] += click
    return out + 20 * rng.standard_normal(len(out))


@pytest.mark.parametrize("sound", ["silence", "noise", "typing", "hum"])
def test_other_sounds_are_no_voice(sound: str) -> None:
    rng = np.random.default_rng(8)
    time = np.arange(40000) / 8000
    samples = {
        "silence": np.zeros(40000),
        "noise": 300 * pink(40000),
        "typing": typing(rng, 5),
        "hum": 800 * np.sin(2 * np.pi * 50 * time) + 300 * np.sin(2 * np.pi * 150 * time),
    }[sound]
    scores = voice_scores(samples.astype(np.float32))
    assert np.mean(scores[100:] > 0.5) < 0.1
