"""Training material of the voice-activity model: mixtures, labels and features at 8 kHz.

Labels come from the clean speech alone. A 10 ms block is voice when its power is within 30 dB of
the speaker's loud blocks, and so is its power above 80 Hz (what lies below is the rumble of desks
and traffic); gaps below 80 ms are closed, islands below 30 ms dropped, edges stay where they are.
Blocks between 30 and 42 dB do not count, they are neither.
"""

from __future__ import annotations

from pathlib import Path
from typing import Iterator

import numpy as np
import torch
from scipy import fft as sfft
from scipy.ndimage import binary_closing, binary_opening
from scipy.signal import butter, sosfiltfilt
from torch import Tensor
from torch.utils.data import IterableDataset

from .engine import voice_features
from .mixing import MixtureMaker, Recipe
from .spectra import hamming_window

RATE = 8000
FRAME = 240
FEATURES = 61
CONTEXT = 5
BLOCK = RATE // 100
VOICE_DB, DOUBT_DB = -30.0, -42.0
LOWEST_VOICE_HZ = 80.0

VOICE_RECIPE = Recipe(
    seconds=5.0,
    snr_db=(-9.0, 20.0),
    level_db=(-45.0, -12.0),
    clean_share=0.08,
    noise_only_share=0.17,
    pause_share=0.7,
    pause_seconds=1.0,
    babble_share=0.12,
    speed_share=0.75,
    speed=(0.78, 1.3),
    noise_speed_share=0.7,
    noise_speed=(0.65, 1.5),
    second_noise_share=0.45,
    room_share=0.2,
    full_band_share=0.12,  # few speakers, and the band above 4 kHz is of no use here
    equaliser_db=4.5,
    boosted=("music", "keyboard", "mouse_click", "human_nonspeech", "baby_cry", "animal", "dog_bark", "cat", "birds"),
)


# Stays as it is, so that the figures of runs compare.
DEV_RECIPE = Recipe(seconds=5.0, snr_db=(-5.0, 15.0), level_db=(-40.0, -15.0), pause_share=0.7, pause_seconds=1.0)


def relative_power(samples: np.ndarray, block: int) -> np.ndarray:
    """Power per block over that of the loud ones; zeros when nothing is there."""
    power = np.square(samples.reshape(-1, block)).mean(axis=1)
    if not len(power) or power.max() <= 0:
        return np.zeros(len(power))
    return power / np.percentile(power[power > power.max() * 1e-5], 90)


def block_labels(speech: np.ndarray, block: int = BLOCK) -> tuple[np.ndarray, np.ndarray]:
    """Voice (bool) and weight per block (10 ms) of clean speech."""
    count = len(speech) // block
    if count == 0:
        return np.zeros(0, bool), np.ones(0, np.float32)
    samples = speech[: count * block].astype(np.float64)
    high_pass = butter(4, LOWEST_VOICE_HZ, "highpass", fs=100 * block, output="sos")
    voiced = sosfiltfilt(high_pass, samples, padlen=min(len(samples) - 1, 10 * block))
    # Both: the filter rings ahead of a start, and rumble is loud without it.
    power = np.minimum(relative_power(samples, block), relative_power(voiced, block))
    voice = power > 10 ** (VOICE_DB / 10)
    padded = np.pad(voice, 8)
    padded = binary_opening(binary_closing(padded, np.ones(8)), np.ones(3))
    voice = padded[8:-8]
    doubtful = ~voice & (power > 10 ** (DOUBT_DB / 10))
    weight = np.where(doubtful, 0.0, 1.0)
    onset = np.flatnonzero(np.diff(voice.astype(int)) == 1) + 1
    for start in onset:
        weight[start : start + 5] = 2.0
    return voice, weight.astype(np.float32)


def frame_labels(values: np.ndarray, blocks: int) -> np.ndarray:
    """Mean of the block values over caller's frames of `blocks` blocks."""
    count = len(values) // blocks
    return values[: count * blocks].reshape(count, blocks).astype(np.float32).mean(axis=1)


