#include "morva-sdk/session.h"

#include <memory>
#include <string>
#include <utility>

#include "kernels/float_control.h"
#include "kernels/pcm.h"
#include "morva-sdk/error_funnel.h"
#include "noise_canceller/noise_cleaner.h"
#include "utils/exception.h"

namespace MORVA::MORVA_SDK {
namespace {

using NOISE_CANCELLER::NoiseCleaner;

constexpr char const* kUnit = "src/morva-sdk/session";
constexpr auto kHighestRate = static_cast<MorvaSamplingRate>(kSamplingRatesHz.back());

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

void printSizeError(char const* error, std::size_t inputSize, std::string const& outputSize) {
    auto const text = error + std::to_string(inputSize) + "\n output size must be " + outputSize;
    printError(text.c_str());
}

}  // namespace

MorvaSessionT::Path MorvaSessionT::openPath(char const* modelName) const {
    // A missing model is what the caller hears about first, even when the duration is wrong as
    // well.
    auto const checkDuration = [this] {
        if (isFrameDuration(duration_)) return;
        UTILS::raise("RESAMPLER WORKS WITH WRONG FRAMEDURATION ", kUnit, "MorvaSessionT");
    };
    if (type_ == MorvaSessionType::NoiseCancellation) {
        auto model = NOISE_CANCELLER::createNoiseModel(inputRate_, duration_, modelName);
        checkDuration();
        return Path(std::in_place_type<SoundPath>, std::move(model), inputFrameSize_,
                    outputFrameSize_, duration_);
    }
    auto cleaner = NoiseCleaner::create(inputRate_, duration_, modelName, type_);
    checkDuration();
    return Path(std::in_place_type<ModelStage>, std::move(cleaner), inputFrameSize_, duration_);
}

MorvaSessionT::MorvaSessionT(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                             MorvaFrameDuration duration, char const* modelName,
                             MorvaSessionType type)
    : inputRate_(inputRate),
      duration_(duration),
      type_(type),
      inputFrameSize_(getSampleCount(duration, inputRate)),
      outputFrameSize_(
          type == MorvaSessionType::VoiceActivity ? 0 : getSampleCount(duration, outputRate)),
      path_(openPath(modelName)) {
    frame_.reserve(getSampleCount(duration, kHighestRate));
}

void MorvaSessionT::enableVoice(char const* vadModel) {
    auto cleaner =
        NoiseCleaner::create(inputRate_, duration_, vadModel, MorvaSessionType::VoiceActivity);
    sound().enableVoice(
        std::make_unique<VoiceMeter>(std::move(cleaner), inputFrameSize_, duration_));
}

template <class Format, class Sample>
bool MorvaSessionT::cleanSamples(std::span<Sample const> input, std::span<Sample> output) {
    if (input.data() == nullptr || output.data() == nullptr || input.size() != inputFrameSize_ ||
        output.size() != outputFrameSize_) {
        printSizeError(Format::sizeError, inputFrameSize_, std::to_string(outputFrameSize_));
        return false;
    }
    UTILS::ScopedFloatControl const mode(UTILS::Denormals::asZero);
    frame_.resize(input.size());
    Format::read(input, frame_);
    sound().clean(frame_);
    Format::write(frame_, output);
    return true;
}

bool MorvaSessionT::cleanNoise(short const* input, std::size_t inputSize, short* output,
                               std::size_t outputSize) {
    return cleanSamples<Int16Samples>(std::span(input, inputSize), std::span(output, outputSize));
}

bool MorvaSessionT::cleanNoise(float const* input, std::size_t inputSize, float* output,
                               std::size_t outputSize) {
    return cleanSamples<FloatSamples>(std::span(input, inputSize), std::span(output, outputSize));
}

template <class Format, class Sample>
std::optional<float> MorvaSessionT::valueOf(std::span<Sample const> input) {
    if (input.data() == nullptr || input.size() != inputFrameSize_) {
        printSizeError(Format::sizeError, inputFrameSize_, "");
        return std::nullopt;
    }
    UTILS::ScopedFloatControl const mode(UTILS::Denormals::asZero);
    frame_.resize(input.size());
    Format::read(input, frame_);
    std::get<ModelStage>(path_).run(frame_);
    return frame_.front();
}

float MorvaSessionT::frameValue(short const* input, std::size_t inputSize, char const* function) {
    auto const value = valueOf<Int16Samples>(std::span(input, inputSize));
    if (!value) UTILS::raise("ERROR in input values", kUnit, function);
    return *value;
}

float MorvaSessionT::frameValue(float const* input, std::size_t inputSize) {
    return valueOf<FloatSamples>(std::span(input, inputSize)).value_or(-2.0f);
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
    std::get<ModelStage>(path_).reset();
    return true;
}

}  // namespace MORVA::MORVA_SDK
