"""What training computes over whole recordings is what the engine computes frame by frame."""

from __future__ import annotations

import ctypes
import os
from pathlib import Path

import numpy as np
import pytest
import torch
from conftest import voice_like
from tree import ROOT

import morva
from morva_training import mvw
from morva_training.convert import layout_of, network_of, noise_weight, voice_weight
from morva_training.corpus import read_audio
from morva_training.networks import LayerNormGatedNetwork, PlainGatedNetwork, network_input
from morva_training.spectra import FULL_32K, SMALL_8K, SMALL_16K, Layout, analyse, frame_energies, frames_of
from morva_training.spectra import level_gains, log_features, vorbis_window
from morva_training.voice import stream_features

LIBRARY = Path(os.environ.get("MORVA_LIBRARY", ROOT / "build/release/libmorva.so"))
SHIPPED = sorted(path.stem for path in (ROOT / "models").glob("*.mvw"))
LAYOUTS = [FULL_32K, SMALL_16K, SMALL_8K]


def shaken(network: torch.nn.Module, seed: int) -> torch.nn.Module:
    """Random values everywhere, biases and gains included."""
    torch.manual_seed(seed)
    with torch.no_grad():
        for parameter in network.parameters():
            parameter.add_(0.1 * torch.randn_like(parameter))
    return network


