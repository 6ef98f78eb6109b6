// The preprocessor of SpeexDSP, noise suppression only.
#include <cstdio>

#include "subject.h"

#if MORVA_HAS_SPEEXDSP
#include <speex/speex_preprocess.h>

#include <algorithm>
#include <cstddef>

namespace morva_bench {
namespace {

struct Destroy {
    void operator()(SpeexPreprocessState* state) const { speex_preprocess_state_destroy(state); }
};

class SpeexDsp final : public Subject {
public:
    explicit SpeexDsp(int rate)
        : state_(speex_preprocess_state_init(rate / 100, rate)),
          pcm_(static_cast<std::size_t>(rate / 100)) {
        int on = 1;
        speex_preprocess_ctl(state_.get(), SPEEX_PREPROCESS_SET_DENOISE, &on);
    }
    void frame(float const* samples) override {
        std::transform(samples, samples + pcm_.size(), pcm_.begin(),
                       [](float x) { return static_cast<short>(x * 32767.0f); });
        speex_preprocess_run(state_.get(), pcm_.data());
    }

private:
    std::unique_ptr<SpeexPreprocessState, Destroy> state_;
    std::vector<short> pcm_;
};

}  // namespace

void addSpeexDsp(Contestants& all) {
    for (int const rate : {48000, 16000}) {
        all.push_back({"SpeexDSP preprocessor", rate, std::make_unique<SpeexDsp>(rate)});
    }
}

}  // namespace morva_bench

#else

void morva_bench::addSpeexDsp(Contestants&) {
    std::puts("skipped: SpeexDSP was not found when this was built (libspeexdsp-dev)");
}

#endif
