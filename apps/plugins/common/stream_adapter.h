// A host's stream of sound, in blocks of any length, through sessions that take frames: what every
// kind of plugin is made of.
//
// A session per channel, the FIFO in front of them, and the controls that hosts turn. Everything
// but run() and the readings may allocate; run() takes no lock, allocates nothing and prints
// nothing. One thread at a time per adapter.
#pragma once

#include <cstddef>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "frame_fifo.h"
#include "shared_engine.h"

namespace morva::plugins {

// At and above this the attenuation is not limited.
inline constexpr float kNoLimitDb = 100.0F;

// What hosts turn while the sound runs; any value is survived.
struct Settings {
    float limitDb = kNoLimitDb;
    bool bypass = false;
    bool operator==(Settings const&) const = default;
};

// Of the newest frame and its loudest channel.
struct Meters {
    float voice = 0.0F;      // 0..1
    float levelDb = -60.0F;  // of the noise, as noise-level sessions report it
};

class StreamAdapter {
public:
    struct Setup {
        std::size_t channels;
        int rateHz;
        bool meters;        // whether the voice score is wanted, which costs a second model
        std::string model;  // as for SharedEngine; empty: chosen by the rate
    };

    // Throws std::runtime_error for a rate that the engine does not take, for a model that cannot
    // be used, and when the engine cannot start.
    explicit StreamAdapter(Setup setup);

    // Forgets the sound so far. Throws std::runtime_error when a session cannot be opened; the old
    // ones then go on.
    void restart();

    // Cleans one block, a lane per channel.
    void run(std::span<Lane const> lanes, std::size_t samples, Settings const& settings);

    // From sound in to sound out, in samples; constant.
    std::size_t latency() const { return latency_; }
    // Samples after the newest complete frame, and until the next one.
    std::size_t sinceFrame() const { return fifo_.filled(); }
    std::size_t untilFrame() const { return frame() - sinceFrame(); }
    std::size_t frame() const { return fifo_.delay(); }
    Meters const& meters() const { return meters_; }

private:
    struct CloseSession {
        void operator()(void* session) const;
    };
    using Session = std::unique_ptr<void, CloseSession>;

    Session openSession();
    void follow(Settings const& settings);
    void cleanFrame(std::size_t channel, std::span<float const> in, std::span<float> out);

    SharedEngine engine_;  // first, so that it outlives the sessions
    Setup setup_;
    FrameFifo fifo_;
    std::vector<Session> sessions_;
    std::size_t latency_ = 0;
    Settings settings_;  // as the sessions have them
    Meters meters_;
};

}  // namespace morva::plugins
