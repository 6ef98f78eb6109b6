// From voice scores per frame to stretches of speech, with hysteresis.
//
// Times are in milliseconds from the start of the file. Pure function, any thread.
#pragma once

#include <span>
#include <vector>

namespace morva::cli {

struct SegmentRules {
    double threshold = 0.5;       // speech begins with a score of at least this
    double release = 0.35;        // and may end once the score is below this
    double minSilenceMs = 100.0;  // for at least this long
    double padMs = 30.0;          // added at both ends
};

struct Segment {
    double startMs = 0.0;
    double endMs = 0.0;
};

// Score i covers the frame from i * frameMs to (i + 1) * frameMs. The segments are in order, apart
// from each other, and lie within the scored time: padding that would meet in a gap is cut at its
// middle.
std::vector<Segment> speechSegments(std::span<float const> scores, double frameMs,
                                    SegmentRules const& rules);

// Length of all together.
double totalMs(std::span<Segment const> segments);

}  // namespace morva::cli
