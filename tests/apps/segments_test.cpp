// Speech segments against a plain reading of the rules, on seeded random scores.
#include "segments.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

namespace morva::cli {
namespace {

// The rules read per frame from the whole file at once: a frame is speech from the start of a run
// whose score reached the threshold until the first silence, below the release threshold and not
// interrupted by the threshold, that lasts long enough.
std::vector<bool> speechByHand(std::vector<float> const& scores, double frameMs,
                               SegmentRules const& rules) {
    std::vector<bool> speech(scores.size(), false);
    for (std::size_t i = 0; i < scores.size();) {
        if (scores[i] < rules.threshold) {
            ++i;
            continue;
        }
        std::size_t end = scores.size();
        for (std::size_t low = i; low < scores.size(); ++low) {
            if (!(scores[low] < rules.release)) continue;
            std::size_t back = low;  // where the score is at the threshold again
            while (back < scores.size() && scores[back] < rules.threshold) ++back;
            bool const lasts = static_cast<double>(back - low) * frameMs >= rules.minSilenceMs;
            if (lasts || back == scores.size()) {
                end = low;
                break;
            }
            low = back;
        }
        std::fill(speech.begin() + static_cast<std::ptrdiff_t>(i),
                  speech.begin() + static_cast<std::ptrdiff_t>(end), true);
        i = end;
        while (i < scores.size() && scores[i] < rules.threshold) ++i;
    }
    return speech;
}

std::vector<float> randomScores(std::mt19937& random) {
    std::uniform_real_distribution<float> any(0.0F, 1.0F);
    std::vector<float> scores(random() % 200);
    float score = any(random);
    for (float& value : scores) {
        if (random() % 4 == 0) score = any(random);
        value = score;
    }
    return scores;
}

SegmentRules randomRules(std::mt19937& random) {
    std::uniform_real_distribution<double> any(0.0, 1.0);
    double const threshold = 0.3 + 0.6 * any(random);
    return {threshold, threshold * any(random), std::floor(any(random) * 20) * 10, 0.0};
}

TEST(SpeechSegments, AgreeWithAPlainReadingOfTheRules) {
    for (unsigned int seed = 0; seed < 2000; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        std::mt19937 random(seed);
        double const frameMs = std::vector{10.0, 20.0, 30.0, 40.0}[random() % 4];
        auto const rules = randomRules(random);
        auto const scores = randomScores(random);
        std::vector<bool> found(scores.size(), false);
        for (auto const& [start, end] : speechSegments(scores, frameMs, rules)) {
            ASSERT_LT(start, end);
            for (double at = start; at < end; at += frameMs) {
                found[static_cast<std::size_t>(at / frameMs + 0.5)] = true;
            }
        }
        ASSERT_EQ(found, speechByHand(scores, frameMs, rules));
    }
}

TEST(SpeechSegments, PaddingNeverLeavesTheFileNorMeetsANeighbour) {
    for (unsigned int seed = 0; seed < 2000; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        std::mt19937 random(seed);
        auto const scores = randomScores(random);
        auto rules = randomRules(random);
        auto const bare = speechSegments(scores, 10.0, rules);
        rules.padMs = static_cast<double>(random() % 200);
        auto const padded = speechSegments(scores, 10.0, rules);
        ASSERT_EQ(padded.size(), bare.size());
        double free = 0.0;
        for (std::size_t i = 0; i < padded.size(); ++i) {
            ASSERT_GE(padded[i].startMs, free);
            ASSERT_LE(padded[i].startMs, bare[i].startMs);
            ASSERT_GE(padded[i].startMs, bare[i].startMs - rules.padMs);
            ASSERT_GE(padded[i].endMs, bare[i].endMs);
            ASSERT_LE(padded[i].endMs, bare[i].endMs + rules.padMs);
            free = padded[i].endMs;
        }
        ASSERT_LE(free, static_cast<double>(scores.size()) * 10.0);
    }
}

TEST(SpeechSegments, TheDefaultsBridgeAGapOfNineFramesButNotOfTen) {
    auto const spoken = [](int gap) {
        std::vector<float> scores(20, 0.9F);
        scores.insert(scores.end(), static_cast<std::size_t>(gap), 0.1F);
        scores.insert(scores.end(), 20, 0.9F);
        return speechSegments(scores, 10.0, {});
    };
    EXPECT_EQ(spoken(9).size(), 1U);
    auto const two = spoken(10);
    ASSERT_EQ(two.size(), 2U);
    EXPECT_EQ(two[0].endMs, 230.0);    // 200 and the padding
    EXPECT_EQ(two[1].startMs, 270.0);  // 300 less the padding
}

}  // namespace
}  // namespace morva::cli
