// One channel of a sound file on its way through the engine, sample in, sample out.
//
//   file rate -> [rate converter] -> session frames -> fraction of a sample -> latency cut
//             -> [rate converter] -> file rate
//
// The output is as long as the input and lies in time where the input lay. Thread rule: one thread.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "engine.h"
#include "fractional_delay.h"
#include "rate_converter.h"

namespace morva::cli {

class ChannelCleaner {
public:
    // The session runs at setup.rateHz, which the file's rate is converted to and back from.
    ChannelCleaner(Engine& engine, int fileRateHz, SessionSetup const& setup);

    // Appends to `out` the cleaned samples that are ready.
    void push(std::span<float const> in, std::vector<float>& out);
    // Appends the rest, so that as many samples have come out as went in.
    void finish(std::vector<float>& out);

private:
    void takeFrames(std::vector<float>& out);
    void release(std::span<float const> cleaned, std::vector<float>& out);

    CleaningSession session_;
    RateConverter toEngine_;
    FractionalDelay toWhole_;  // the session's latency becomes a whole number of samples
    RateConverter fromEngine_;
    std::size_t frameSize_;
    std::int64_t toSkip_;        // cleaned samples still to be dropped: that number
    std::int64_t fed_ = 0;       // samples given to the session, padding not counted
    std::int64_t released_ = 0;  // cleaned samples passed on
    std::int64_t in_ = 0;        // samples pushed, at the file's rate
    std::int64_t out_ = 0;       // samples handed out, at the file's rate
    std::vector<float> pending_;
    std::vector<float> frame_;
    std::vector<float> aligned_;
};

}  // namespace morva::cli
