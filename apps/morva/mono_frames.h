// A sound file as a run of mono frames for the engine: channels averaged, rate brought to one the
// engine takes, the last frame filled up with silence.
#pragma once

#include <filesystem>
#include <functional>
#include <span>
#include <vector>

namespace morva::cli {

struct MonoSound {
    int rateHz = 0;              // of the file
    std::vector<float> samples;  // channels averaged
};

// Reads at most `maxSeconds`; 0 reads all. Throws Error.
MonoSound readMono(std::filesystem::path const& file, double maxSeconds = 0.0);

// Calls `take` with each frame of `frameMs` at `engineRateHz`.
void forEachFrame(MonoSound const& sound, int engineRateHz, int frameMs,
                  std::function<void(std::span<float const>)> const& take);

}  // namespace morva::cli
