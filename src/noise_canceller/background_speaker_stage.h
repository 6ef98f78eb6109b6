// What a model does with a cleaned frame before it is windowed: nothing, or pushing background
// speakers down.
#pragma once

#include <atomic>
#include <cstddef>
#include <vector>

#include "noise_canceller/parameter_reader.h"
#include "statistics/background_speaker_fix.h"

namespace MORVA::NOISE_CANCELLER {

struct NoStage {
    struct Params {
        explicit Params(ParameterReader const&) {}
    };
    NoStage(Params const&, std::size_t, std::vector<float> const&) {}
    void operator()(std::vector<float>&) {}
    bool switchTo(bool) { return false; }
};

class BackgroundSpeakerStage {
public:
    struct Params {
        explicit Params(ParameterReader const& reader);

        bool enableBackgroundSpeakerFix;
        float cutStartDb;
        float cutEndDb;
        std::size_t runFrameCount;
        std::size_t runMinLen;
        float utteranceLen;  // seconds
        bool varWindMode;
    };

    // `window` is the synthesis window.
    BackgroundSpeakerStage(Params const& params, std::size_t modelFrameMs,
                           std::vector<float> const& window);

    void operator()(std::vector<float>& frame);

    // True: there is such a stage. [any thread]
    bool switchTo(bool on);

private:
    UTILS::BackgroundSpeakerFix fix_;
    std::atomic<bool> on_;
};

}  // namespace MORVA::NOISE_CANCELLER
