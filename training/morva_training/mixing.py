"""Mixtures for training: speech, rooms, noises, levels and equalisation drawn at random.

One `MixtureMaker` owns a random generator and a decoded store; `draw` returns the spectra of a
piece of speech and of what disturbs it (noise, clipping). Room reverberation belongs to the speech: the task is to
remove noise, not the room. Recordings without content above 8 kHz are flagged, so that the loss
gives them no say about the bins above.
"""

from __future__ import annotations

import zlib
from dataclasses import dataclass, field, replace
from pathlib import Path

import numpy as np
from scipy import fft as sfft
from scipy.ndimage import gaussian_filter1d
from scipy.signal import lfilter, resample_poly

from .corpus import BASE_RATE, Clip, Store, load_rooms
from .spectra import FULL_32K, analyse

FULL_SCALE = 32768.0
DEV_SHARE = 25  # one in so many speakers and noise recordings is kept back for validation


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


@dataclass
class Waves:
    """A piece of speech and what disturbs it, as samples on the 16-bit scale."""

    speech: np.ndarray
    noise: np.ndarray
    wideband: bool
    has_speech: bool
    noisy: bool  # False for a piece that is clean but for a faint background


@dataclass
class Mixture:
    """Spectra [T, 321] at 32 kHz of a piece of speech and of what disturbs it; their sum is heard."""

    speech: np.ndarray
    noise: np.ndarray
    wideband: bool
    has_speech: bool
    noisy: bool

    def remixed(self, other: "Mixture", snr_db: float) -> "Mixture":
        """This speech in the noise of another piece."""
        own = np.sqrt(np.mean(np.abs(self.speech[:, :256]) ** 2)) + 1e-3
        theirs = np.sqrt(np.mean(np.abs(other.noise[:, :256]) ** 2)) + 1e-3
        scale = np.float32(own / theirs * 10 ** (-snr_db / 20))
        return replace(self, noise=other.noise * scale, noisy=True)


def in_dev(clip: Clip, kind: str) -> bool:
    """Whether a training recording belongs to the validation share (whole speakers of speech)."""
    key = clip.category if kind == "speech" else clip.path
    return zlib.crc32(key.encode()) % DEV_SHARE == 3


def active_level(samples: np.ndarray, block: int = 640) -> float:
    """RMS of the blocks within 30 dB of the loudest one; a block is 20 ms at 32 kHz."""
    count = len(samples) // block
    if count == 0:
        return 0.0
    power = np.square(samples[: count * block].reshape(count, block)).mean(axis=1)
    loud = power > power.max() * 1e-3
    return float(np.sqrt(power[loud].mean())) if power.max() > 0 else 0.0


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
    """Recordings faster and higher, or slower and lower. They come from the store of twice the rate
    where there is one, so that slower ones lose no treble."""

    def __init__(self, store: Path, kind: str, rate: int) -> None:
        self.ratio = 2 if rate < BASE_RATE else 1
        self.fine = Store(store, kind, rate * self.ratio)
        self.clips = {clip.path: clip for clip in self.fine.clips}

    def read(self, clip: Clip, offset: int, length: int, factor: float) -> np.ndarray:
        """About `length` samples, or what there is, of a clip of the plain store from its `offset` on."""
        piece = self.fine.read(self.clips[clip.path], offset * self.ratio, int(length * self.ratio * factor))
        return resampled(piece, 1.0 / (self.ratio * factor)) if len(piece) else piece


