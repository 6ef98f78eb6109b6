#include "morva-sdk/sound_path.h"

#include <cmath>
#include <utility>

#include "kernels/pcm.h"
#include "noise_canceller/sound_controls.h"

namespace MORVA::MORVA_SDK {
namespace {

// The one place that knows what a sound waits for: the filter into the model and the model, both at
// its rate, and the filter out of it.
double latencyOf(FrameConverter const& in, std::size_t modelDelay, FrameConverter const& out) {
    return static_cast<double>(in.delay() + modelDelay) * out.ratio() +
           static_cast<double>(out.delay());
}

}  // namespace

VoiceMeter::VoiceMeter(std::unique_ptr<NOISE_CANCELLER::NoiseCleaner> cleaner,
                       std::size_t inputFrame, MorvaFrameDuration duration)
    : model_(std::move(cleaner), inputFrame, duration) {
    listen(std::vector<float>(inputFrame));
    model_.reset();
    score_ = std::numeric_limits<float>::quiet_NaN();
}

void VoiceMeter::listen(std::span<float const> frame) {
    frame_.assign(frame.begin(), frame.end());
    model_.run(frame_);
    score_ = frame_.front();
}

SoundPath::SoundPath(NOISE_CANCELLER::NoiseModel model, std::size_t inputFrame,
                     std::size_t outputFrame, MorvaFrameDuration duration)
    : controls_(model.controls),
      model_(std::move(model.cleaner), inputFrame, duration),
      toOutput_(model_.modelFrame(), outputFrame),
      exactLatency_(latencyOf(model_.converter(), controls_.delay(), toOutput_)),
      latency_(std::lround(exactLatency_)),
      bypass_(inputFrame, outputFrame, static_cast<std::size_t>(latency_)) {}

void SoundPath::clean(std::vector<float>& frame) {
    if (voice_) voice_->listen(frame);
    bypass_.remember(frame);
    model_.run(frame);
    toOutput_.convert(frame);
    bypass_.mix(frame);
    UTILS::clipToPcm16(frame);
}

bool SoundPath::setAttenuationLimit(float limitDb) {
    if (!(limitDb >= 0.0f)) return false;
    controls_.setMaskFloor(std::pow(10.0f, -limitDb / 20.0f));
    return true;
}

bool SoundPath::setBackgroundSpeaker(bool on) {
    return controls_.switchBackgroundSpeaker(on);
}

void SoundPath::enableVoice(std::unique_ptr<VoiceMeter> voice) {
    voice_ = std::move(voice);
}

float SoundPath::voiceScore() const {
    return voice_ ? voice_->score() : controls_.voiceScore();
}

float SoundPath::noiseLevelDb() const {
    return controls_.noiseLevelDb();
}

}  // namespace MORVA::MORVA_SDK
