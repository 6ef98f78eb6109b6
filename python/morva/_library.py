"""The engine's C interface through ctypes. Declarations only; no state but the loaded library."""

from __future__ import annotations

import ctypes
import functools
import os
from ctypes import POINTER, c_char, c_char_p, c_float, c_int, c_uint, c_ulonglong, c_void_p, c_wchar_p
from pathlib import Path

_BUNDLED = Path(__file__).resolve().parent / "_bundled"
_TREE = Path(__file__).resolve().parents[2]  # where this package is used without being installed
_INSTALLED = _BUNDLED.exists()
MODELS = _BUNDLED / "models" if _INSTALLED else _TREE / "models"


class ModelInfo(ctypes.Structure):
    _fields_ = [
        ("name", c_char * 128),
        ("version", c_char * 32),
        ("sampleRate", c_int),
        ("frameMs", c_int),
        ("size", c_ulonglong),
    ]


Diagnostic = ctypes.CFUNCTYPE(None, c_int, c_char_p)  # stream, text; Diagnostic() is none

_FRAME = [c_void_p, c_void_p, c_uint]  # session, samples, how many
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
    "Morva_NC_CleanAmbientNoiseInt16": (c_int, [*_FRAME, c_void_p, c_uint]),
    "Morva_NC_CleanAmbientNoiseFloat": (c_int, [*_FRAME, c_void_p, c_uint]),
    "Morva_VAD_FrameFloat": (c_float, _FRAME),
    "MorvaExt_NoiseDB_FrameFloat": (c_int, [*_FRAME, POINTER(c_float)]),
    "MorvaExt_SessionLatencySamples": (c_int, [c_void_p]),
    "MorvaExt_NC_SetAttenuationLimit": (c_int, [c_void_p, c_float]),
    "MorvaExt_NC_SetBypass": (c_int, [c_void_p, c_int]),
    "MorvaExt_ListModels": (c_int, [POINTER(ModelInfo), c_int]),
    "MorvaExt_SetDiagnostics": (None, [Diagnostic]),
    "MorvaExt_Version": (c_char_p, []),
    "MorvaExt_LastError": (c_char_p, []),
}


@functools.cache
def library() -> ctypes.CDLL:
    """The library of MORVA_LIBRARY, else the one in this package, else the one built in this source tree."""
    own = next(_BUNDLED.glob("*morva.*")) if _INSTALLED else _TREE / "build/release/libmorva.so"
    loaded = ctypes.CDLL(os.environ.get("MORVA_LIBRARY") or str(own))
    for name, (result, arguments) in _FUNCTIONS.items():
        function = getattr(loaded, name)
        function.restype, function.argtypes = result, arguments
    return loaded