@dataclass
class MixtureMaker:
    """Draws mixtures from a decoded store. One per process and seed."""

    store: Path
    seed: int
    recipe: Recipe = field(default_factory=Recipe)
    split: str = "train"
    rate: int = BASE_RATE

    def __post_init__(self) -> None:
        self.rng = np.random.default_rng(self.seed)
        self.speech = Store(self.store, "speech", self.rate)
        self.noise = Store(self.store, "noise", self.rate)
        self.warped_speech = Warped(self.store, "speech", self.rate)
        self.warped_noise = Warped(self.store, "noise", self.rate)
        self.block = self.rate // 50
        self.count = int(self.recipe.seconds * self.rate) // self.block * self.block
        rooms = load_rooms(self.store, "heldout" if self.split == "heldout" else "train")
        self.rooms = [resample_poly(room, 1, BASE_RATE // self.rate).astype(np.float32) for room in rooms]
        self.speakers = self._group(self.speech, "speech", self.split)
        self.categories = self._group(self.noise, "noise", self.split)
        self.bands = {
            band: [s for s, clips in self.speakers.items() if clips[0].band == band] for band in ("full", "8k")
        }
        self.speaker_odds = {band: self._odds(self.speakers, names) for band, names in self.bands.items()}
        self.category_names = sorted(self.categories)
        odds = self._odds(self.categories, self.category_names)
        odds *= np.where(np.isin(self.category_names, self.recipe.boosted), 3.0, 1.0)
        self.category_odds = odds / odds.sum()

    @staticmethod
    def _group(store: Store, kind: str, split: str) -> dict[str, list[Clip]]:
        groups: dict[str, list[Clip]] = {}
        for clip in store.clips:
            wanted = "dev" if clip.split == "train" and in_dev(clip, kind) else clip.split
            if wanted == split and clip.length > store.rate // 50:
                groups.setdefault(clip.category, []).append(clip)
        if not groups and split == "dev":  # too few recordings to keep some back
            return MixtureMaker._group(store, kind, "train")
        return groups

    @staticmethod
    def _odds(groups: dict[str, list[Clip]], names: list[str]) -> np.ndarray:
        seconds = np.array([sum(c.length for c in groups[n]) for n in names], dtype=float)
        weight = np.sqrt(seconds)
        return weight / weight.sum() if len(names) else weight

    def _speaker(self) -> str:
        full = self.bands["full"] and (not self.bands["8k"] or self.rng.random() < self.recipe.full_band_share)
        band = "full" if full else "8k"
        return self.rng.choice(self.bands[band], p=self.speaker_odds[band])

    def talk(self, speaker: str, pauses: bool = True) -> np.ndarray:
        """Sentences of one speaker, one after the other, from a random point on."""
        clips = self.speakers[speaker]
        out = np.zeros(self.count, np.float32)
        lead = int(self.rng.uniform(0, 2 * self.recipe.pause_seconds) * self.rate)
        position = lead if pauses and self.rng.random() < 0.4 else 0
        while position < self.count:
            clip = clips[self.rng.integers(len(clips))]
            offset = int(self.rng.integers(max(1, clip.length - self.rate))) if self.rng.random() < 0.4 else 0
            if self.rng.random() < self.recipe.speed_share:
                piece = self.warped_speech.read(
                    clip, offset, self.count - position, self.rng.uniform(*self.recipe.speed)
                )
            else:
                piece = self.speech.read(clip, offset, self.count)
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
            voice = self.talk(self._speaker(), pauses=False)
            total += voice / (active_level(voice, self.block) + 1e-3) * 10 ** (self.rng.normal(0, 3) / 20)
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
                piece = self.warped_noise.read(
                    clip, offset, self.count - position, self.rng.uniform(*self.recipe.noise_speed)
                )
            else:
                piece = self.noise.read(clip, offset, self.count)
            piece = piece[: self.count - position]
            out[position : position + len(piece)] = piece
            position += len(piece)
            offset = 0
            if clip.length < 2 * self.rate:  # a short sound: with a rest before it comes again
                position += int(self.rng.uniform(0, 0.8) * self.rate)
        return out

    def noises(self) -> np.ndarray:
        noise = self.one_noise()
        noise /= active_level(noise, self.block) + 1e-3
        if self.rng.random() < self.recipe.second_noise_share:
            other = self.one_noise()
            noise += other / (active_level(other, self.block) + 1e-3) * 10 ** (self.rng.uniform(-12, 3) / 20)
        return noise

    def draw_waves(self) -> Waves:
        """One piece of `recipe.seconds` before equalisation."""
        r = self.recipe
        kind = self.rng.random()
        speaker = self._speaker()
        has_speech = kind >= r.noise_only_share
        speech = self.talk(speaker) if has_speech else np.zeros(self.count, np.float32)
        if has_speech and self.rng.random() < r.whisper_share:
            speech = whispered(self.rng, speech, self.rate)
        if has_speech and self.rng.random() < r.room_share:
            speech = self.in_room(speech)
        level = FULL_SCALE * 10 ** (self.rng.uniform(*r.level_db) / 20)
        speech *= level / (active_level(speech, self.block) + 1e-3)
        clean = has_speech and kind < r.noise_only_share + r.clean_share
        if clean:
            noise = coloured_noise(self.rng, self.count, self.rate)
            snr = self.rng.uniform(35.0, 70.0)
            noise /= noise.std() + 1e-6
        else:
            noise = self.noises()
            snr = self.rng.uniform(*r.snr_db)
        noise *= level * 10 ** (-snr / 20)
        if self.rng.random() < r.clip_share:
            noisy = speech + noise
            limit = np.abs(noisy).max() * self.rng.uniform(0.3, 0.9)
            noise = np.clip(noisy, -limit, limit) - speech
        return Waves(speech, noise, self.speakers[speaker][0].band == "full", has_speech, not clean)

    def equalisers(self, bins: int) -> tuple[np.ndarray, np.ndarray]:
        """Gains over the bins for the speech and for what disturbs it; both share the microphone's."""
        gain = smooth_gain(self.rng, bins, self.rate, self.recipe.equaliser_db)
        if self.rng.random() < self.recipe.band_limit_share:
            edge = self.rng.uniform(3300, 12000) / (self.rate / 2)
            steepness = np.clip((np.arange(bins) / bins - edge) * 200, -40, 40)
            gain = (gain / (1 + np.exp(steepness))).astype(np.float32)
        return gain, gain * smooth_gain(self.rng, bins, self.rate, self.recipe.equaliser_db)

    def draw(self) -> Mixture:
        """One piece as spectra; equalisation and band limits are done on these. Needs the base rate."""
        waves = self.draw_waves()
        spectra = analyse(np.stack([waves.speech, waves.noise]).astype(np.float32), FULL_32K)
        speech_gain, noise_gain = self.equalisers(spectra.shape[-1])
        return Mixture(spectra[0] * speech_gain, spectra[1] * noise_gain, waves.wideband, waves.has_speech, waves.noisy)
