"""The built engine and the training code give the same result, for random and for shipped weights.

Needs the engine library: build/release/libmorva.so, or the file named by MORVA_LIBRARY.
"""

from __future__ import annotations

from pathlib import Path
from typing import Iterator

import numpy as np
import pytest
import torch
from conftest import voice_like
from engine_library import ROOT, Engine, library_path, network_masks

from morva_training import mvw
from morva_training.convert import layout_of, noise_weight
from morva_training.corpus import read_audio
from morva_training.engine import NoiseLevelModel, NoiseModel, VoiceModel
from morva_training.networks import LayerNormGatedNetwork, PlainGatedNetwork
from morva_training.spectra import FULL_32K, SMALL_8K, SMALL_16K, Layout
from morva_training.train_voice import voice_weight

pytestmark = pytest.mark.skipif(not library_path().exists(), reason="the engine library is not built")

SHIPPED = sorted((ROOT / "models").glob("*.mvw"))
AUDIO_TOLERANCE = 4.0  # on the 16-bit scale, about -78 dB of full scale


@pytest.fixture(scope="module")
def engine() -> Iterator[Engine]:
    engine = Engine()
    yield engine
    engine.close()


def recording(rate: int, seconds: float = 2.5, seed: int = 5) -> np.ndarray:
    """Voice-like sound in noise with a silent stretch, int16 values as float32."""
    rng = np.random.default_rng(seed)
    voice = voice_like(rng, seconds, rate)
    noise = rng.standard_normal(len(voice)) * 10 ** rng.uniform(-3, -1)
    samples = np.rint((voice + noise) * 32768.0 * rng.uniform(0.1, 0.6))
    samples[len(samples) // 2 : len(samples) // 2 + rate // 5] = 0
    return np.clip(samples, -32768, 32767).astype(np.float32)


def bundled_recording(rate: int) -> np.ndarray:
    """Real speech in noise, likewise."""
    samples = read_audio(ROOT / "examples" / "audio" / "noisy.flac", rate)[: 3 * rate]
    return np.clip(np.rint(samples * 32768.0), -32768, 32767).astype(np.float32)


def random_weight(kind: type, layout: Layout, seed: int, controls: dict | None = None) -> mvw.Weight:
    torch.manual_seed(seed)
    network = kind(layout.preview * layout.bands, 24, layout.bands)
    with torch.no_grad():
        for parameter in network.parameters():
            parameter.add_(0.05 * torch.randn_like(parameter))
    rng = np.random.default_rng(seed)
    mean, deviation = rng.uniform(10, 15, layout.bands), rng.uniform(2, 4, layout.bands)
    return noise_weight(network, layout, mean, deviation, f"random {kind.__name__} {seed}", controls)


def reference_output(weight: mvw.Weight, samples: np.ndarray, frame_ms: int) -> np.ndarray:
    model = NoiseModel(weight, frame_ms)
    size = model.layout.rate * frame_ms // 1000
    frames = [model.process(samples[at : at + size]) for at in range(0, len(samples) // size * size, size)]
    return np.clip(np.concatenate(frames), -32768, 32767)


def assert_same_masks(weight: mvw.Weight, samples: np.ndarray) -> None:
    model = NoiseModel(weight)
    step, expected = model.step, []

    def noted(x: np.ndarray) -> np.ndarray:
        expected.append(step(x))
        return expected[-1]

    model.step = noted
    layout = model.layout
    for at in range(0, len(samples) - layout.frame + 1, layout.hop):
        model.hop(samples[at : at + layout.frame])
    masks = network_masks(mvw.encode(weight), samples, layout.bands)
    assert masks.shape == (len(expected), layout.bands)
    assert np.ptp(masks) > 0.01
    assert np.abs(masks - np.array(expected)).max() < 1e-3


def assert_same_audio(engine: Engine, weight: mvw.Weight, frame_ms: int, samples: np.ndarray) -> None:
    rate = layout_of(weight).rate
    assert_same_masks(weight, samples)
    expected = reference_output(weight, samples, frame_ms)
    result = engine.clean(engine.register(mvw.encode(weight)), samples / 32768.0, rate, frame_ms) * 32768.0
    assert np.abs(expected).max() > 100, "the comparison must not be of silence"
    assert np.abs(result - expected).max() < AUDIO_TOLERANCE
    assert np.sqrt(np.mean(np.square(result - expected))) < 1e-3 * np.sqrt(np.mean(np.square(expected)))


@pytest.mark.parametrize("frame_ms", [10, 20, 30, 40])
@pytest.mark.parametrize("layout", [FULL_32K, SMALL_16K, SMALL_8K], ids=lambda layout: str(layout.rate))
@pytest.mark.parametrize("kind", [LayerNormGatedNetwork, PlainGatedNetwork])
def test_random_noise_model(engine: Engine, kind: type, layout: Layout, frame_ms: int) -> None:
    weight = random_weight(kind, layout, layout.rate + frame_ms)
    assert_same_audio(engine, weight, frame_ms, recording(layout.rate, seed=frame_ms))


@pytest.mark.parametrize(
    "controls",
    [
        {"SMOOT_COEF": 0.4},
        {"SMOOT_RM_MODIFY": b"t"},
        {"HIGH_FREQ_SMOOT": b"t", "ENABLE_RM_THRESHOLD": b"t", "RM_THRESHOLD": 0.6},
        {"ENABLE_RESCALE": b"f"},
        {"RESCALE_REF_AMPL": 900.0, "RESCALE_REF_EN": 5000.0},
    ],
    ids=lambda controls: "+".join(controls),
)
def test_tunable_parameters(engine: Engine, controls: dict) -> None:
    seed = 100 + sum(map(len, controls))
    weight = random_weight(LayerNormGatedNetwork, SMALL_16K, seed, controls)
    assert_same_audio(engine, weight, 10, recording(16000))


def test_random_noise_level(engine: Engine) -> None:
    weight = random_weight(PlainGatedNetwork, SMALL_16K, 9)
    assert_same_levels(engine, weight, 10, recording(16000))
    assert_same_levels(engine, weight, 30, recording(16000))


def assert_same_levels(engine: Engine, weight: mvw.Weight, frame_ms: int, samples: np.ndarray) -> None:
    rate = layout_of(weight).rate
    size = rate * frame_ms // 1000
    model = NoiseLevelModel(weight, frame_ms)
    expected = [model.level(samples[at : at + size]) for at in range(0, len(samples) // size * size, size)]
    levels = engine.values("NoiseDB", engine.register(mvw.encode(weight)), samples.astype(np.int16), rate, frame_ms)
    assert np.abs(levels - expected).max() < 0.05


def assert_same_scores(engine: Engine, weight: mvw.Weight, frame_ms: int, samples: np.ndarray) -> None:
    size = 8 * frame_ms
    model = VoiceModel(weight)
    expected = np.array([model.score(samples[at : at + size]) for at in range(0, len(samples) // size * size, size)])
    scores = engine.values("VAD", engine.register(mvw.encode(weight)), samples.astype(np.int16), 8000, frame_ms)
    assert expected.max() - expected.min() > 1e-3
    assert np.abs(scores - expected).max() < 1e-3


@pytest.mark.parametrize("frame_ms", [10, 20, 30, 40])
def test_random_voice_model(engine: Engine, frame_ms: int) -> None:
    torch.manual_seed(frame_ms)
    network = PlainGatedNetwork(305, 16, 1, linear_output=True)
    rng = np.random.default_rng(frame_ms)
    weight = voice_weight(network, rng.uniform(8, 12, 61), rng.uniform(4, 9, 61), [-3.0, 0.1, 4.0])
    weight["ModelName"] = f"random voice {frame_ms}".encode()
    assert_same_scores(engine, weight, frame_ms, recording(8000))


@pytest.mark.parametrize("frame_ms", [10, 40])
@pytest.mark.parametrize("path", SHIPPED, ids=lambda path: Path(path).stem)
def test_shipped_weight(engine: Engine, path: Path, frame_ms: int) -> None:
    weight = mvw.read(path)
    version = bytes(weight["Version"])
    samples = bundled_recording(int(weight["SampleRate"]))
    if b"VAD" in version:
        assert_same_scores(engine, weight, frame_ms, samples)
        return
    assert_same_audio(engine, weight, frame_ms, samples)
    if version == b"0.0.5":
        assert_same_levels(engine, weight, frame_ms, samples)
