// The noise suppression of WebRTC audio processing, its other stages off.
#include <cstdio>

#include "subject.h"

#if MORVA_HAS_WEBRTC
#include <webrtc/modules/audio_processing/include/audio_processing.h>

#include <cstddef>

namespace morva_bench {
namespace {

class WebRtc final : public Subject {
public:
    explicit WebRtc(int rate)
        : processing_(webrtc::AudioProcessing::Create()),
          format_(rate, 1),
          out_(static_cast<std::size_t>(rate / 100)) {
        processing_->noise_suppression()->set_level(webrtc::NoiseSuppression::kHigh);
        processing_->noise_suppression()->Enable(true);
    }
    void frame(float const* samples) override {
        float* const out = out_.data();
        processing_->ProcessStream(&samples, format_, format_, &out);
    }

private:
    std::unique_ptr<webrtc::AudioProcessing> processing_;
    webrtc::StreamConfig format_;
    std::vector<float> out_;
};

}  // namespace

void addWebRtc(Contestants& all) {
    for (int const rate : {48000, 16000}) {
        all.push_back({"WebRTC audio processing", rate, std::make_unique<WebRtc>(rate)});
    }
}

}  // namespace morva_bench

#else

void morva_bench::addWebRtc(Contestants&) {
    std::puts(
        "skipped: WebRTC audio processing was not found when this was built "
        "(libwebrtc-audio-processing-dev)");
}

#endif
