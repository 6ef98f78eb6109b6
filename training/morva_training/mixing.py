"""Mixtures for training: speech, rooms, noises, levels and equalisation drawn at random.

One `MixtureMaker` owns a random generator and a corpus; `draw` returns a piece of speech and what
disturbs it, and how what is heard is clipped. Room reverberation belongs to the speech: the task is to
remove noise, not the room. Speech without content above 8 kHz is flagged, so that the loss gives it no
say about the bins above.
"""

from __future__ import annotations

from dataclasses import dataclass, replace
from pathlib import Path

import numpy as np
from scipy import fft as sfft
from scipy.ndimage import gaussian_filter1d
from scipy.signal import lfilter

from .corpus import BASE_RATE, Clip, Corpus
from .measures import active_level

FULL_SCALE = 32768.0

# Short sounds are a small part of the recordings and a large part of what callers complain about.
IMPULSIVE = (
    "keyboard", "mouse_click", "click", "clock", "knock", "impact", "footsteps", "door", "kitchen", "paper",
    "dog_bark", "eating_drinking", "human_nonspeech", "notification",
)  # fmt: skip


@dataclass(frozen=True)
class Recipe:
    """Ranges and shares of the random draws. Levels in dB relative to full scale."""

    seconds: float = 4.0
    snr_db: tuple[float, float] = (-8.0, 24.0)
    level_db: tuple[float, float] = (-42.0, -14.0)
    clean_share: float = 0.06
    noise_only_share: float = 0.04
    room_share: float = 0.30
    simulated_room_share: float = 0.4  # of the rooms
    second_noise_share: float = 0.35
    synthetic_share: float = 0.06
    babble_share: float = 0.08
    band_limit_share: float = 0.06
    clip_share: float = 0.03
    pause_share: float = 0.5
    pause_seconds: float = 0.5  # mean length
    speed_share: float = 0.25
    speed: tuple[float, float] = (0.9, 1.1)
    noise_speed_share: float = 0.5
    noise_speed: tuple[float, float] = (0.75, 1.35)
    whisper_share: float = 0.04
    full_band_share: float = 0.35
    equaliser_db: float = 3.0  # deviation from one point of the equaliser to the next
    boosted: tuple[str, ...] = IMPULSIVE  # noise categories drawn three times as often


@dataclass(frozen=True)
class Waves:
    """A piece of speech and what disturbs it, as samples on the 16-bit scale."""

    speech: np.ndarray
    noise: np.ndarray
    rate: int
    wideband: bool  # False for speech that holds nothing above 8 kHz
    has_speech: bool
    noisy: bool  # False for a piece that is clean but for a faint background
    clip: float | None = None  # share of its peak at which the microphone clips the sum

    def heard(self) -> np.ndarray:
        total = self.speech + self.noise
        limit = FULL_SCALE if self.clip is None else min(FULL_SCALE, self.clip * np.abs(total).max())
        return np.clip(total, -limit, limit)

    def remixed(self, other: Waves, snr_db: float) -> Waves:
        """This speech in the noise of another piece."""
        noise = at_level(other.noise, self.rate, active_level(self.speech, self.rate), -snr_db)
        return replace(self, noise=noise, noisy=True)


def at_level(samples: np.ndarray, rate: int, reference: float, db: float) -> np.ndarray:
    """The samples with an active level `db` over the reference, which is how every ratio here is measured."""
    return samples * np.float32(reference * 10 ** (db / 20) / (active_level(samples, rate) + 1e-3))


def simulated_room(rng: np.random.Generator, rate: int) -> np.ndarray:
    """A room response as decaying, slowly darkening noise behind the direct sound."""
    t60 = rng.uniform(0.12, 0.7)
    direct_to_reverberant = rng.uniform(-2.0, 12.0)
    length = int(min(t60, 0.6) * rate)
    time = np.arange(length) / rate
    tail = rng.standard_normal(length) * np.exp(-6.9 * time / t60)
    tail = lfilter([1 - rng.uniform(0.1, 0.6)], [1, -rng.uniform(0.1, 0.6)], tail)
    tail[: int(rng.uniform(0.001, 0.006) * rate)] = 0.0
    tail *= 10 ** (-direct_to_reverberant / 20) / (np.sqrt(np.sum(tail**2)) + 1e-9)
    tail[0] = 1.0
    return tail.astype(np.float32)


