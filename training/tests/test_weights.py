"""Weight files: what is written is what is read, and what training computes with the values over whole
recordings is what the engine computes frame by frame."""

from __future__ import annotations

import struct
from pathlib import Path

import numpy as np
import pytest
import torch
from tree import ROOT

import morva
from morva_training import mvw
from morva_training.convert import half_precision, layout_of, network_of, noise_weight, voice_weight
from morva_training.corpus import read_audio
from morva_training.describe import described
from morva_training.networks import LayerNormGatedNetwork, PlainGatedNetwork, network_input
from morva_training.spectra import FULL_32K, SMALL_8K, SMALL_16K, Layout, analyse, frame_energies, frames_of
from morva_training.spectra import level_gains, log_features, vorbis_window
from morva_training.voice import stream_features


def test_every_cut_is_noticed_or_lies_between_records() -> None:
    m = np.arange(6, dtype=np.float32).reshape(2, 3)
    weight = {"f": 0.5, "i": -7, "b": b"text", "v": m[0], "m": m, "vs": [m[0], m[1, :0]], "ms": [m, m.T, m[:, :0]]}
    data = mvw.encode(weight)
    assert repr(mvw.decode(data + mvw.encode({"i": 9}))) == repr(weight), "of two equal names the first counts"
    between = {len(mvw.encode(dict(list(weight.items())[:n]))) for n in range(len(weight))}
    for cut in range(len(data)):
        if cut in between:
            assert len(mvw.decode(data[:cut])) < len(weight)
        else:
            with pytest.raises((ValueError, struct.error)):
                mvw.decode(data[:cut])


@pytest.mark.parametrize("value", [True, None, [], np.zeros((1, 1, 1)), "text"])
def test_values_without_a_record_type_are_refused(value: object) -> None:
    with pytest.raises(TypeError):
        mvw.encode({"x": value})


def shaken(network: torch.nn.Module, seed: int) -> torch.nn.Module:
    """Random values everywhere, biases and gains included."""
    torch.manual_seed(seed)
    with torch.no_grad():
        for parameter in network.parameters():
            parameter.add_(0.1 * torch.randn_like(parameter))
    return network


@pytest.mark.parametrize("kind", ["0.0.6", "0.0.5", "VAD_0.0.1"])
def test_networks_come_back(kind: str, tmp_path: Path) -> None:
    """Every value does, the card says the shape, and halves are what the engine stores as halves."""
    features, rng = 3 * SMALL_8K.bands, np.random.default_rng(2)
    mean, spread = rng.random(60), 1 + rng.random(60)
    if kind == "VAD_0.0.1":
        network = shaken(PlainGatedNetwork(features, 10, 1, linear_output=True), 2)
        weight = voice_weight(network, mean, spread, [-1.0, 0.5, 2.0])
    else:
        network = shaken((LayerNormGatedNetwork if kind == "0.0.6" else PlainGatedNetwork)(features, 10, 60), 2)
        weight = noise_weight(network, SMALL_8K, mean, spread, "test")
    mvw.write(tmp_path / "weight.mvw", weight)
    back = mvw.read(tmp_path / "weight.mvw")
    assert back["Version"] == kind.encode() and back["TimeStamp"].isdigit() and len(back["TimeStamp"]) == 10
    assert all(torch.equal(a, b) for a, b in zip(network.parameters(), network_of(back).parameters(), strict=True))
    halves = half_precision(weight)["WeightGRU"]
    assert np.array_equal(halves, halves.astype(np.float16)) and np.allclose(halves, weight["WeightGRU"], 1e-3, 1e-6)
    matrices = [p for p in network.parameters() if p.dim() == 2]
    assert described(back)["multiply-adds per frame"] == sum(p.numel() for p in matrices)


def recording(rate: int) -> np.ndarray:
    """Speech in noise with a silent stretch, 16-bit scale."""
    samples = read_audio(ROOT / "examples/audio/noisy.flac", rate)[: 3 * rate] * 32768
    samples[rate : rate + rate // 5] = 0
    return samples


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
    expected = masked(samples, masks, layout)
    result = morva.denoise(samples / 32768, layout.rate, frame_ms=frame_ms, model=str(path)) * 32768
    assert np.ptp(masks) > 0.01 and np.abs(expected).max() > 100, "the comparison must not be of silence"
    assert np.abs(result[: len(expected)] - expected).max() < 0.1


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


@pytest.mark.parametrize("layout", [FULL_32K, SMALL_16K, SMALL_8K], ids=lambda layout: str(layout.rate))
@pytest.mark.parametrize(
    ("kind", "layers"), [(LayerNormGatedNetwork, 3), (PlainGatedNetwork, 2), (PlainGatedNetwork, 4)]
)
def test_random_noise_model(kind: type, layout: Layout, layers: int, tmp_path: Path) -> None:
    network = shaken(kind(layout.preview * layout.bands, 24, layout.bands, layers), layers)
    rng = np.random.default_rng(layers)
    mean, deviation = rng.uniform(10, 15, layout.bands), rng.uniform(2, 4, layout.bands)
    weight = noise_weight(network, layout, mean, deviation, f"random {layers}")  # equal names are one model
    mvw.write(tmp_path / "random.mvw", weight)
    assert_same_sound(weight, tmp_path / "random.mvw", recording(layout.rate), 10 * layers)


@pytest.mark.parametrize("frame_ms", [10, 20, 30, 40])
def test_random_voice_model(frame_ms: int, tmp_path: Path) -> None:
    network = shaken(PlainGatedNetwork(305, 16, 1, linear_output=True), frame_ms)
    rng = np.random.default_rng(frame_ms)
    weight = voice_weight(network, rng.uniform(8, 12, 61), rng.uniform(4, 9, 61), [-3.0, 0.1, 4.0])
    weight["ModelName"] = f"random {frame_ms}".encode()
    mvw.write(tmp_path / "random.mvw", weight)
    assert_same_scores(weight, tmp_path / "random.mvw", recording(8000), frame_ms)


@pytest.mark.parametrize("path", sorted((ROOT / "models").glob("*.mvw")), ids=lambda path: path.stem)
def test_shipped_weight(path: Path) -> None:
    weight = mvw.read(path)
    compare = assert_same_scores if b"VAD" in bytes(weight["Version"]) else assert_same_sound
    compare(weight, path, recording(int(weight["SampleRate"])), 10)


def test_level_gain_of_a_piece_in_the_middle_of_a_call() -> None:
    """The energies come from the spectra, and a long history outweighs the start."""
    samples = np.random.default_rng(2).standard_normal(320 * 400).astype(np.float32) * 300
    estimate = frame_energies(analyse(samples, FULL_32K), FULL_32K.frame)[1:]
    assert np.mean(estimate / np.square(frames_of(samples, 320)).mean(-1)[1:]) == pytest.approx(1, abs=0.02)
    assert np.allclose(level_gains(np.full(50, 1e4), 300, history=1e4), 20.0)
