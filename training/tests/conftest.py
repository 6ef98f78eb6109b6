"""A small synthetic store, so that the tests need no recordings, and the engine built from the same tree."""

from __future__ import annotations

import sys
from pathlib import Path

import numpy as np
import pytest
import soundfile

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "bench" / "quality"))

import tree  # noqa: E402, F401

from morva_training import corpus  # noqa: E402


def voice_like(rng: np.random.Generator, seconds: float, rate: int = 32000) -> np.ndarray:
    """A gliding harmonic tone, switched on and off like syllables."""
    time = np.arange(int(seconds * rate)) / rate
    phase = 2 * np.pi * np.cumsum(rng.uniform(90, 250) * (1 + 0.1 * np.sin(2 * np.pi * 2 * time))) / rate
    tone = sum(np.sin(k * phase) / k for k in range(1, 25))
    syllables = np.clip(4 * np.sin(2 * np.pi * 1.7 * time + rng.uniform(0, 6)) + 1, 0, 1)
    return (0.15 * tone * syllables).astype(np.float32)


def write_wav(path: Path, samples: np.ndarray) -> None:
    path.parent.mkdir(parents=True, exist_ok=True)
    soundfile.write(path, samples, 32000, "PCM_16")


@pytest.fixture(scope="session")
def data(tmp_path_factory: pytest.TempPathFactory) -> tuple[Path, dict[str, list[corpus.Row]]]:
    """Eight speakers, fourteen noises and two rooms, with their tables; the last of each are held out."""
    root, rng = tmp_path_factory.mktemp("audio"), np.random.default_rng(11)
    tables: dict[str, list[corpus.Row]] = {"speech": [], "noise": [], "rir": []}

    def add(kind: str, name: str, samples: np.ndarray, **columns: str) -> None:
        write_wav(root / kind / f"{name}.wav", samples)
        tables[kind].append({"path": f"{kind}/{name}.wav", **columns})

    for n in range(8):
        split = "heldout" if n > 5 else "train"
        add("speech", f"s{n}", voice_like(rng, 6.0), speaker=f"s{n}", band=("full", "8k")[n % 2], split=split)
    for n in range(14):
        split = "heldout" if n > 11 else "train"
        author = f"someone https://example.org/sounds/{n // 2}/"  # two clips of each recording
        samples = 0.1 * rng.standard_normal(96000).astype(np.float32)
        add("noise", f"n{n}x", samples, category=("fan", "music")[n % 2], author=author, split=split)
    for n in range(2):
        response = np.concatenate([np.zeros(80), [0.9], 0.02 * rng.standard_normal(4000)])
        add("rir", f"r{n}", response, split=("train", "heldout")[n])
    return root, tables


@pytest.fixture(scope="session")
def store(data, tmp_path_factory: pytest.TempPathFactory) -> Path:
    out = tmp_path_factory.mktemp("store")
    corpus.build(data[1], data[0], out)
    return out
