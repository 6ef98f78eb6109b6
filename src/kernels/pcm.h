// Sample formats at the edges of a session. Inside the engine samples are floats on the scale of
// 16-bit PCM, -32768 .. 32767. Input and output spans have equal lengths and may be the same
// memory where the types agree. No allocation. Any thread.
#pragma once

#include <span>

namespace MORVA::UTILS {

// Each sample keeps its integer value.
void pcm16ToFloat(std::span<short const> in, std::span<float> out);

// -1 .. 1 to the 16-bit scale (x 32768). What is no sound, a NaN or an infinity, becomes 0, so that
// a filter's memory never holds it; so does what is smaller than 1e-20, whose products would be
// denormal, which costs time where they cannot be switched off; a finite sample beyond 1e6 full
// scales becomes that, since a sum of larger ones could overflow.
void unitToPcm16Scale(std::span<float const> in, std::span<float> out);

// Limits to -32768 .. 32767; NaN becomes 0.
void clipToPcm16(std::span<float> samples);

// Truncates toward zero and saturates; NaN becomes 0.
void floatToPcm16(std::span<float const> in, std::span<short> out);

// 16-bit scale to -1 .. 1 (x 1 / 32768).
void pcm16ScaleToUnit(std::span<float const> in, std::span<float> out);

}  // namespace MORVA::UTILS
