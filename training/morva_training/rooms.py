"""Simulated rooms: the direct sound, mirror images of it in the walls, and a diffuse tail behind them."""

from __future__ import annotations

import numpy as np
from scipy import fft as sfft

from .synthesis.sources import BAND_HZ, STEP_HZ, added, moving_noise, steps_of

SOUND_SPEED = 343.0  # metres per second
LONGEST = 0.9  # seconds
EARLY_SECONDS, EARLY_FADE = 0.05, 0.01  # what is early, and how long the change to late takes
_IMAGES = np.stack(np.meshgrid(*[np.arange(-3, 4)] * 3, indexing="ij"), -1).reshape(-1, 3)
_IMAGES = _IMAGES[np.abs(_IMAGES).sum(1) <= 4]


def _reflections(rng: np.random.Generator, rate: int, size: np.ndarray, distance: float, kept: float) -> np.ndarray:
    """The first 60 ms of a room with six equal walls that keep the share `kept` of the amplitude, duller each time."""
    listener = size * rng.uniform(0.2, 0.8, 3)
    direction = rng.standard_normal(3) * [1.0, 1.0, 0.3]
    source = np.clip(listener + distance * direction / np.linalg.norm(direction), 0.1, size - 0.1)
    even = _IMAGES % 2 == 0
    images = _IMAGES * size + np.where(even, source, size - source)
    metres = np.linalg.norm(images - listener, axis=1)
    direct = np.linalg.norm(source - listener)
    order = np.abs(_IMAGES).sum(1)
    strength = kept**order * direct / np.maximum(metres, 0.1) * rng.choice([1.0, -1.0], len(order), p=[0.9, 0.1])
    strength[order == 0] = 1.0
    delay = np.maximum(0.0, metres - direct) / SOUND_SPEED * rate
    near = delay < 0.06 * rate
    count = int(0.06 * rate) + 2
    trains = np.zeros((5, count), np.float32)
    np.add.at(trains, (order[near], delay[near].astype(int)), strength[near])
    frequency = sfft.rfftfreq(count, 1 / rate)
    dulling = 1.0 / (1.0 + np.square(frequency / rng.uniform(3000.0, 16000.0)))
    return sfft.irfft(np.sum(sfft.rfft(trains) * dulling ** np.arange(5)[:, None], axis=0), n=count)


def simulated_room(rng: np.random.Generator, rate: int, metres: tuple[float, float] = (0.3, 3.6)) -> np.ndarray:
    """A room response, the direct sound first and of height one; talkers so far away, dead and live rooms."""
    size = rng.uniform([2.0, 1.8, 2.2], [9.0, 7.0, 3.6])
    distance = metres[0] * (metres[1] / metres[0]) ** rng.random()
    t60 = 0.12 * 6.0 ** rng.random()
    volume, surface = float(np.prod(size)), 2 * float(size[0] * size[1] + size[1] * size[2] + size[0] * size[2])
    absorbed = min(0.9, 0.161 * volume / (surface * t60))
    early = _reflections(rng, rate, size, distance, np.sqrt(1.0 - absorbed))
    count = int(min(1.2 * t60, LONGEST) * rate)
    time = np.arange(steps_of(count, rate))[:, None] / STEP_HZ
    decay = t60 * np.exp(rng.uniform(-0.35, 0.1) * np.log2(BAND_HZ / 1000.0) * (BAND_HZ > 1000.0))
    decay *= np.exp(rng.uniform(-0.2, 0.2) * np.log2(BAND_HZ / 1000.0) * (BAND_HZ <= 1000.0))
    tail = moving_noise(rng, -6.9 * time / decay, count, rate)
    start = int(rng.uniform(0.005, 0.03) * rate)
    tail[:start] *= np.square(np.linspace(0.0, 1.0, start, dtype=np.float32))
    critical = 0.057 * np.sqrt(volume / t60)  # distance at which the room is as loud as the direct sound
    loudness = min(1.8, distance / critical * rng.uniform(0.5, 1.2))
    tail *= loudness / (np.sqrt(np.sum(np.square(tail))) + 1e-9)
    room = np.zeros(max(count, len(early)), np.float32)
    added(room, early.astype(np.float32), 0)
    added(room, tail, 0)
    room[0] = 1.0
    return room


def parted(room: np.ndarray, rate: int) -> tuple[np.ndarray, np.ndarray]:
    """The direct sound with the early reflections, and what comes later; their sum is the room."""
    last = min(len(room), int(np.argmax(np.abs(room))) + int(EARLY_SECONDS * rate))
    early = room[:last].copy()
    fade = min(last, int(EARLY_FADE * rate))
    early[last - fade :] *= np.linspace(1.0, 0.0, fade, dtype=np.float32)
    late = room.copy()
    late[:last] -= early
    return early, late


def convolved(samples: np.ndarray, responses: list[np.ndarray]) -> np.ndarray:
    """The samples through each response, as long as they are: [responses, samples]."""
    size = sfft.next_fast_len(len(samples) + max(map(len, responses)), real=True)
    stacked = np.zeros((len(responses), size), np.float32)
    for row, response in zip(stacked, responses):
        row[: len(response)] = response
    return sfft.irfft(sfft.rfft(stacked) * sfft.rfft(samples, size), size)[:, : len(samples)]
