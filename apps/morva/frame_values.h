// Voice scores and noise levels of a whole sound, one value per frame.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "workbench.h"

namespace morva::cli {

struct MonoSound {
    std::string name;            // what the user calls it
    int rateHz = 0;              // of the file
    std::vector<float> samples;  // channels averaged
    int channels = 0;
    bool isWhole = true;  // nothing was left out for its length
    std::string damage;   // of the file, whose rest is missing; a line for the user
};

// What a command returns when it has done with the sound; prints what is missing of it.
int ended(Streams& streams, MonoSound const& sound);

// Reads at most `maxSeconds`; 0 reads all. Throws Error.
MonoSound readMono(std::filesystem::path const& file, double maxSeconds = 0.0);

// The sound is brought to a rate that the engine takes and its last frame filled up with silence.
// Both throw Error.
std::vector<float> voiceScores(Workbench& bench, ModelFiles const& model, MonoSound const& sound);
// Decibels re one squared unit of the 16-bit sample scale.
std::vector<float> noiseLevels(Workbench& bench, ModelFiles const& model, MonoSound const& sound);

// Level in decibels re a full-scale square wave of a level re one squared unit of the 16-bit scale.
inline constexpr double fullScaleDb = 90.30899869919435;  // 20 log10(32768)

}  // namespace morva::cli