def tracked_gains(frames: np.ndarray) -> np.ndarray:
    """The level tracker's gain per caller's frame, [B, T], of frames [B, T, N]."""
    energies = np.square(frames.astype(np.float64)).mean(axis=2)
    share = 1 - 10**-0.02
    level = np.full(len(frames), 4000000.0)
    gains = np.empty_like(energies)
    for t in range(energies.shape[1]):
        e = energies[:, t]
        rate = np.where(e > 2.0 * level, 1 - share, share)
        level = np.where(e >= 10000.0, (1 - rate) * level + rate * e, level)
        gains[:, t] = 2000.0 / (np.sqrt(level) + 1e-7)
    return gains.astype(np.float32)


def stream_features(samples: np.ndarray, frame: int, heard: np.ndarray | None = None) -> np.ndarray:
    """Features [B, T, 61], not standardised, of streams [B, n] fed in frames of `frame` samples.

    The level tracker follows `heard` where it is given, for the features of one part of a mixture.
    """
    count = samples.shape[1] // frame
    frames = samples[:, : count * frame].reshape(len(samples), count, frame)
    tracked = frames if heard is None else heard[:, : count * frame].reshape(frames.shape)
    levelled = (frames * tracked_gains(tracked)[:, :, None]).reshape(len(samples), -1)
    padded = np.pad(levelled, [(0, 0), (FRAME, 0)])
    view = np.lib.stride_tricks.sliding_window_view(padded, FRAME, axis=1)[:, frame::frame]
    spectra = sfft.rfft((view[:, :count] * hamming_window(FRAME)).astype(np.float32), axis=-1)
    return voice_features(spectra)


def network_input(features: Tensor, mean: Tensor, variance: Tensor) -> Tensor:
    """Standardised features with four frames of context; before the start there is silence."""
    padded = torch.nn.functional.pad(features, (0, 0, CONTEXT - 1, 0))
    standard = (padded - mean) / torch.sqrt(variance + 1e-7)
    count = features.shape[1]
    return torch.cat([standard[:, i : i + count] for i in range(CONTEXT)], dim=-1)


class VoiceBatches(IterableDataset):
    """Endless batches of features, labels and weights; the caller's frame changes from batch to batch."""

    FRAME_BLOCKS = (1, 1, 1, 1, 2, 3, 4)

    def __init__(
        self, store: Path, size: int, seed: int, split: str = "train", recipe: Recipe = VOICE_RECIPE, blocks: int = 0
    ) -> None:
        self.store, self.size, self.seed, self.split = store, size, seed, split
        self.recipe, self.blocks = recipe, blocks

    def piece(self, maker: MixtureMaker) -> tuple[np.ndarray, np.ndarray, np.ndarray, np.ndarray]:
        """Noisy samples, clean samples, voice per block, weight per block."""
        waves = maker.draw_waves()
        count = len(waves.speech)
        speech_gain, noise_gain = maker.equalisers(count // 2 + 1)
        both = sfft.rfft(np.stack([waves.speech, waves.noise]).astype(np.float32), axis=-1)
        both *= np.stack([speech_gain, noise_gain])
        speech, noise = sfft.irfft(both, n=count, axis=-1)
        speech = speech if waves.has_speech else np.zeros_like(speech)
        return np.clip(speech + noise, -32768, 32767), speech, *block_labels(speech)

    def __iter__(self) -> Iterator[dict[str, Tensor]]:
        worker = torch.utils.data.get_worker_info()
        seed = self.seed * 1000 + (worker.id if worker else 0)
        torch.set_num_threads(1)
        maker = MixtureMaker(self.store, seed, self.recipe, self.split, RATE)
        while True:
            blocks = self.blocks or int(maker.rng.choice(self.FRAME_BLOCKS))
            pieces = [self.piece(maker) for _ in range(self.size)]
            noisy, clean = (np.stack([p[i] for p in pieces]) for i in (0, 1))
            voice, weight = (np.stack([frame_labels(p[i], blocks) for p in pieces]) for i in (2, 3))
            features = torch.from_numpy(stream_features(noisy, blocks * BLOCK))
            clean = torch.from_numpy(stream_features(clean, blocks * BLOCK, heard=noisy))
            yield {
                "features": features,
                "speech": torch.exp(clean - features).clamp_(0.0, 1.0),  # share of the power, both of them logs
                "voice": torch.from_numpy((voice > 0.5).astype(np.float32)),
                "weight": torch.from_numpy(weight),
            }
