"""Mixtures drawn many at once on the device that trains, from a pool: what `MixtureMaker` draws one by one.

The fields of `Recipe` mean the same. Different are: a speed is a piece's, not a sentence's; the level of a recording is
measured over the whole of it; noise that is no recording comes from the pool's bank.
"""

from __future__ import annotations

from collections.abc import Iterator

import torch
from scipy.fft import next_fast_len
from torch import Tensor

from . import connections, throats
from .channels import CONVERTER_HZ, FULL_SCALE
from .corpus import BASE_RATE
from .drawing import Chance, active_levels, rows_of, strung
from .mixing import Recipe
from .pool import SHORT, Clips, Pool, unrecorded

BLOCK = BASE_RATE // 50
LARGEST_DRAW = 2**25  # samples; more are drawn in several goes


class SceneMaker:
    """Draws batches like those of `MixtureBatches`."""

    def __init__(self, pool: Pool, recipe: Recipe, seed: int, device: torch.device) -> None:
        self.pool, self.recipe, self.device = pool, recipe, device
        self.chance = Chance(seed, device)
        self.count = int(recipe.seconds * BASE_RATE) // BLOCK * BLOCK
        self.slots = int(3 * recipe.seconds) + 2
        self.size = next_fast_len(self.count + pool.rooms.shape[-1], real=True)

    def batches(self, size: int) -> Iterator[dict[str, Tensor]]:
        most = max(1, LARGEST_DRAW // self.count)
        while True:
            drawn = [self.draw(min(most, size - done)) for done in range(0, size, most)]
            yield {name: torch.cat([part[name] for part in drawn]) for name in drawn[0]}

    @torch.no_grad()
    def draw(self, pieces: int) -> dict[str, Tensor]:
        c, r = self.chance, self.recipe
        kind = c.uniform(pieces)
        has_speech, clean = kind >= r.noise_only_share, kind < r.noise_only_share + r.clean_share
        clean = clean & has_speech
        wideband, speech = self.speech(pieces)
        noise = self.noises(pieces)
        if len(rows := rows_of(clean)):
            noise[rows] = self.background(len(rows))
        speech = speech * has_speech[:, None]
        wanted, late, noise = self.over_time(*self.through_rooms_and_microphones(speech, noise))
        level = FULL_SCALE * 10 ** (c.uniform(pieces, low=r.level_db[0], high=r.level_db[1]) / 20)
        spoken = active_levels(wanted, BLOCK) + 1e-3
        loudest = wanted.abs().amax(1) + 1e-3
        overload = c.happens(r.overload_share, pieces) & has_speech
        level = torch.where(overload, FULL_SCALE / c.uniform(pieces, low=0.25, high=0.9) * spoken / loudest, level)
        snr = torch.where(clean, c.uniform(pieces, low=35.0, high=70.0), self.ratios(pieces))
        scale = (level / spoken)[:, None]
        noise = noise * (level * 10 ** (-snr / 20) / (active_levels(noise, BLOCK) + 1e-3))[:, None]
        wanted = wanted * scale
        heard = connections.heard(c, wanted + late * scale + noise, BASE_RATE, r.clip_share, r.codec_share)
        unknown = torch.full((pieces,), torch.nan, device=self.device)
        history = 10 ** c.uniform(pieces, low=-0.6, high=0.6)
        return {
            "speech": wanted,
            "heard": heard,
            "history": torch.where(c.happens(0.5, pieces), history, unknown),
            "wideband": wideband | ~has_speech,
            "has_speech": has_speech,
        }

    def ratios(self, pieces: int) -> Tensor:
        c, (low, high), r = self.chance, self.recipe.snr_db, self.recipe
        if r.hard_share is None:
            return c.uniform(pieces, low=low, high=high)
        hard, easy = c.uniform(pieces, low=low, high=r.hard_db), c.uniform(pieces, low=r.hard_db, high=high)
        return torch.where(c.happens(r.hard_share, pieces), hard, easy)

    def speeds(self, pieces: int, share: float, limits: tuple[float, float]) -> Tensor:
        speed = self.chance.uniform(pieces, low=limits[0], high=limits[1])
        return torch.where(self.chance.happens(share, pieces), speed, torch.ones_like(speed))

    def speech(self, pieces: int) -> tuple[Tensor, Tensor]:
        """Whose speech is wideband, and the speech [pieces, n] as it would be heard close to the mouth."""
        c, r, voices = self.chance, self.recipe, self.pool.voices
        share = 0.0 if "full" not in voices else 1.0 if "8k" not in voices else r.full_band_share
        full = c.happens(share, pieces)
        out = torch.empty(pieces, self.count, device=self.device)
        for band, flags in (("full", full), ("8k", ~full)):
            if len(rows := rows_of(flags)):
                out[rows] = self.talk(voices[band], len(rows))
        whispered = c.happens(r.whisper_share, pieces)
        moved = c.happens(r.formant_share, pieces) & ~whispered
        if len(rows := rows_of(whispered)):
            out[rows] = throats.whispered(c, out[rows], BASE_RATE)
        if len(rows := rows_of(moved)):
            highest = torch.where(full[rows], 14000.0, 7000.0)
            out[rows] = throats.formants_moved(c, out[rows], BASE_RATE, r.formants, highest)
        return full, out

    def talk(self, clips: Clips, pieces: int) -> Tensor:
        """Sentences of one speaker each, with pauses between them."""
        c, r, shape = self.chance, self.recipe, (pieces, self.slots)
        group = c.of(clips.odds, pieces)
        chosen = clips.first[group, None] + c.below(clips.count[group, None].expand(shape))
        within = c.below((clips.length[chosen] - BASE_RATE).clamp_min(1))
        offset = torch.where(c.happens(0.4, *shape), within, 0)
        speed = self.speeds(pieces, r.speed_share, r.speed)
        pause = c.happens(r.pause_share, *shape) * c.exponential(*shape) * r.pause_seconds * BASE_RATE
        advance = ((clips.length[chosen] - offset) / speed[:, None] + pause).long()
        lead = c.happens(0.4, pieces) * c.uniform(pieces, high=2 * r.pause_seconds) * BASE_RATE
        begin = lead.long()[:, None] + torch.cumsum(advance, 1) - advance
        fade = torch.full(shape, BASE_RATE // 200, device=self.device)
        return strung(clips, chosen, offset, begin, speed, fade, self.count)

    def recorded(self, clips: Clips, pieces: int) -> Tensor:
        """Recordings of one category each: where one ends the next fades in; short sounds come with rests between."""
        c, r, shape = self.chance, self.recipe, (pieces, self.slots)
        group = c.of(clips.odds, pieces)
        chosen = clips.first[group, None] + c.below(clips.count[group, None].expand(shape))
        length = clips.length[chosen]
        short = length < SHORT
        offset = torch.where(~short & c.happens(0.7, *shape), c.below(length - BLOCK), 0)
        speed = self.speeds(pieces, r.noise_speed_share, r.noise_speed)
        heard = ((length - offset) / speed[:, None]).long()
        fade = BASE_RATE // 10
        rest = (c.uniform(*shape, high=0.8) * BASE_RATE).long()
        advance = torch.where(short, heard + rest, (heard - fade).clamp_min(fade))
        begin = torch.cumsum(advance, 1) - advance
        return strung(clips, chosen, offset, begin, speed, torch.where(short, BASE_RATE // 200, fade), self.count)

    def made(self, pieces: int) -> Tensor:
        """From the bank, at some speed."""
        c, bank = self.chance, self.pool.made
        number, length = bank.shape
        speed = self.speeds(pieces, self.recipe.noise_speed_share, self.recipe.noise_speed)
        clip = c.below(torch.full((pieces, 1), number, device=self.device))
        room = (length - (self.count * speed).long() - 2)[:, None].clamp_min(1)
        ones = torch.ones(1, device=self.device)
        clips = Clips(
            bank.flatten(), torch.arange(number, device=self.device) * length, ones.long().expand(number) * length,
            ones.expand(number), ones.long(), ones.long(), ones,
        )  # fmt: skip
        nothing = torch.zeros_like(clip)
        return strung(clips, clip, c.below(room), nothing, speed, nothing, self.count)

    def one_noise(self, pieces: int) -> Tensor:
        """Of unit active level."""
        c, r = self.chance, self.recipe
        out = torch.empty(pieces, self.count, device=self.device)
        made = c.happens(sum(unrecorded(r).values()), pieces)
        if len(rows := rows_of(made)):
            out[rows] = self.made(len(rows))
        if len(rows := rows_of(~made)):
            out[rows] = self.recorded(self.pool.noises, len(rows))
        if len(some := rows_of(~made & c.happens(r.start_stop_share, pieces))):
            out[some] = connections.started_and_stopped(c, out[some], BASE_RATE)
        if len(some := rows_of(~made & c.happens(r.noise_room_share, pieces))):
            rooms = torch.fft.rfft(self.rooms(len(some)).sum(1), self.size)
            out[some] = torch.fft.irfft(torch.fft.rfft(out[some], self.size) * rooms, self.size)[:, : self.count]
        return out / (active_levels(out, BLOCK) + 1e-3)[:, None]

    def noises(self, pieces: int) -> Tensor:
        c = self.chance
        out = self.one_noise(pieces)
        if len(rows := rows_of(c.happens(self.recipe.second_noise_share, pieces))):
            level = 10 ** (c.uniform(len(rows), 1, low=-12.0, high=3.0) / 20)
            out[rows] += level * self.one_noise(len(rows))
        return out

    def background(self, pieces: int) -> Tensor:
        """What is faintly there where nothing disturbs."""
        c = self.chance
        out = connections.coloured(c, pieces, self.count, BASE_RATE)
        if self.pool.room_tone:
            if len(rows := rows_of(c.happens(0.5, pieces))):
                out[rows] = self.recorded(self.pool.room_tone, len(rows))
        return out

    def rooms(self, pieces: int) -> Tensor:
        """[pieces, 2, samples]: the early and the late part."""
        c, simulated = self.chance, self.pool.simulated
        recorded = len(self.pool.rooms) - simulated
        chosen = c.happens(self.recipe.simulated_room_share if recorded else 1.0, pieces)
        number = c.below(torch.where(chosen, simulated, recorded))
        return self.pool.rooms[torch.where(chosen, number, simulated + number)]

    def through_rooms_and_microphones(self, speech: Tensor, noise: Tensor) -> tuple[Tensor, Tensor, Tensor]:
        """The wanted part of the speech, the rest of it, and the noise, which stands in another place."""
        c, r, pieces = self.chance, self.recipe, len(speech)
        microphone = connections.gains(c, pieces, self.size // 2 + 1, BASE_RATE, r, CONVERTER_HZ)
        spectra = torch.fft.rfft(speech, self.size)
        parts = torch.stack([spectra, torch.zeros_like(spectra)], 1)
        if len(rows := rows_of(c.happens(r.room_share, pieces))):
            rooms = torch.fft.rfft(self.rooms(len(rows)), self.size)
            if not r.early_only:
                rooms = torch.stack([rooms.sum(1), torch.zeros_like(rooms[:, 0])], 1)
            parts[rows] = spectra[rows, None] * rooms
        place = connections.smooth_gains(c, pieces, self.size // 2 + 1, BASE_RATE, r.equaliser_db)
        noise = torch.fft.rfft(noise, self.size) * (microphone * place)
        parts = torch.cat([parts * microphone[:, None], noise[:, None]], 1)
        return tuple(torch.fft.irfft(parts, self.size)[..., : self.count].unbind(1))

    def over_time(self, *parts: Tensor) -> list[Tensor]:
        """Gains that change, and packets that are lost, for all parts alike."""
        r, pieces = self.recipe, len(parts[0])
        gain = connections.changing_gains(self.chance, pieces, self.count, BASE_RATE, r.gain_step_share, r.gap_share)
        return [part * gain for part in parts]
