// Pushes down frames that lie far below the main talker's level.
//
// Works on time frames before the synthesis window, samples on the 16-bit scale. The distance to a
// slowly adapting reference energy is mapped linearly, in decibels, to a cut: none up to the cut
// start, -60 at the cut end, growing on beyond it. A frame allocates nothing.
#pragma once

#include <cstddef>
#include <list>
#include <vector>

namespace MORVA::UTILS {

class BackgroundSpeakerFix {
public:
    // cutStartDb, cutEndDb: distances below the reference. runFrameCount, runMinLen: largest and
    // smallest number of frames averaged. utteranceLen: time constant of the reference in seconds.
    // varWindMode: the averaging length adapts. frameLengthMs: model frame, two hops.
    // window: the synthesis window.
    // Throws MORVA_Exception for a run frame count outside 1 .. 100000, equal or infinite cut
    // levels, an utterance length that is not positive and finite, or a window without energy.
    BackgroundSpeakerFix(float cutStartDb, float cutEndDb, std::size_t runFrameCount,
                         std::size_t runMinLen, float utteranceLen, bool varWindMode,
                         std::size_t frameLengthMs, std::vector<float> const& window);

    // Scales the frame in place; always true.
    bool frame_compute(std::vector<float>& frame);

private:
    float meanOfNewest() const;
    float gainDb(float level, float mean);
    void adaptLength(float level);

    float cutStartLevel_;
    float cutEndLevel_;
    std::size_t runFrameCount_;
    std::size_t runMinimumLength_;
    bool variableWindowMode_;
    std::list<double> energyHistory_;  // oldest first
    std::size_t averagingLength_;
    float referenceEnergy_ = 1.0f;
    float smoothingCoefficient_;
    float fullCut_ = -60.0f;  // dB
    float windowEnergy_;
};

}  // namespace MORVA::UTILS
