"""A small synthetic store, so that the tests need no recordings."""

from __future__ import annotations

import sys
from pathlib import Path

import numpy as np
import pytest

ROOT = Path(__file__).resolve().parents[2]
sys.path.insert(0, str(ROOT / "bench" / "quality"))

from morva_training import corpus  # noqa: E402


def voice_like(rng: np.random.Generator, seconds: float, rate: int = 32000) -> np.ndarray:
    """A gliding harmonic tone, switched on and off like syllables."""
    time = np.arange(int(seconds * rate)) / rate
    phase = 2 * np.pi * np.cumsum(rng.uniform(90, 250) * (1 + 0.1 * np.sin(2 * np.pi * 2 * time))) / rate
    tone = sum(np.sin(k * phase) / k for k in range(1, 25))
    syllables = np.clip(4 * np.sin(2 * np.pi * 1.7 * time + rng.uniform(0, 6)) + 1, 0, 1)
    return (0.15 * tone * syllables).astype(np.float32)


def write_wav(path: Path, samples: np.ndarray, rate: int = 32000) -> None:
    from scipy.io import wavfile

    path.parent.mkdir(parents=True, exist_ok=True)
    wavfile.write(path, rate, corpus.to_int16(samples))


def read_wav(path: Path, rate: int) -> np.ndarray:
    from scipy.io import wavfile

    file_rate, samples = wavfile.read(path)
    assert file_rate == rate
    return samples.astype(np.float32) / 32768.0


@pytest.fixture(scope="session")
def store(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """A decoded store of eight speakers, twelve noises and two rooms; the last of each is held out."""
    root = tmp_path_factory.mktemp("audio")
    rng = np.random.default_rng(11)
    speech, noise, rooms = [], [], []
    for n in range(8):
        split = "heldout" if n > 5 else "train"
        path = f"speech/s{n}.wav"
        write_wav(root / path, voice_like(rng, 6.0))
        speech.append({"path": path, "speaker": f"s{n}", "band": ("full", "8k")[n % 2], "split": split})
    for n in range(12):
        split = "heldout" if n > 9 else "train"
        path = f"noise/n{n}.wav"
        write_wav(root / path, 0.1 * rng.standard_normal(96000).astype(np.float32))
        noise.append({"path": path, "category": ("fan", "music")[n % 2], "split": split})
    for n in range(2):
        path = f"rir/r{n}.wav"
        write_wav(root / path, np.concatenate([np.zeros(80), [0.9], 0.02 * rng.standard_normal(4000)]))
        rooms.append({"path": path, "split": ("train", "heldout")[n]})
    out = tmp_path_factory.mktemp("store")
    with pytest.MonkeyPatch.context() as patch:
        patch.setattr(corpus, "read_audio", read_wav)
        corpus.build_store(speech, root, out, "speech")
        corpus.build_store(noise, root, out, "noise")
        corpus.build_rooms(rooms, root, out)
    return out
