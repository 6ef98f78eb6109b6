"""Sound files of any length, in blocks."""

from __future__ import annotations

import math
import os
import tempfile
from collections.abc import Callable, Iterator
from contextlib import ExitStack, contextmanager
from pathlib import Path
from typing import Any

import numpy as np
import soundfile
from tqdm import tqdm

from ._streams import Denoiser

_BLOCK_SECONDS = 1.0

# Sample types that lose nothing of others, the tightest first. What is not listed becomes 16 bits or Vorbis.
_TYPES_HOLDING = {
    **dict.fromkeys(("PCM_U8", "PCM_S8"), ("PCM_U8", "PCM_S8", "PCM_16")),
    **dict.fromkeys(("PCM_32", "FLOAT", "DOUBLE"), ("FLOAT", "PCM_24")),
}


def _sample_type(kind: str, reader: soundfile.SoundFile) -> str:
    """The source's sample type where the container `kind` has it, else one that holds it."""
    own = reader.subtype
    plain = own.startswith(("PCM_", "FLOAT", "DOUBLE", "ULAW", "ALAW"))
    choices = ((own,) if plain or kind == reader.format else ()) + _TYPES_HOLDING.get(own, ("PCM_16", "VORBIS"))
    fitting = (choice for choice in choices if soundfile.check_format(kind, choice))
    return next(fitting, soundfile.default_subtype(kind))


@contextmanager
def _complete_or_absent(target: Path) -> Iterator[Path]:
    """A file beside the target, no sound by its name, that takes the target's only when its block ends well."""
    handle, name = tempfile.mkstemp(prefix=f"{target.name}.part-", dir=target.parent)
    os.close(handle)
    try:
        yield Path(name)
        os.chmod(name, 0o644)
        os.replace(name, target)
    except BaseException:
        Path(name).unlink(missing_ok=True)
        raise


def denoise_file(
    source: str | os.PathLike[str],
    target: str | os.PathLike[str],
    *,
    frame_ms: int = 10,
    model: str | None = None,
    attenuation_limit_db: float = math.inf,
    progress: bool = False,
) -> None:
    """Cleans a sound file of any kind into a WAV, FLAC or Ogg of the same length, channels and sample type.

    The target appears only when it is complete and may be no link to the source. `progress` draws a bar on
    standard error.
    """
    with tqdm(unit="sample", unit_scale=True, disable=not progress, desc=Path(source).name) as bar:

        def advance(samples: int, total: int) -> None:
            bar.total = total
            bar.update(samples)

        clean_file(source, target, advance, frame_ms=frame_ms, model=model, attenuation_limit_db=attenuation_limit_db)


def clean_file(
    source: str | os.PathLike[str],
    target: str | os.PathLike[str],
    advance: Callable[[int, int], object],
    **options: Any,
) -> None:
    """denoise_file() that tells `advance` of every block (its samples, those of the file); what that raises ends it."""
    target = Path(target)
    with ExitStack() as stack:
        reader = stack.enter_context(soundfile.SoundFile(source))
        if target.exists() and target.samefile(source):
            raise ValueError(f"{target} is the input as well; choose another output")
        streams = [stack.enter_context(Denoiser(reader.samplerate, **options)) for _ in range(reader.channels)]
        unfinished = stack.enter_context(_complete_or_absent(target))
        kind = target.suffix[1:].upper().replace("OGA", "OGG")
        subtype = _sample_type(kind, reader)
        writer = stack.enter_context(
            soundfile.SoundFile(unfinished, "w", reader.samplerate, reader.channels, subtype, format=kind)
        )
        for block in reader.blocks(int(reader.samplerate * _BLOCK_SECONDS), dtype="float32", always_2d=True):
            writer.write(np.stack([s.push(block[:, c]) for c, s in enumerate(streams)], axis=1))
            advance(len(block), reader.frames)
        writer.write(np.stack([s.flush() for s in streams], axis=1))
