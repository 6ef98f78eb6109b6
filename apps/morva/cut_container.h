// Whether a sound file was cut off: the sound-file library takes what is there and says nothing.
#pragma once

#include <cstdint>

namespace morva::cli {

// True when a length in bytes stands for "not known", as programs write it that do not know how
// much will follow.
bool isPlaceholder(std::uint64_t length);

// True when the sound data of an open WAV, RF64 or AIFF file is said to go on beyond its end; false
// for what is no such file.
bool endsInsideSound(int descriptor);

}  // namespace morva::cli
