"""Mixtures for training: speech, rooms, noises, levels and equalisation drawn at random.

One `MixtureMaker` owns a random generator and a corpus; `draw` returns a piece of speech, what
disturbs it, and the channel through which the sum is heard. Early reflections belong to the speech; so
does the rest of the room, unless the recipe says that only what is early is wanted. Speech without
content above 8 kHz is flagged, so that the loss gives it no say about the bins above.
"""

from __future__ import annotations

from dataclasses import dataclass, field, replace
from pathlib import Path

import numpy as np
from scipy import fft as sfft

from . import synthesis
from .channels import (
    CODECS,
    CONVERTER_HZ,
    FULL_SCALE,
    Channel,
    gain_steps,
    gaps,
    low_pass,
    microphone_gain,
    smooth_gain,
)
from .corpus import BASE_RATE, Clip, Corpus
from .measures import active_level
from .rooms import convolved, parted, simulated_room
from .synthesis import machines, texture
from .synthesis.sources import added
from .voices import formants_moved, whispered

# Short sounds are a small part of the recordings and a large part of what callers complain about.
IMPULSIVE = (
    "keyboard", "mouse_click", "click", "clock", "knock", "impact", "footsteps", "door", "kitchen", "paper",
    "dog_bark", "eating_drinking", "human_nonspeech", "notification",
)  # fmt: skip

ROOM_TONE = "room_tone"  # the category of what rooms and microphones add where nobody speaks


@dataclass(frozen=True)
class Recipe:
    """Ranges and shares of the random draws. Levels in dB relative to full scale."""

    seconds: float = 4.0
    snr_db: tuple[float, float] = (-8.0, 24.0)
    hard_share: float | None = None  # of pieces below `hard_db`; evenly over the range unless given
    hard_db: float = 5.0
    level_db: tuple[float, float] = (-42.0, -14.0)
    clean_share: float = 0.06
    noise_only_share: float = 0.04
    # speech
    pause_share: float = 0.5
    pause_seconds: float = 0.5  # mean length
    soft_share: float = 0.0  # of sentences that are said more softly than the others
    soft_db: tuple[float, float] = (6.0, 20.0)
    speed_share: float = 0.25
    speed: tuple[float, float] = (0.9, 1.1)
    formant_share: float = 0.0
    formants: tuple[float, float] = (0.84, 1.19)
    whisper_share: float = 0.04
    full_band_share: float = 0.35
    # rooms
    room_share: float = 0.30
    simulated_room_share: float = 0.4  # of the rooms
    early_only: bool = False  # late reverberation is no part of the wanted speech
    near_metres: tuple[float, float] = (0.3, 1.0)  # of who speaks while others speak in the background
    far_metres: tuple[float, float] = (1.5, 6.0)  # of those others
    far_share: float = 0.0
    far_db: tuple[float, float] = (10.0, 30.0)  # that they are below the near one
    # noise
    second_noise_share: float = 0.35
    synthetic_share: float = 0.06
    babble_share: float = 0.08
    talkers: tuple[int, int] = (4, 9)
    made_share: float = 0.0
    texture_share: float = 0.0
    noise_speed_share: float = 0.5
    noise_speed: tuple[float, float] = (0.75, 1.35)
    noise_room_share: float = 0.0
    start_stop_share: float = 0.0
    boosted: tuple[str, ...] = IMPULSIVE  # noise categories drawn three times as often
    # microphone and connection
    equaliser_db: float = 3.0  # deviation from one point of the equaliser to the next
    microphone_share: float = 0.0
    band_limit_share: float = 0.06
    band_limit_hz: tuple[float, float] = (3300.0, 12000.0)
    converter_share: float = 0.0
    gain_step_share: float = 0.0
    gap_share: float = 0.0
    clip_share: float = 0.03
    overload_share: float = 0.0  # of pieces so loud that full scale clips them
    codec_share: float = 0.0

    def snr(self, rng: np.random.Generator) -> float:
        low, high = self.snr_db
        if self.hard_share is not None:
            low, high = (low, self.hard_db) if rng.random() < self.hard_share else (self.hard_db, high)
        return float(rng.uniform(low, high))


