// One plugin instance: a cleaning session and a FIFO per channel, and the host's ports.
//
// Ports: the channels' inputs, the channels' outputs, then the controls of Control. Samples are
// floats in -1..1. Everything but run() may allocate; run() takes no lock, allocates nothing and
// prints nothing. One thread at a time per instance.
#pragma once

#include <ladspa.h>

#include <cstddef>
#include <memory>
#include <vector>

#include "frame_fifo.h"
#include "shared_engine.h"

namespace morva::ladspa {

enum class Control : std::size_t { attenuationLimit, bypass, latency, count };

// At and above this the attenuation is not limited.
inline constexpr float kNoLimitDb = 100.0F;

constexpr std::size_t portCount(std::size_t channels) {
    return 2 * channels + static_cast<std::size_t>(Control::count);
}

class Plugin {
public:
    // Throws std::runtime_error for a rate that the engine does not take, and when it cannot start.
    Plugin(std::size_t channels, unsigned long rateHz);

    void connect(std::size_t port, LADSPA_Data* data) { ports_[port] = data; }
    // Forgets the sound so far. Throws std::runtime_error when a session cannot be opened.
    void activate();
    void run(std::size_t samples);

private:
    struct CloseSession {
        void operator()(void* session) const;
    };
    using Session = std::unique_ptr<void, CloseSession>;
    struct Channel {
        Session session;
        FrameFifo fifo;
    };

    LADSPA_Data* control(Control which) const {
        return ports_[2 * channels_.size() + static_cast<std::size_t>(which)];
    }
    void openSessions();
    void followControls();

    SharedEngine engine_;  // first, so that it outlives the sessions
    int rateHz_;
    std::vector<Channel> channels_;
    std::vector<LADSPA_Data*> ports_;
    float limitDb_ = kNoLimitDb;  // as the sessions have it
    bool bypass_ = false;
    float latency_ = 0.0F;
};

}  // namespace morva::ladspa
