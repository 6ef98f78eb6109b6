"""Real-time noise suppression, voice activity and noise level.

Sounds are NumPy arrays of int16 or floating point in -1..1, of shape (n,) or (n, channels). Whole sounds go through denoise(), voice() and noise_level(), files through denoise_file(), live
sound through Denoiser, VoiceDetector and NoiseLevelMeter. One thread at a time per object; objects on
different threads run side by side, as the engine works outside the interpreter lock. What the engine has
to say goes to the logger "morva", level DEBUG.
"""

from ._engine import RATES, EngineError, Model, models, version
from ._files import denoise_file
from ._sounds import denoise, noise_level, voice
from ._streams import Denoiser, NoiseLevelMeter, VoiceDetector

__version__ = "1.0.0"
__all__ = [
    "RATES",
    "Denoiser",
    "EngineError",
    "Model",
    "NoiseLevelMeter",
    "VoiceDetector",
    "denoise",
    "denoise_file",
    "models",
    "noise_level",
    "version",
    "voice",
]
