#include "utils/noise.h"

#include <gtest/gtest.h>

#include "support/error_bound.h"
#include "support/random.h"
#include "utils/exception.h"

using MORVA::UTILS::Noise;
using test_support::ErrorBound;
using test_support::Random;
using Frame = std::vector<float>;

namespace {

Noise prefilled(std::size_t K, std::size_t frameSize) {
    Noise noise(K, frameSize);
    for (std::size_t i = 0; i < K; ++i) noise.addNullFrameNoise();
    return noise;
}

void push(Noise& noise, Frame const& frame) {
    noise.addFrameNoiseRemoveBack(frame.data(), frame.size());
    noise.calculateNoise();
}

}  // namespace

TEST(Noise, IsTheMeanOfTheLastFrames) {
    Random random(3);
    TRACE_SEED(random);
    ErrorBound bound("noise mean", 2e-5);
    for (int shape = 0; shape < 10; ++shape) {
        std::size_t const K = random.between(1, 12);
        std::size_t const size = random.between(1, 40);
        Noise noise = prefilled(K, size);
        std::vector<Frame> history(K, Frame(size));
        for (int step = 0; step < 100; ++step) {
            if (random.chance(0.1)) {
                noise.addNullFrameNoiseRemoveBack();
                noise.calculateNoise();
                history.emplace_back(size);
            } else {
                history.push_back(random.normal(size, 10.0f));
                push(noise, history.back());
            }
            ASSERT_EQ(noise.frames.size(), K);
            for (std::size_t i = 0; i < size; ++i) {
                double sum = 0.0;
                for (std::size_t k = 1; k <= K; ++k) sum += history[history.size() - k][i];
                bound.add(noise.mean[i], sum / static_cast<double>(K));
            }
        }
    }
}

TEST(Noise, AConstantFrameFillsTheMeanStepByStep) {
    Noise noise = prefilled(4, 1);
    for (float const wanted : {2.0f, 4.0f, 6.0f, 8.0f, 8.0f}) {
        push(noise, {8.0f});
        EXPECT_EQ(noise.mean.front(), wanted);
    }
}

TEST(Noise, PushingAloneLeavesTheMean) {
    Noise noise = prefilled(2, 2);
    Frame const frame{4.0f, 6.0f};
    auto const newest = noise.addFrameNoise(frame.data(), 2);
    EXPECT_EQ(newest, noise.frames.begin());
    EXPECT_EQ(*newest, frame);
    EXPECT_EQ(noise.mean, (Frame{0.0f, 0.0f}));
    EXPECT_EQ(noise.frames.size(), 3u);
}

// Taking the oldest frame out of the mean leaves it in the history, so a following exchange takes
// it out once more.
TEST(Noise, TheOldestFrameCanBeTakenOutTwice) {
    Noise noise = prefilled(1, 1);
    push(noise, {5.0f});
    noise.removeBackFrameInfoFromMean();
    EXPECT_EQ(noise.mean.front(), 0.0f);
    EXPECT_EQ(noise.frames.size(), 1u);
    push(noise, {1.0f});
    EXPECT_EQ(noise.mean.front(), -4.0f);
}

TEST(Noise, WithoutValuesOnlyTheHistoryMoves) {
    Noise noise = prefilled(3, 0);
    push(noise, {});
    EXPECT_EQ(noise.frames.size(), 3u);
    EXPECT_TRUE(noise.mean.empty());
}

TEST(Noise, RefusesAnEmptyWindow) {
    EXPECT_THROW(Noise(0, 4), MORVA::UTILS::MORVA_Exception);
}