def whispered(rng: np.random.Generator, samples: np.ndarray, rate: int) -> np.ndarray:
    """The same words without a voice: the smoothed spectrum, excited by noise, thin below 500 Hz."""
    size = rate // 50
    frames = np.lib.stride_tricks.sliding_window_view(np.pad(samples, (size, size)), size)[:: size // 2]
    window = np.sin(np.pi * (np.arange(size) + 0.5) / size).astype(np.float32)
    spectra = sfft.rfft(frames * window, axis=-1)
    envelope = gaussian_filter1d(np.abs(spectra), 4.0, axis=-1)
    frequency = np.arange(envelope.shape[-1]) * 50.0
    noise = rng.standard_normal((*envelope.shape, 2)).astype(np.float32)
    spectra = envelope * (noise[..., 0] + 1j * noise[..., 1]) * (frequency / (frequency + 500.0))
    pieces = sfft.irfft(spectra.astype(np.complex64), n=size, axis=-1) * window
    out = np.zeros((len(pieces) + 1, size // 2), np.float32)
    out[:-1] += pieces[:, : size // 2]
    out[1:] += pieces[:, size // 2 :]
    return out.reshape(-1)[size : size + len(samples)]


def coloured_noise(rng: np.random.Generator, count: int, rate: int) -> np.ndarray:
    """Steady or slowly breathing noise with a random spectral slope and now and then a hum."""
    spectrum = sfft.rfft(rng.standard_normal(count).astype(np.float32))
    frequency = np.maximum(sfft.rfftfreq(count, 1 / rate), 20.0)
    spectrum *= (frequency / 1000.0) ** rng.uniform(-1.2, 0.3)
    noise = sfft.irfft(spectrum, n=count)
    time = np.arange(count) / rate
    if rng.random() < 0.3:
        base = rng.choice([50.0, 60.0, rng.uniform(80, 400)])
        for harmonic in range(1, rng.integers(2, 12)):
            swing = rng.uniform(0, 2 * np.pi)
            noise += noise.std() * rng.uniform(0, 0.8) * np.sin(2 * np.pi * base * harmonic * time + swing)
    if rng.random() < 0.4:
        noise *= 1.0 + rng.uniform(0.1, 0.7) * np.sin(2 * np.pi * rng.uniform(0.1, 6.0) * time)
    return noise.astype(np.float32)


def resampled(samples: np.ndarray, ratio: float) -> np.ndarray:
    """Band-limited, about `ratio` times as long (as the transform finds convenient)."""
    size = sfft.next_fast_len(len(samples), real=True)
    target = sfft.next_fast_len(max(1, round(size * ratio)), real=True)
    spectrum = sfft.rfft(samples, size)[: target // 2 + 1]
    out = sfft.irfft(spectrum, target) * np.float32(target / size)
    return out[: round(len(samples) * target / size)]


def smooth_gain(rng: np.random.Generator, bins: int, rate: int, deviation_db: float) -> np.ndarray:
    """A smooth random equaliser over the bins up to rate / 2: six points, evenly spaced in octaves."""
    points = np.cumsum(rng.normal(0.0, deviation_db, 6)) * 0.6
    frequency = np.linspace(0.0, rate / 2, bins)
    position = np.log2(1 + frequency / 200.0) / np.log2(1 + rate / 400.0) * 5
    curve = np.interp(position, np.arange(6), points - points.mean())
    return (10 ** (curve / 20)).astype(np.float32)


class Warped:
    """Recordings faster and higher, or slower and lower. They come from the copy of twice the rate
    where there is one, so that slower ones lose no treble."""

    def __init__(self, store: Path, rate: int) -> None:
        self.ratio = 2 if rate < BASE_RATE else 1
        self.fine = Corpus(store, rate * self.ratio)
        every = [c for kind in ("speech", "noise") for c in self.fine.of_all_splits(kind)]
        self.clips = {(clip.kind, clip.path): clip for clip in every}

    def read(self, clip: Clip, offset: int, length: int, factor: float) -> np.ndarray:
        """About `length` samples, or what there is, of a clip of the plain corpus from its `offset` on."""
        fine = self.clips[clip.kind, clip.path]
        piece = self.fine.read(fine, offset * self.ratio, int(length * self.ratio * factor))
        return resampled(piece, 1.0 / (self.ratio * factor)) if len(piece) else piece


def odds_of(groups: dict[str, list[Clip]]) -> np.ndarray:
    """More for what there is more of, but less than in proportion."""
    weight = np.sqrt(np.array([sum(c.length for c in clips) for clips in groups.values()], dtype=float))
    return weight / weight.sum()


class MixtureMaker:
    """Draws mixtures from a store. One per process and seed."""

    def __init__(
        self, store: Path, seed: int, recipe: Recipe | None = None, split: str = "train", rate: int = BASE_RATE
    ) -> None:
        self.recipe, self.rate = recipe or Recipe(), rate
        self.rng = np.random.default_rng(seed)
        self.corpus, self.warped = Corpus(store, rate), Warped(store, rate)
        self.block = rate // 50
        self.count = int(self.recipe.seconds * rate) // self.block * self.block
        self.rooms = self.corpus.rooms(split)
        self.voices = {band: self._long(self.corpus.voices(split, band)) for band in ("full", "8k")}
        self.voice_odds = {band: odds_of(voices) for band, voices in self.voices.items() if voices}
        self.categories = self._long(self.corpus.groups("noise", split))
        self.category_names = list(self.categories)
        odds = odds_of(self.categories) * np.where(np.isin(self.category_names, self.recipe.boosted), 3.0, 1.0)
        self.category_odds = odds / odds.sum()

    def _long(self, groups: dict[str, list[Clip]]) -> dict[str, list[Clip]]:
        """Groups, in the order of their names, without clips that are shorter than a block."""
        long = {name: [c for c in groups[name] if c.length > self.block] for name in sorted(groups)}
        return {name: clips for name, clips in long.items() if clips}

    def voice(self) -> tuple[str, list[Clip]]:
        """The band and the clips of a random speaker."""
        full = self.voices["full"] and (not self.voices["8k"] or self.rng.random() < self.recipe.full_band_share)
        band = "full" if full else "8k"
        return band, self.voices[band][self.rng.choice(list(self.voices[band]), p=self.voice_odds[band])]

    def talk(self, clips: list[Clip], pauses: bool = True) -> np.ndarray:
        """Sentences of one speaker, one after the other, from a random point on."""
        out = np.zeros(self.count, np.float32)
        lead = int(self.rng.uniform(0, 2 * self.recipe.pause_seconds) * self.rate)
        position = lead if pauses and self.rng.random() < 0.4 else 0
        while position < self.count:
            clip = clips[self.rng.integers(len(clips))]
            offset = int(self.rng.integers(max(1, clip.length - self.rate))) if self.rng.random() < 0.4 else 0
            if self.rng.random() < self.recipe.speed_share:
                piece = self.warped.read(clip, offset, self.count - position, self.rng.uniform(*self.recipe.speed))
            else:
                piece = self.corpus.read(clip, offset, self.count)
            piece = piece[: self.count - position]
            out[position : position + len(piece)] = piece
            position += len(piece)
            if pauses and self.rng.random() < self.recipe.pause_share:
                position += int(self.rng.exponential(self.recipe.pause_seconds) * self.rate)
        return out

    def babble(self) -> np.ndarray:
        """Many talkers at similar levels, most of them in the same room."""
        total = np.zeros(self.count, np.float32)
        for _ in range(self.rng.integers(4, 9)):
            voice = self.talk(self.voice()[1], pauses=False)
            total += at_level(voice, self.rate, 1.0, self.rng.normal(0, 3))
        return self.in_room(total)

    def in_room(self, samples: np.ndarray) -> np.ndarray:
        if self.rooms and self.rng.random() > self.recipe.simulated_room_share:
            room = self.rooms[self.rng.integers(len(self.rooms))]
        else:
            room = simulated_room(self.rng, self.rate)
        size = sfft.next_fast_len(len(samples) + len(room), real=True)
        product = sfft.rfft(samples, size) * sfft.rfft(room, size)
        return sfft.irfft(product, size)[: len(samples)]

    def one_noise(self) -> np.ndarray:
        draw = self.rng.random()
        if draw < self.recipe.synthetic_share:
            return coloured_noise(self.rng, self.count, self.rate)
        if draw < self.recipe.synthetic_share + self.recipe.babble_share:
            return self.babble()
        clips = self.categories[self.rng.choice(self.category_names, p=self.category_odds)]
        clip = clips[self.rng.integers(len(clips))]
        out = np.zeros(self.count, np.float32)
        offset = int(self.rng.integers(clip.length)) if self.rng.random() < 0.7 else 0
        position = 0
        warped = self.rng.random() < self.recipe.noise_speed_share
        while position < self.count:
            if warped:
                speed = self.rng.uniform(*self.recipe.noise_speed)
                piece = self.warped.read(clip, offset, self.count - position, speed)
            else:
                piece = self.corpus.read(clip, offset, self.count)
            piece = piece[: self.count - position]
            out[position : position + len(piece)] = piece
            position += len(piece)
            offset = 0
            if clip.length < 2 * self.rate:  # a short sound: with a rest before it comes again
                position += int(self.rng.uniform(0, 0.8) * self.rate)
        return out

    def noises(self) -> np.ndarray:
        noise = at_level(self.one_noise(), self.rate, 1.0, 0.0)
        if self.rng.random() < self.recipe.second_noise_share:
            noise += at_level(self.one_noise(), self.rate, 1.0, self.rng.uniform(-12, 3))
        return noise

    def equalised(self, speech: np.ndarray, noise: np.ndarray) -> tuple[np.ndarray, np.ndarray]:
        """Both as the microphone takes them, the noise also as its place does."""
        bins = self.count // 2 + 1
        gain = smooth_gain(self.rng, bins, self.rate, self.recipe.equaliser_db)
        if self.rng.random() < self.recipe.band_limit_share:
            edge = self.rng.uniform(3300, 12000) / (self.rate / 2)
            steepness = np.clip((np.arange(bins) / bins - edge) * 200, -40, 40)
            gain = (gain / (1 + np.exp(steepness))).astype(np.float32)
        gains = np.stack([gain, gain * smooth_gain(self.rng, bins, self.rate, self.recipe.equaliser_db)])
        spectra = sfft.rfft(np.stack([speech, noise]).astype(np.float32), axis=-1)
        speech, noise = sfft.irfft(spectra * gains, n=self.count, axis=-1)
        return speech, noise

    def draw(self) -> Waves:
        """One piece of `recipe.seconds`."""
        r = self.recipe
        kind = self.rng.random()
        band, clips = self.voice()
        has_speech = kind >= r.noise_only_share
        speech = self.talk(clips) if has_speech else np.zeros(self.count, np.float32)
        if has_speech and self.rng.random() < r.whisper_share:
            speech = whispered(self.rng, speech, self.rate)
        if has_speech and self.rng.random() < r.room_share:
            speech = self.in_room(speech)
        clean = has_speech and kind < r.noise_only_share + r.clean_share
        noise = coloured_noise(self.rng, self.count, self.rate) if clean else self.noises()
        speech, noise = self.equalised(speech, noise)
        level = FULL_SCALE * 10 ** (self.rng.uniform(*r.level_db) / 20)
        snr = self.rng.uniform(*((35.0, 70.0) if clean else r.snr_db))
        return Waves(
            speech=at_level(speech, self.rate, level, 0.0),
            noise=at_level(noise, self.rate, level, -snr),
            rate=self.rate,
            wideband=band == "full" or not has_speech,  # nobody is heard: all bands are known to be noise
            has_speech=has_speech,
            noisy=not clean,
            clip=self.rng.uniform(0.3, 0.9) if self.rng.random() < r.clip_share else None,
        )