def made_sound(rate: int) -> np.ndarray:
    """Voice-like sound in noise with a silent stretch, 16-bit scale."""
    rng = np.random.default_rng(5)
    samples = voice_like(rng, 2.5, rate) + 0.03 * rng.standard_normal(5 * rate // 2)
    samples[rate : rate + rate // 5] = 0
    return np.rint(samples * 12000).astype(np.float32)


def real_sound(rate: int) -> np.ndarray:
    samples = read_audio(ROOT / "examples/audio/noisy.flac", rate)[: 3 * rate]
    return np.clip(np.rint(samples * 32768.0), -32768, 32767).astype(np.float32)


def network_masks(weight: bytes, samples: np.ndarray, bands: int) -> np.ndarray:
    """The engine's network output, [frames, bands], frame by frame of the samples."""
    probe = ctypes.CDLL(str(LIBRARY.parent / "tests/noise_canceller/libmorva_mask_probe.so")).mask_probe
    size, pointer = ctypes.c_size_t, ctypes.c_void_p
    probe.restype, probe.argtypes = size, [ctypes.c_char_p, size, pointer, size, pointer, size]
    masks = np.empty(len(samples) * bands, np.float32)
    count = probe(weight, len(weight), samples.ctypes.data, len(samples), masks.ctypes.data, len(masks))
    return masks[:count].reshape(-1, bands)


def trained_masks(weight: mvw.Weight, samples: np.ndarray) -> np.ndarray:
    layout, network = layout_of(weight), network_of(weight)
    spectra, frames = analyse(samples, layout), frames_of(samples, layout.hop)
    features = log_features(spectra, level_gains(np.square(frames).mean(-1), layout.active_frames), layout)
    mean, deviation = torch.from_numpy(weight["MU"]), torch.from_numpy(weight["SD"])
    with torch.no_grad():
        x = network_input(torch.from_numpy(features)[None], mean, deviation, layout.preview)
        return torch.sigmoid(network(x, network.initial_state(1))[0])[0].numpy()


def masked(samples: np.ndarray, masks: np.ndarray, layout: Layout) -> np.ndarray:
    """Overlap-add of the spectra under the squared mask, in the samples' place; the last hop is missing."""
    gain = np.zeros((len(masks), layout.bins + 1), np.float32)
    gain[:, : layout.bins] = masks[:, layout.band_of_bin()] ** 2
    frames = np.fft.irfft(analyse(samples, layout) * gain) * vorbis_window(layout.frame)
    hop = layout.hop
    return (frames[:-1, hop:] + frames[1:, :hop]).reshape(-1)


def assert_same_sound(weight: mvw.Weight, path: Path, samples: np.ndarray, frame_ms: int) -> None:
    layout = layout_of(weight)
    samples = samples[: len(samples) // layout.hop * layout.hop]
    masks = trained_masks(weight, samples)
    hop_of_silence = np.zeros(layout.hop, np.float32)
    engines = network_masks(mvw.encode(weight), np.concatenate([hop_of_silence, samples]), layout.bands)
    assert engines.shape == masks.shape and np.ptp(masks) > 0.01
    assert np.abs(engines - masks).max() < 1e-3
    expected = masked(samples, masks, layout)
    result = morva.denoise(samples / 32768, layout.rate, frame_ms=frame_ms, model=str(path)) * 32768
    assert np.abs(expected).max() > 100, "the comparison must not be of silence"
    assert np.abs(result[: len(expected)] - expected).max() < 4


def assert_same_scores(weight: mvw.Weight, path: Path, samples: np.ndarray, frame_ms: int) -> None:
    features = torch.from_numpy(stream_features(samples[None], 8 * frame_ms))
    mean, scale = torch.from_numpy(weight["MU"]), torch.sqrt(torch.from_numpy(weight["SD"]) + 1e-7)
    network = network_of(weight)
    with torch.no_grad():
        logits = network(network_input(features, mean, scale, 5), network.initial_state(1))[0][0, :, 0].numpy()
    low, high = weight["Test_MINMAX"]
    expected = np.interp(logits, [low, weight["Test_BestF1"][0], high], [0, 0.5, 1]).clip(1e-5, 0.99999)
    scores = morva.voice(samples / 32768, 8000, frame_ms=frame_ms, model=str(path))[: len(expected)]
    assert np.ptp(expected) > 1e-3
    assert np.abs(scores - expected).max() < 1e-3


@pytest.mark.parametrize("layout", LAYOUTS, ids=lambda layout: str(layout.rate))
@pytest.mark.parametrize("kind", [LayerNormGatedNetwork, PlainGatedNetwork])
@pytest.mark.parametrize("layers", [2, 4])
def test_random_noise_model(kind: type, layout: Layout, layers: int, tmp_path: Path) -> None:
    network = shaken(kind(layout.preview * layout.bands, 24, layout.bands, layers), layers)
    rng = np.random.default_rng(layers)
    mean, deviation = rng.uniform(10, 15, layout.bands), rng.uniform(2, 4, layout.bands)
    weight = noise_weight(network, layout, mean, deviation, f"random {layers}")  # equal names are one model
    mvw.write(tmp_path / "random.mvw", weight)
    assert_same_sound(weight, tmp_path / "random.mvw", made_sound(layout.rate), 10 * layers)


@pytest.mark.parametrize("frame_ms", [10, 20, 30, 40])
def test_random_voice_model(frame_ms: int, tmp_path: Path) -> None:
    network = shaken(PlainGatedNetwork(305, 16, 1, linear_output=True), frame_ms)
    rng = np.random.default_rng(frame_ms)
    weight = voice_weight(network, rng.uniform(8, 12, 61), rng.uniform(4, 9, 61), [-3.0, 0.1, 4.0])
    weight["ModelName"] = f"random {frame_ms}".encode()
    mvw.write(tmp_path / "random.mvw", weight)
    assert_same_scores(weight, tmp_path / "random.mvw", made_sound(8000), frame_ms)


@pytest.mark.parametrize("stem", SHIPPED)
def test_shipped_weight(stem: str) -> None:
    path = ROOT / "models" / f"{stem}.mvw"
    weight = mvw.read(path)
    compare = assert_same_scores if b"VAD" in bytes(weight["Version"]) else assert_same_sound
    compare(weight, path, real_sound(int(weight["SampleRate"])), 10)


def test_level_gain_of_a_piece_in_the_middle_of_a_call() -> None:
    """The energies come from the spectra, and a long history outweighs the start."""
    samples = np.random.default_rng(2).standard_normal(320 * 400).astype(np.float32) * 300
    estimate = frame_energies(analyse(samples, FULL_32K), FULL_32K.frame)[1:]
    assert np.mean(estimate / np.square(frames_of(samples, 320)).mean(-1)[1:]) == pytest.approx(1, abs=0.02)
    assert np.allclose(level_gains(np.full(50, 1e4), 300, history=1e4), 20.0)