# What the recordings alone give, and step by step what widens it.
PLAIN = Recipe()
MORE_NOISE = replace(
    PLAIN,
    snr_db=(-10.0, 25.0),
    hard_share=0.55,
    synthetic_share=0.0,
    babble_share=0.1,
    talkers=(3, 25),
    made_share=0.35,
    texture_share=0.15,
    noise_room_share=0.25,
    start_stop_share=0.15,
)
MORE_ROOMS = replace(MORE_NOISE, room_share=0.5, simulated_room_share=0.75, early_only=True)
WIDENED = replace(
    MORE_ROOMS,
    level_db=(-46.0, -12.0),
    speed_share=0.4,
    speed=(0.85, 1.2),
    formant_share=0.2,
    microphone_share=0.4,
    band_limit_share=0.5,
    band_limit_hz=(3400.0, 14000.0),
    converter_share=0.5,
    gain_step_share=0.1,
    gap_share=0.04,
    overload_share=0.03,
    codec_share=0.12,
)
TALKERS = replace(WIDENED, far_share=0.15, soft_share=0.1, clean_share=0.14)
RECIPES = {"plain": PLAIN, "noise": MORE_NOISE, "rooms": MORE_ROOMS, "widened": WIDENED, "talkers": TALKERS}


@dataclass(frozen=True)
class Waves:
    """A piece of speech and what disturbs it, as samples on the 16-bit scale."""

    speech: np.ndarray  # the part of it that is wanted
    noise: np.ndarray
    rate: int
    wideband: bool  # False for speech that holds nothing above 8 kHz
    has_speech: bool
    noisy: bool  # False for a piece that is clean but for a faint background
    late: np.ndarray | None = None  # late reverberation of the speech, where it is not wanted
    far: bool = False  # the noise is talkers in the background
    channel: Channel = field(default_factory=Channel)

    def heard(self) -> np.ndarray:
        total = self.speech + self.noise
        return self.channel.heard(total if self.late is None else total + self.late, self.rate)

    def remixed(self, other: Waves, snr_db: float) -> Waves:
        """This speech in the noise of another piece."""
        noise = at_level(other.noise, self.rate, active_level(self.speech, self.rate), -snr_db)
        return replace(self, noise=noise, noisy=True, far=other.far)


def at_level(samples: np.ndarray, rate: int, reference: float, db: float) -> np.ndarray:
    """The samples with an active level `db` over the reference, which is how every ratio here is measured."""
    return samples * np.float32(reference * 10 ** (db / 20) / (active_level(samples, rate) + 1e-3))


