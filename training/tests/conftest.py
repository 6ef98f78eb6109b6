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


def voice_like(rng: np.random.Generator, seconds: float) -> np.ndarray:
    """A gliding harmonic tone, switched on and off like syllables."""
    time = np.arange(int(seconds * 32000)) / 32000
    phase = 2 * np.pi * np.cumsum(rng.uniform(90, 250) * (1 + 0.1 * np.sin(2 * np.pi * 2 * time))) / 32000
    tone = sum(np.sin(k * phase) / k for k in range(1, 25))
    syllables = np.clip(4 * np.sin(2 * np.pi * 1.7 * time + rng.uniform(0, 6)) + 1, 0, 1)
    return (0.15 * tone * syllables).astype(np.float32)


@pytest.fixture(scope="session")
def store(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """A store of eight speakers, fourteen noises and two rooms; the last of each are held out."""
    root, rng = tmp_path_factory.mktemp("audio"), np.random.default_rng(11)
    tables: dict[str, list[corpus.Row]] = {"speech": [], "noise": [], "rir": []}

    def add(kind: str, n: int, samples: np.ndarray, last: int, **columns: str) -> None:
        row = {"path": f"{kind}{n}x.wav", "split": "heldout" if n > last else "train", **columns}
        soundfile.write(root / row["path"], samples, 32000, "PCM_16")
        tables[kind].append(row)

    for n in range(8):
        add("speech", n, voice_like(rng, 6.0), 5, speaker=f"s{n}", band=("full", "8k")[n % 2])
    for n in range(14):  # two clips of each recording
        link = f"someone https://example.org/sounds/{n // 2}/"
        add("noise", n, 0.1 * rng.standard_normal(96000), 11, category=("fan", "music")[n % 2], author=link)
    for n in range(2):
        add("rir", n, np.concatenate([np.zeros(80), [0.9], 0.02 * rng.standard_normal(4000)]), 0)
    corpus.build(tables, root, root / "store")
    return root / "store"
