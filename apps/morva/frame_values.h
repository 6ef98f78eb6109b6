// Voice scores and noise levels of a whole sound, one value per frame.
#pragma once

#include <string>
#include <vector>

#include "models.h"
#include "mono_frames.h"

namespace morva::cli {

// `name` is what the user calls the sound, for error texts. Both throw Error.
std::vector<float> voiceScores(Engine& engine, Models& models, std::string const& name,
                               MonoSound const& sound, int frameMs);
// Decibels re one squared unit of the 16-bit sample scale.
std::vector<float> noiseLevels(Engine& engine, Models& models, std::string const& name,
                               MonoSound const& sound, int frameMs);

// Level in decibels re a full-scale square wave of a level re one squared unit of the 16-bit scale.
inline constexpr double fullScaleDb = 90.30899869919435;  // 20 log10(32768)

}  // namespace morva::cli
