#include <gtest/gtest.h>

#include <deque>

#include "support/random.h"
#include "utils/cyclic_block_data.h"
#include "utils/noise.h"

using test_support::Random;

// Any legal sequence of appends and reads leaves the same samples as a plain queue, in the memory
// of the start.
TEST(CyclicBlockData, HoldsTheSamplesOfAPlainQueue) {
    for (std::uint64_t seed = 1; seed <= 20; ++seed) {
        Random random(seed);
        TRACE_SEED(random);
        std::size_t const capacity = random.between(1, 300);
        MORVA::CONTAINERS::CyclicBlockData queue(capacity);
        float const* const storage = queue.data.data();
        std::deque<float> model;
        for (int step = 0; step < 400; ++step) {
            std::size_t const n = random.between(0, capacity + 1 - queue.unread());
            std::vector<float> const floats = random.normal(n);
            std::vector<short> const shorts = random.pcm16(n);
            switch (random.between(0, 3)) {
                case 0:
                    EXPECT_EQ(queue.push_back(floats.data(), n), 0);
                    model.insert(model.end(), floats.begin(), floats.end());
                    break;
                case 1:
                    EXPECT_EQ(queue.push_back(shorts.data(), n), 0);
                    model.insert(model.end(), shorts.begin(), shorts.end());
                    break;
                case 2:
                    EXPECT_EQ(queue.push_backNULL(n), 0);
                    model.insert(model.end(), n, 0.0f);
                    break;
                default:
                    std::size_t const hop = random.between(0, queue.unread());
                    queue.start += hop;
                    model.erase(model.begin(), model.begin() + static_cast<std::ptrdiff_t>(hop));
            }
            auto const* const read = queue.readPosition();
            ASSERT_EQ(std::deque<float>(read, read + queue.unread()), model);
            ASSERT_EQ(queue.data.data(), storage);
        }
    }
}

// Taking the oldest frame out of the mean leaves it in the history, so a following exchange takes
// it out once more.
TEST(Noise, TheOldestFrameCanBeTakenOutTwice) {
    MORVA::UTILS::Noise noise(2, 1);
    noise.fillWithSilence();
    for (float const value : {4.0f, 8.0f}) {
        noise.addFrameNoiseRemoveBack(&value, 1);
        noise.calculateNoise();
    }
    EXPECT_EQ(noise.mean.front(), 6.0f);
    noise.removeBackFrameInfoFromMean();
    EXPECT_EQ(noise.mean.front(), 4.0f);
    noise.addNullFrameNoiseRemoveBack();
    noise.calculateNoise();
    EXPECT_EQ(noise.mean.front(), 2.0f);
    EXPECT_EQ(noise.frames.size(), 2u);
}
