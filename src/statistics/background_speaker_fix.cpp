#include "statistics/background_speaker_fix.h"

#include <cmath>
#include <iterator>

#include "kernels/vector_math.h"
#include "utils/exception.h"

namespace MORVA::UTILS {
namespace {

constexpr std::size_t kMaxRunFrames = 100000;

void require(bool condition, char const* message) {
    if (!condition) raise(message, "src/statistics/background_speaker_fix", "BackgroundSpeakerFix");
}

std::size_t checkedRunFrames(std::size_t count) {
    require(count >= 1 && count <= kMaxRunFrames,
            "The run frame count of the background speaker stage must be 1..100000");
    return count;
}

}  // namespace

BackgroundSpeakerFix::BackgroundSpeakerFix(float cutStartDb, float cutEndDb,
                                           std::size_t runFrameCount, std::size_t runMinLen,
                                           float utteranceLen, bool varWindMode,
                                           std::size_t frameLengthMs,
                                           std::vector<float> const& window)
    : cutStartLevel_(cutStartDb),
      cutEndLevel_(cutEndDb),
      runFrameCount_(checkedRunFrames(runFrameCount)),
      runMinimumLength_(runMinLen),
      variableWindowMode_(varWindMode),
      energyHistory_(runFrameCount_, 1.0),
      averagingLength_(runFrameCount_),
      smoothingCoefficient_(1.0f / (utteranceLen * -2000.0f / static_cast<float>(frameLengthMs)) +
                            1.0f),
      windowEnergy_(static_cast<float>(sumOfSquares(window))) {
    require(std::isfinite(cutStartDb) && std::isfinite(cutEndDb) && cutStartDb != cutEndDb,
            "The cut levels of the background speaker stage must be finite and differ");
    require(std::isfinite(utteranceLen) && utteranceLen > 0.0f,
            "The utterance length of the background speaker stage must be positive");
    require(windowEnergy_ > 0.0f, "The window of the background speaker stage has no energy");
}

bool BackgroundSpeakerFix::frame_compute(std::vector<float>& frame) {
    float const energy = static_cast<float>(sumOfSquares(frame)) / windowEnergy_;
    energyHistory_.splice(energyHistory_.end(), energyHistory_, energyHistory_.begin());
    energyHistory_.back() = energy;

    float const mean = meanOfNewest();
    float const level = 10.0f * std::log10(referenceEnergy_ / (1.0f + mean));
    float const cut = gainDb(level, mean);
    if (variableWindowMode_) adaptLength(level);

    // The power formula on amplitudes is deliberate: the cut is twice as steep as its name says.
    float const factor = std::pow(10.0f, cut / 10.0f);
    for (float& sample : frame) sample *= factor;
    return true;
}

float BackgroundSpeakerFix::meanOfNewest() const {
    float sum = 0.0f;
    auto entry = energyHistory_.end();
    std::advance(entry, -static_cast<std::ptrdiff_t>(averagingLength_));
    for (; entry != energyHistory_.end(); ++entry) sum += static_cast<float>(*entry);
    return sum / static_cast<float>(averagingLength_);
}

// A level that is not a number passes both comparisons by: no cut, no update.
float BackgroundSpeakerFix::gainDb(float level, float mean) {
    if (level >= cutStartLevel_) {
        return (level - cutStartLevel_) * fullCut_ / (cutEndLevel_ - cutStartLevel_);
    }
    if (level < cutStartLevel_) {
        referenceEnergy_ =
            smoothingCoefficient_ * referenceEnergy_ + (1.0f - smoothingCoefficient_) * mean;
    }
    return 0.0f;
}

void BackgroundSpeakerFix::adaptLength(float level) {
    if (level > cutEndLevel_ && averagingLength_ > runMinimumLength_) {
        --averagingLength_;
    } else if (level <= cutEndLevel_ && averagingLength_ < runFrameCount_) {
        ++averagingLength_;
    }
}

}  // namespace MORVA::UTILS
