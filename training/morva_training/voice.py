"""Training material of the voice-activity model: mixtures, labels (see measures) and features at 8 kHz."""

from __future__ import annotations

from pathlib import Path
from typing import Iterator

import numpy as np
import torch
from scipy import fft as sfft
from torch import Tensor
from torch.utils.data import IterableDataset

from .measures import block_labels, frame_labels
from .mixing import MixtureMaker, Recipe
from .spectra import hamming_window

RATE = 8000
FRAME = 240
FEATURES = 61
CONTEXT = 5
BLOCK = RATE // 100

VOICE_RECIPE = Recipe(
    seconds=5.0,
    snr_db=(-9.0, 20.0),
    level_db=(-45.0, -12.0),
    clean_share=0.08,
    noise_only_share=0.25,
    pause_share=0.7,
    pause_seconds=1.0,
    babble_share=0.12,
    talkers=(3, 25),
    made_share=0.15,
    texture_share=0.05,
    start_stop_share=0.15,
    noise_room_share=0.25,
    speed_share=0.75,
    speed=(0.78, 1.3),
    noise_speed_share=0.7,
    noise_speed=(0.65, 1.5),
    second_noise_share=0.45,
    formant_share=0.2,
    room_share=0.3,
    simulated_room_share=0.7,
    early_only=True,
    full_band_share=0.12,  # few speakers, and the band above 4 kHz is of no use here
    microphone_share=0.3,
    gain_step_share=0.1,
    overload_share=0.03,
    codec_share=0.1,
    equaliser_db=4.5,
    boosted=("music", "keyboard", "mouse_click", "human_nonspeech", "baby_cry", "animal", "dog_bark", "cat", "birds"),
)


# Stays as it is, so that the figures of runs compare.
DEV_RECIPE = Recipe(seconds=5.0, snr_db=(-5.0, 15.0), level_db=(-40.0, -15.0), pause_share=0.7, pause_seconds=1.0)


def pooling_starts(bins: int) -> np.ndarray:
    """First bins of the voice model's bands: single bins, then pairs, fours and so on per octave."""
    extra = 1 if bins % 8 == 1 else 0
    quarter = bins // 4
    starts = list(range(quarter + extra))
    index, width, boundary = quarter + extra, 2, 2 * quarter
    while index < bins:
        if index - extra == boundary:
            width, boundary = 2 * width, 2 * boundary
        starts.append(index)
        index += width
    return np.array(starts)


def voice_features(spectrum: np.ndarray) -> np.ndarray:
    """Log band powers [..., F] of spectra [..., FrameLength / 2 + 1], before standardisation."""
    power = np.square(spectrum.real) + np.square(spectrum.imag)
    starts = pooling_starts(power.shape[-1])
    widths = np.diff(np.append(starts, power.shape[-1]))
    return np.log(np.add.reduceat(power, starts, axis=-1) / widths + 1).astype(np.float32)


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


class VoiceBatches(IterableDataset):
    """Endless batches of features, labels and weights; the caller's frame changes from batch to batch.

    Every draw is used `reuse` times, each time in another noise.
    """

    FRAME_BLOCKS = (1, 1, 1, 1, 2, 3, 4)

    def __init__(
        self,
        store: Path,
        size: int,
        seed: int,
        split: str = "train",
        recipe: Recipe = VOICE_RECIPE,
        blocks: int = 0,
        reuse: int = 1,
    ) -> None:
        self.store, self.size, self.seed, self.split = store, size, seed, split
        self.recipe, self.blocks, self.reuse = recipe, blocks, reuse

    def __iter__(self) -> Iterator[dict[str, Tensor]]:
        worker = torch.utils.data.get_worker_info()
        seed = self.seed * 1000 + (worker.id if worker else 0)
        torch.set_num_threads(1)
        maker = MixtureMaker(self.store, seed, self.recipe, self.split, RATE)
        while True:
            blocks = self.blocks or int(maker.rng.choice(self.FRAME_BLOCKS))
            pieces = maker.draws(self.size, self.reuse)
            noisy, clean = np.stack([p.heard() for p in pieces]), np.stack([p.speech for p in pieces])
            labels = [block_labels(p.speech, BLOCK) for p in pieces]
            voice, weight = (np.stack([frame_labels(pair[i], blocks) for pair in labels]) for i in (0, 1))
            features = torch.from_numpy(stream_features(noisy, blocks * BLOCK))
            clean = torch.from_numpy(stream_features(clean, blocks * BLOCK, heard=noisy))
            yield {
                "features": features,
                "speech": torch.exp(clean - features).clamp_(0.0, 1.0),  # share of the power, both of them logs
                "voice": torch.from_numpy((voice > 0.5).astype(np.float32)),
                "weight": torch.from_numpy(weight),
            }
