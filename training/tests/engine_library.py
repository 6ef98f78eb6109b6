"""The built engine through its C interface, for the agreement test."""

from __future__ import annotations

import ctypes
import os
from pathlib import Path

import numpy as np

ROOT = Path(__file__).resolve().parents[2]


def library_path() -> Path:
    return Path(os.environ.get("MORVA_LIBRARY", ROOT / "build" / "release" / "libmorva.so"))


def network_masks(weight: bytes, samples: np.ndarray, bands: int) -> np.ndarray:
    """The engine's network output, [frames, bands], for a recording at the model's rate on the 16-bit scale."""
    probe = ctypes.CDLL(str(library_path().parent / "tests" / "noise_canceller" / "libmorva_mask_probe.so")).mask_probe
    probe.restype = ctypes.c_size_t
    probe.argtypes = [
        ctypes.c_char_p,
        ctypes.c_size_t,
        ctypes.c_void_p,
        ctypes.c_size_t,
        ctypes.c_void_p,
        ctypes.c_size_t,
    ]
    source, masks = np.ascontiguousarray(samples, np.float32), np.empty(len(samples) * bands, np.float32)
    count = probe(weight, len(weight), source.ctypes.data, len(source), masks.ctypes.data, len(masks))
    return masks[:count].reshape(-1, bands)


class Engine:
    """One initialised engine. Models are registered from bytes; streams run frame by frame."""

    def __init__(self) -> None:
        library = ctypes.CDLL(str(library_path()))
        for kind in ("NC", "VAD", "NoiseDB"):
            create = getattr(library, f"Morva_{kind}_CreateSession")
            create.restype = ctypes.c_void_p
            rates = [ctypes.c_int] * (2 if kind == "NC" else 1)
            create.argtypes = [*rates, ctypes.c_int, ctypes.c_char_p]
            getattr(library, f"Morva_{kind}_CloseSession").argtypes = [ctypes.c_void_p]
        library.Morva_NC_CleanAmbientNoiseFloat.argtypes = [ctypes.c_void_p, ctypes.c_void_p, ctypes.c_uint] + [
            ctypes.c_void_p,
            ctypes.c_uint,
        ]
        for kind in ("VAD", "NoiseDB"):
            frame = getattr(library, f"Morva_{kind}_FrameInt16")
            frame.argtypes = [ctypes.c_void_p, ctypes.c_void_p, ctypes.c_uint]
            frame.restype = ctypes.c_float
        self.library = library
        self.names = 0
        assert library.Morva_SDK_GlobalInit(None, 1) == 0

    def close(self) -> None:
        self.library.Morva_SDK_GlobalDestroy()

    def register(self, data: bytes) -> bytes:
        """The name under which the model can be used."""
        self.names += 1
        name = f"model {self.names}".encode()
        assert self.library.Morva_SDK_SetModel_Blob(data, len(data), name) == 0
        return name

    def clean(self, name: bytes, samples: np.ndarray, rate: int, frame_ms: int) -> np.ndarray:
        """Whole frames of float samples (-1..1) through a noise session."""
        size = rate * frame_ms // 1000
        session = self.library.Morva_NC_CreateSession(rate, rate, frame_ms, name)
        assert session
        source = np.ascontiguousarray(samples[: len(samples) // size * size], np.float32)
        result = np.empty_like(source)
        for at in range(0, len(source), size):
            code = self.library.Morva_NC_CleanAmbientNoiseFloat(
                session, source[at:].ctypes.data, size, result[at:].ctypes.data, size
            )
            assert code == 0
        self.library.Morva_NC_CloseSession(session)
        return result

    def values(self, kind: str, name: bytes, samples: np.ndarray, rate: int, frame_ms: int) -> np.ndarray:
        """One float per frame of int16 samples through a "VAD" or "NoiseDB" session."""
        size = rate * frame_ms // 1000
        session = getattr(self.library, f"Morva_{kind}_CreateSession")(rate, frame_ms, name)
        assert session
        source = np.ascontiguousarray(samples[: len(samples) // size * size], np.int16)
        frame = getattr(self.library, f"Morva_{kind}_FrameInt16")
        result = [frame(session, source[at:].ctypes.data, size) for at in range(0, len(source), size)]
        getattr(self.library, f"Morva_{kind}_CloseSession")(session)
        return np.array(result, np.float32)
