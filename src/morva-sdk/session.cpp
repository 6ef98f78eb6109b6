#include "morva-sdk/session.h"

#include <algorithm>
#include <cmath>
#include <span>
#include <string>

#include "morva-sdk/error_funnel.h"
#include "noise_canceller/hop_pipeline.h"
#include "utils/exception.h"
#include "utils/float_control.h"
#include "utils/pcm.h"

namespace MORVA::MORVA_SDK {
namespace {

constexpr char const* kUnit = "src/morva-sdk/session";

// The two sample types differ in their texts and conversions, and in nothing else.
struct Int16Samples {
    static constexpr char const* sizeError =
        "ERROR input dataSize or output dataSize or pointers of inputData output Data is wrong\n "
        "input "
        "size must be ";
    static void read(std::span<short const> in, std::span<float> out) {
        UTILS::pcm16ToFloat(in, out);
    }
    static void write(std::span<float const> in, std::span<short> out) {
        UTILS::floatToPcm16(in, out);
    }
};

struct FloatSamples {
    static constexpr char const* sizeError =
        "ERROR input dataSize or output dataSize is wrong \n input size must be ";
    static void read(std::span<float const> in, std::span<float> out) {
        UTILS::unitToPcm16Scale(in, out);
    }
    static void write(std::span<float const> in, std::span<float> out) {
        UTILS::pcm16ScaleToUnit(in, out);
    }
};

constexpr bool isSessionDuration(MorvaFrameDuration duration) {
    int const ms = duration;
    return ms == 10 || ms == 20 || ms == 30 || ms == 40;
}

// What a voice-activity session answers frames with has no samples.
std::size_t outputSamples(MorvaFrameDuration duration, MorvaSamplingRate rate,
                          MorvaSessionType type) {
    return type == MorvaSessionType::VoiceActivity ? static_cast<std::size_t>(duration) / 1000
                                                   : getSampleCount(duration, rate);
}

void printSizeError(char const* error, std::size_t inputSize, std::string const& outputSize) {
    auto const text = error + std::to_string(inputSize) + "\n output size must be " + outputSize;
    printError(text.c_str());
}

}  // namespace

std::size_t getSampleCount(MorvaFrameDuration duration, MorvaSamplingRate rate) {
    double const samples = static_cast<double>(rate) * static_cast<double>(duration) / 1000.0;
    return samples > 0.0 ? static_cast<std::size_t>(samples) : 0;
}

MorvaSessionT::MorvaSessionT(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                             MorvaFrameDuration duration, char const* modelName,
                             MorvaSessionType type)
    : type_(type),
      cleaner_(NOISE_CANCELLER::NoiseCleaner::create(inputRate, duration, modelName, type)) {
    // After the model, so that a missing model is what the caller hears about first; before the
    // resamplers, which cannot be built for every duration.
    if (!isSessionDuration(duration)) {
        UTILS::raise("RESAMPLER WORKS WITH WRONG FRAMEDURATION ", kUnit, "MorvaSessionT");
    }
    auto const modelRate = cleaner_->environment()->first->getWeightInfo().first;
    modelFrameSize_ = getSampleCount(duration, modelRate);
    auto const soundRate = type == MorvaSessionType::VoiceActivity ? modelRate : outputRate;
    inputFrameSize_ = getSampleCount(duration, inputRate);
    outputFrameSize_ = outputSamples(duration, outputRate, type);
    inputResampler_ = std::make_unique<UTILS::Resampler>(inputFrameSize_, modelFrameSize_);
    outputResampler_ =
        std::make_unique<UTILS::Resampler>(modelFrameSize_, getSampleCount(duration, soundRate));
    auto const longest = std::max({inputFrameSize_, modelFrameSize_, outputFrameSize_});
    frame_.reserve(longest);
    resampled_.reserve(longest);
    if (type == MorvaSessionType::NoiseCancellation) prepareSoundPath(duration);
}

void MorvaSessionT::prepareSoundPath(MorvaFrameDuration duration) {
    auto const [modelRate, modelFrameMs] = cleaner_->environment()->first->getWeightInfo();
    auto const pipelineDelay =
        NOISE_CANCELLER::pipelineDelayMs(static_cast<std::size_t>(modelFrameMs),
                                         static_cast<std::size_t>(duration)) *
        static_cast<std::size_t>(modelRate) / 1000;
    auto const atModelRate = inputResampler_->leadingZeros(inputFrameSize_) + pipelineDelay;
    auto const atOutputRate = outputResampler_->leadingZeros(modelFrameSize_);
    latency_ = static_cast<double>(atModelRate) * outputResampler_->ratio() +
               static_cast<double>(atOutputRate);
    bypass_ = std::make_unique<Bypass>(inputFrameSize_, outputFrameSize_,
                                       static_cast<std::size_t>(std::lround(latency_)));
    maskControls_ = dynamic_cast<NOISE_CANCELLER::MaskControls*>(cleaner_.get());
}

void MorvaSessionT::through(UTILS::Resampler& resampler) {
    if (resampler.ratio() == 1.0) return;
    if (resampler.resample(frame_, resampled_) > 0) frame_.swap(resampled_);
}

void MorvaSessionT::cleanFrame() {
    bypass_->remember(frame_);
    through(*inputResampler_);
    UTILS::clipToPcm16(frame_);
    cleaner_->cleanNoise(frame_);
    through(*outputResampler_);
    bypass_->mix(frame_);
    UTILS::clipToPcm16(frame_);
}

template <class Format, class Sample>
bool MorvaSessionT::cleanSamples(Sample const* input, std::size_t inputSize, Sample* output,
                                 std::size_t outputSize) {
    if (input == nullptr || output == nullptr || inputSize != inputFrameSize_ ||
        outputSize != outputFrameSize_) {
        printSizeError(Format::sizeError, inputFrameSize_, std::to_string(outputFrameSize_));
        return false;
    }
    UTILS::ScopedFloatControl const fast(UTILS::Denormals::asZero);
    if (voice_) lastVoice_ = voice_->frameVad(input, inputSize);
    frame_.resize(inputSize);
    Format::read({input, inputSize}, frame_);
    cleanFrame();
    std::size_t const written = std::min(frame_.size(), outputSize);
    Format::write({frame_.data(), written}, {output, written});
    return true;
}

bool MorvaSessionT::cleanNoise(short const* input, std::size_t inputSize, short* output,
                               std::size_t outputSize) {
    return cleanSamples<Int16Samples>(input, inputSize, output, outputSize);
}

bool MorvaSessionT::cleanNoise(float const* input, std::size_t inputSize, float* output,
                               std::size_t outputSize) {
    return cleanSamples<FloatSamples>(input, inputSize, output, outputSize);
}

template <class Format, class Sample>
bool MorvaSessionT::takeFrame(Sample const* input, std::size_t inputSize) {
    if (input == nullptr || inputSize != inputFrameSize_) {
        printSizeError(Format::sizeError, inputFrameSize_, "");
        return false;
    }
    frame_.resize(inputSize);
    Format::read({input, inputSize}, frame_);
    return true;
}

float MorvaSessionT::modelValue() {
    UTILS::ScopedFloatControl const fast(UTILS::Denormals::asZero);
    through(*inputResampler_);
    UTILS::clipToPcm16(frame_);
    cleaner_->cleanNoise(frame_);
    return frame_.front();
}

float MorvaSessionT::frameValue(short const* input, std::size_t inputSize, char const* function) {
    if (!takeFrame<Int16Samples>(input, inputSize)) {
        UTILS::raise("ERROR in input values", kUnit, function);
    }
    return modelValue();
}

float MorvaSessionT::frameValue(float const* input, std::size_t inputSize) {
    return takeFrame<FloatSamples>(input, inputSize) ? modelValue() : -2.0f;
}

float MorvaSessionT::frameVad(short const* input, std::size_t inputSize) {
    return frameValue(input, inputSize, "frameVad");
}

float MorvaSessionT::frameVad(float const* input, std::size_t inputSize) {
    return frameValue(input, inputSize);
}

float MorvaSessionT::frameNoiseDB(short const* input, std::size_t inputSize) {
    return frameValue(input, inputSize, "frameNoiseDB");
}

float MorvaSessionT::frameNoiseDB(float const* input, std::size_t inputSize) {
    return frameValue(input, inputSize);
}

bool MorvaSessionT::resetNoiseDBSession() {
    cleaner_->resetSession();
    inputResampler_->reset();
    outputResampler_->reset();
    return true;
}

}  // namespace MORVA::MORVA_SDK
