// One self-contained page that shows a sound before and after cleaning; drawn by its own script.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "segments.h"

namespace morva::cli {

struct Report {
    std::string file;
    int rateHz = 0;
    int frameMs = 0;
    std::vector<float> before;  // mono, -1..1
    std::vector<float> after;   // as long as before
    std::vector<float> scores;  // empty: no voice-activity model
    std::vector<Segment> segments;
    SegmentRules rules;
    std::vector<float> levelsDb;  // re full scale; empty: no noise-level model
    std::vector<std::string> notes;
    bool isDamaged = false;  // the rest of the file is missing, as a note says
};

std::string renderPage(Report const& report);

}  // namespace morva::cli
