"""The engine's C interface through ctypes. Declarations only; no state but the loaded library."""

from __future__ import annotations

import ctypes
import ctypes.util
import functools
import os
from ctypes import POINTER, c_char, c_char_p, c_float, c_int, c_short, c_uint, c_ulonglong
from ctypes import c_void_p, c_wchar_p
from pathlib import Path

BUNDLED = Path(__file__).resolve().parent / "_bundled"


class ModelInfo(ctypes.Structure):
    _fields_ = [
        ("name", c_char * 128),
        ("version", c_char * 32),
        ("sampleRate", c_int),
        ("frameMs", c_int),
        ("size", c_ulonglong),
    ]


_shorts, _floats, _uints = POINTER(c_short), POINTER(c_float), POINTER(c_uint)
_FUNCTIONS = {
    "Morva_SDK_GlobalInit": (c_int, [c_wchar_p, c_uint]),
    "Morva_SDK_GlobalDestroy": (c_int, []),
    "Morva_SDK_SetModel_Blob": (c_int, [c_char_p, c_uint, c_char_p]),
    "Morva_NC_CreateSession": (c_void_p, [c_int, c_int, c_int, c_char_p]),
    "Morva_VAD_CreateSession": (c_void_p, [c_int, c_int, c_char_p]),
    "Morva_NoiseDB_CreateSession": (c_void_p, [c_int, c_int, c_char_p]),
    "Morva_NC_CloseSession": (c_int, [c_void_p]),
    "Morva_VAD_CloseSession": (c_int, [c_void_p]),
    "Morva_NoiseDB_CloseSession": (c_int, [c_void_p]),
    "Morva_NC_CleanAmbientNoiseInt16": (c_int, [c_void_p, _shorts, c_uint, _shorts, c_uint]),
    "Morva_NC_CleanAmbientNoiseFloat": (c_int, [c_void_p, _floats, c_uint, _floats, c_uint]),
    "Morva_VAD_FrameInt16": (c_float, [c_void_p, _shorts, c_uint]),
    "Morva_NoiseDB_FrameInt16": (c_float, [c_void_p, _shorts, c_uint]),
    "MorvaExt_SessionLatencySamples": (c_int, [c_void_p]),
    "MorvaExt_NC_SetAttenuationLimit": (c_int, [c_void_p, c_float]),
    "MorvaExt_NC_SetBypass": (c_int, [c_void_p, c_int]),
    "MorvaExt_ListModels": (c_int, [POINTER(ModelInfo), c_int]),
    "MorvaExt_Version": (c_char_p, []),
    "MorvaExt_LastError": (c_char_p, []),
}


def _path() -> str:
    chosen = os.environ.get("MORVA_LIBRARY")
    if chosen:
        return chosen
    bundled = BUNDLED / "libmorva.so"
    return str(bundled) if bundled.exists() else ctypes.util.find_library("morva") or "libmorva.so.1"


@functools.cache
def library() -> ctypes.CDLL:
    """The library of MORVA_LIBRARY, else the one in this package, else the system's."""
    loaded = ctypes.CDLL(_path())
    for name, (result, arguments) in _FUNCTIONS.items():
        function = getattr(loaded, name)
        function.restype, function.argtypes = result, arguments
    return loaded
