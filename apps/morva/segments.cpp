#include "segments.h"

#include <algorithm>
#include <functional>
#include <numeric>

namespace morva::cli {
namespace {

// Segments without padding: a score between the two thresholds neither starts nor ends speech, and
// only a score back at the threshold ends a silence that was too short.
std::vector<Segment> bareSegments(std::span<float const> scores, double frameMs,
                                  SegmentRules const& rules) {
    std::vector<Segment> segments;
    bool speaking = false;
    bool quiet = false;  // below the release threshold since segments.back().endMs
    for (std::size_t i = 0; i < scores.size(); ++i) {
        double const start = static_cast<double>(i) * frameMs;
        if (scores[i] >= rules.threshold) {
            if (!speaking) segments.push_back({start, start});
            speaking = true;
            quiet = false;
        } else if (speaking && !quiet && scores[i] < rules.release) {
            quiet = true;
            segments.back().endMs = start;
        }
        if (quiet && start + frameMs - segments.back().endMs >= rules.minSilenceMs) {
            speaking = false;
            quiet = false;
        }
    }
    if (speaking && !quiet) segments.back().endMs = static_cast<double>(scores.size()) * frameMs;
    return segments;
}

}  // namespace

std::vector<Segment> speechSegments(std::span<float const> scores, double frameMs,
                                    SegmentRules const& rules) {
    auto segments = bareSegments(scores, frameMs, rules);
    double const whole = static_cast<double>(scores.size()) * frameMs;
    double free = 0.0;  // start of the gap before the segment at hand
    for (std::size_t i = 0; i < segments.size(); ++i) {
        auto& segment = segments[i];
        bool const last = i + 1 == segments.size();
        double const gapBefore = segment.startMs - free;
        double const gapAfter = (last ? whole : segments[i + 1].startMs) - segment.endMs;
        free = segment.endMs;
        segment.startMs -= std::min(rules.padMs, i == 0 ? gapBefore : gapBefore / 2);
        segment.endMs += std::min(rules.padMs, last ? gapAfter : gapAfter / 2);
    }
    return segments;
}

double totalMs(std::span<Segment const> segments) {
    return std::transform_reduce(segments.begin(), segments.end(), 0.0, std::plus<>(),
                                 [](Segment const& one) { return one.endMs - one.startMs; });
}

}  // namespace morva::cli