def resampled(samples: np.ndarray, ratio: float) -> np.ndarray:
    """Band-limited, about `ratio` times as long (as the transform finds convenient)."""
    size = sfft.next_fast_len(len(samples), real=True)
    target = sfft.next_fast_len(max(1, round(size * ratio)), real=True)
    spectrum = sfft.rfft(samples, size)[: target // 2 + 1]
    out = sfft.irfft(spectrum, target) * np.float32(target / size)
    return out[: round(len(samples) * target / size)]


def faded(samples: np.ndarray, fade: int) -> np.ndarray:
    """Without steps at its ends; a copy."""
    samples, fade = samples.copy(), min(fade, len(samples) // 2)
    if fade:
        rise = np.sin(np.linspace(0.0, np.pi / 2, fade)).astype(np.float32)
        samples[:fade] *= rise
        samples[-fade:] *= rise[::-1]
    return samples


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
        self.block, self.fade = rate // 50, rate // 200
        self.textures: dict[str, texture.Texture] = {}
        self.count = int(self.recipe.seconds * rate) // self.block * self.block
        self.rooms = self.corpus.rooms(split)
        self.voices = {band: self._long(self.corpus.voices(split, band)) for band in ("full", "8k")}
        self.voice_odds = {band: odds_of(voices) for band, voices in self.voices.items() if voices}
        self.categories = self._long(self.corpus.groups("noise", split))
        self.category_names = list(self.categories)
        odds = odds_of(self.categories) * np.where(np.isin(self.category_names, self.recipe.boosted), 3.0, 1.0)
        self.category_odds = odds / odds.sum()
        chances = np.array(list(synthesis.KINDS.values()))
        self.kinds, self.kind_odds = list(synthesis.KINDS), chances / chances.sum()

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
            piece = faded(piece[: self.count - position], self.fade)
            if self.recipe.soft_share and self.rng.random() < self.recipe.soft_share:
                piece *= 10 ** (-self.rng.uniform(*self.recipe.soft_db) / 20)
            out[position : position + len(piece)] = piece
            position += len(piece)
            if pauses and self.rng.random() < self.recipe.pause_share:
                position += int(self.rng.exponential(self.recipe.pause_seconds) * self.rate)
        return out

    def one_room(self) -> np.ndarray:
        if self.rooms and self.rng.random() > self.recipe.simulated_room_share:
            return self.rooms[self.rng.integers(len(self.rooms))]
        return simulated_room(self.rng, self.rate)

    def far_talkers(self) -> np.ndarray:
        """One or two at the other end of a room, mostly with some other noise."""
        out = np.zeros(self.count, np.float32)
        for _ in range(1 + int(self.rng.random() < 0.3)):
            room = simulated_room(self.rng, self.rate, self.recipe.far_metres)
            out += at_level(convolved(self.talk(self.voice()[1]), [room])[0], self.rate, 1.0, 0.0)
        if self.rng.random() < 0.7:
            out += at_level(self.one_noise(), self.rate, 1.0, self.rng.uniform(-30.0, 3.0))
        return out

    def babble(self) -> np.ndarray:
        """Many talkers at similar levels, in two places of a room."""
        places = np.zeros((2, self.count), np.float32)
        low, high = self.recipe.talkers
        for _ in range(int(low * (high / low) ** self.rng.random())):
            voice = self.chatter(self.voice()[1])
            places[self.rng.integers(2)] += at_level(voice, self.rate, 1.0, self.rng.normal(0, 3))
        return sum(convolved(place, [self.one_room()])[0] for place in places if place.any())

    def chatter(self, clips: list[Clip]) -> np.ndarray:
        """One speaker without a rest."""
        out, position = np.zeros(self.count, np.float32), 0
        while position < self.count:
            clip = clips[self.rng.integers(len(clips))]
            offset = int(self.rng.integers(max(1, clip.length - self.rate)))
            piece = faded(self.corpus.read(clip, offset, self.count - position), self.fade)
            out[position : position + len(piece)] = piece
            position += len(piece)
        return out

    def background(self) -> np.ndarray:
        """What is faintly there where nothing disturbs."""
        if ROOM_TONE in self.categories and self.rng.random() < 0.5:
            return self.recorded(ROOM_TONE)
        return machines.coloured(self.rng, self.count, self.rate)

    def recorded(self, category: str | None = None) -> np.ndarray:
        """Recordings of one category: where one ends the next fades in; short sounds come with rests between."""
        clips = self.categories[category or self.rng.choice(self.category_names, p=self.category_odds)]
        out = np.zeros(self.count, np.float32)
        speed = (
            self.rng.uniform(*self.recipe.noise_speed) if self.rng.random() < self.recipe.noise_speed_share else None
        )
        position, fade = 0, self.rate // 10
        while self.count - position > self.block:
            clip = clips[self.rng.integers(len(clips))]
            short = clip.length < 2 * self.rate
            offset = int(self.rng.integers(clip.length)) if not short and self.rng.random() < 0.7 else 0
            length = self.count - position
            if speed is None:
                piece = self.corpus.read(clip, offset, length)
            else:
                piece = self.warped.read(clip, offset, length, speed)
            if not short:  # what one is louder than the next is the recordists' choice
                piece = at_level(piece, self.rate, 1000.0, 0.0)
            added(out, faded(piece, self.fade if short else fade), position)
            position += (
                len(piece) + int(self.rng.uniform(0, 0.8) * self.rate) if short else max(fade, len(piece) - fade)
            )
        return out

    def textured(self) -> np.ndarray:
        """Fresh noise with the statistics of one or two recordings."""
        first = texture.varied(self.rng, self.texture())
        if self.rng.random() < 0.3:
            first = texture.mixed(first, self.texture(), self.rng.uniform(0.2, 0.6))
        return texture.played(self.rng, first, self.count, self.rate)

    def texture(self) -> texture.Texture:
        """Of a random recording that is long enough; measured once."""
        while True:
            clips = self.categories[self.rng.choice(self.category_names, p=self.category_odds)]
            clip = clips[self.rng.integers(len(clips))]
            if clip.length >= texture.SHORTEST * self.rate:
                break
        if clip.path not in self.textures:
            self.textures[clip.path] = texture.measured(self.corpus.read(clip, 0, 6 * self.rate), self.rate)
        return self.textures[clip.path]

    def one_noise(self) -> np.ndarray:
        r = self.recipe
        shares = np.array([r.synthetic_share, r.babble_share, r.made_share, r.texture_share])
        kind = int(np.searchsorted(np.cumsum(shares), self.rng.random(), "right"))
        if kind == 0:
            noise = machines.coloured(self.rng, self.count, self.rate)
        elif kind == 1:
            return self.babble()
        elif kind == 2:
            made = self.kinds[self.rng.choice(len(self.kinds), p=self.kind_odds)]
            noise = made(self.rng, self.count, self.rate)
        else:
            noise = self.textured() if kind == 3 else self.recorded()
        if self.rng.random() < r.noise_room_share:
            noise = convolved(noise, [self.one_room()])[0]
        if self.rng.random() < r.start_stop_share:
            noise = self.started_and_stopped(noise)
        return noise

    def started_and_stopped(self, noise: np.ndarray) -> np.ndarray:
        """A part of the piece, suddenly or not."""
        length = int(self.count * self.rng.uniform(0.2, 0.8))
        start = int(self.rng.integers(-length // 2, self.count - length // 2))
        part = slice(max(0, start), start + length)
        out = np.zeros_like(noise)
        out[part] = faded(noise[part], int(self.rate * 0.005 * 100.0 ** self.rng.random()))
        return out if out.any() else noise

    def noises(self) -> np.ndarray:
        noise = at_level(self.one_noise(), self.rate, 1.0, 0.0)
        if self.rng.random() < self.recipe.second_noise_share:
            noise += at_level(self.one_noise(), self.rate, 1.0, self.rng.uniform(-12, 3))
        return noise

    def equalised(self, speech: np.ndarray, noise: np.ndarray) -> np.ndarray:
        """All as the microphone takes them, the noise also as its place does: `speech` [parts, n] and then `noise`."""
        r, bins = self.recipe, self.count // 2 + 1
        gain = smooth_gain(self.rng, bins, self.rate, r.equaliser_db)
        if self.rng.random() < r.microphone_share:
            gain *= microphone_gain(self.rng, bins, self.rate)
        if self.rng.random() < r.band_limit_share:
            low, high = r.band_limit_hz
            gain *= low_pass(bins, self.rate, low * (high / low) ** self.rng.random())
        if self.rng.random() < r.converter_share:
            gain *= low_pass(bins, self.rate, CONVERTER_HZ)
        spectra = sfft.rfft(np.concatenate([speech, noise[None]]).astype(np.float32, copy=False), axis=-1)
        spectra *= gain
        spectra[-1] *= smooth_gain(self.rng, bins, self.rate, r.equaliser_db)
        return sfft.irfft(spectra, n=self.count, axis=-1)

    def spoken(self, band: str, clips: list[Clip], near: bool = False) -> np.ndarray:
        """[1 or 2, n]: what is wanted of a speaker in a room, and what is not."""
        r = self.recipe
        speech = self.talk(clips)
        if self.rng.random() < r.whisper_share:
            speech = whispered(self.rng, speech, self.rate)
        elif self.rng.random() < r.formant_share:
            highest = min(0.45 * self.rate, 14000.0 if band == "full" else 7000.0)
            speech = formants_moved(speech, self.rate, self.rng.uniform(*r.formants), highest)
        if self.rng.random() >= r.room_share:
            return speech[None]
        room = simulated_room(self.rng, self.rate, r.near_metres) if near else self.one_room()
        return convolved(speech, list(parted(room, self.rate)) if r.early_only else [room])

    def over_time(self, parts: np.ndarray) -> np.ndarray:
        """Gains that change, and packets that are lost, for all parts alike."""
        if self.rng.random() < self.recipe.gain_step_share:
            parts = parts * gain_steps(self.rng, self.count, self.rate)
        if self.rng.random() < self.recipe.gap_share:
            parts = parts * gaps(self.rng, self.count, self.rate)
        return parts

    def channel(self) -> Channel:
        r = self.recipe
        clip = self.rng.uniform(0.3, 0.9) if self.rng.random() < r.clip_share else None
        if self.rng.random() >= r.codec_share:
            return Channel(clip)
        return Channel(clip, str(self.rng.choice(list(CODECS))), self.rng.random())

    def draw(self) -> Waves:
        """One piece of `recipe.seconds`."""
        r = self.recipe
        kind = self.rng.random()
        band, clips = self.voice()
        has_speech = kind >= r.noise_only_share
        clean = has_speech and kind < r.noise_only_share + r.clean_share
        far = has_speech and kind >= 1.0 - r.far_share
        speech = self.spoken(band, clips, far) if has_speech else np.zeros((1, self.count), np.float32)
        noise = self.background() if clean else self.far_talkers() if far else self.noises()
        *speech, noise = self.over_time(self.equalised(speech, noise))
        level = FULL_SCALE * 10 ** (self.rng.uniform(*r.level_db) / 20)
        if has_speech and self.rng.random() < r.overload_share:
            wanted = FULL_SCALE / self.rng.uniform(0.25, 0.9)
            level = wanted * active_level(speech[0], self.rate) / (np.abs(speech[0]).max() + 1e-3)
        snr = self.rng.uniform(35.0, 70.0) if clean else self.snr(far)
        scale = np.float32(level / (active_level(speech[0], self.rate) + 1e-3))
        return Waves(
            speech=speech[0] * scale,
            noise=at_level(noise, self.rate, level, -snr),
            rate=self.rate,
            wideband=band == "full" or not has_speech,  # nobody is heard: all bands are known to be noise
            has_speech=has_speech,
            noisy=not clean,
            late=speech[1] * scale if len(speech) > 1 else None,
            far=far,
            channel=self.channel(),
        )

    def snr(self, far: bool) -> float:
        return self.rng.uniform(*self.recipe.far_db) if far else self.recipe.snr(self.rng)

    def draws(self, count: int, reuse: int) -> list[Waves]:
        """So many pieces; every draw is used `reuse` times, each time in another noise."""
        pieces = [self.draw() for _ in range(max(1, count // reuse))]
        drawn, sources = len(pieces), [waves for waves in pieces if waves.noisy]
        while len(pieces) < count:
            base = pieces[len(pieces) % drawn]
            if base.noisy and base.has_speech:
                source = sources[self.rng.integers(len(sources))]
                base = base.remixed(source, self.snr(source.far))
            pieces.append(base)
        return pieces
