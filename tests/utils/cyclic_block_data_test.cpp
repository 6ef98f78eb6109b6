#include "utils/cyclic_block_data.h"

#include <gtest/gtest.h>

#include <deque>

#include "support/random.h"

using MORVA::CONTAINERS::CyclicBlockData;
using test_support::Random;

namespace {

std::vector<float> unreadSamples(CyclicBlockData const& queue) {
    return {queue.readPosition(), queue.readPosition() + queue.unread()};
}

}  // namespace

// Any legal sequence of appends and reads leaves the same samples as a plain queue.
class QueueAgainstModel : public testing::TestWithParam<std::uint64_t> {};

TEST_P(QueueAgainstModel, HoldsTheSameSamples) {
    Random random(GetParam());
    TRACE_SEED(random);
    std::size_t const capacity = random.between(1, 300);
    CyclicBlockData queue(capacity);
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
        ASSERT_EQ(unreadSamples(queue), std::vector<float>(model.begin(), model.end()));
        ASSERT_LE(queue.start, queue.end);
        ASSERT_EQ(queue.data.size(), capacity + 1);
        ASSERT_EQ(queue.data.data(), storage);
    }
}

INSTANTIATE_TEST_SUITE_P(Seeds, QueueAgainstModel, testing::Range<std::uint64_t>(1, 21));

TEST(CyclicBlockData, StartsEmptyAndZero) {
    CyclicBlockData const queue(4);
    EXPECT_EQ(queue.data, std::vector<float>(5, 0.0f));
    EXPECT_EQ(queue.start, 0u);
    EXPECT_EQ(queue.end, 0u);
}

TEST(CyclicBlockData, CompactsOnlyWhenAnAppendDoesNotFit) {
    CyclicBlockData queue(4);
    std::vector<float> const samples{1, 2, 3, 4};
    queue.push_back(samples.data(), 3);
    queue.start = 2;
    queue.push_back(samples.data(), 2);  // ends exactly at the size
    EXPECT_EQ(queue.start, 2u);
    EXPECT_EQ(queue.end, 5u);
    queue.push_back(samples.data(), 1);
    EXPECT_EQ(queue.start, 0u);
    EXPECT_EQ(unreadSamples(queue), (std::vector<float>{3, 1, 2, 1}));
}

TEST(CyclicBlockData, SixteenBitSamplesKeepTheirValue) {
    CyclicBlockData queue(3);
    std::vector<short> const extremes{-32768, 0, 32767};
    queue.push_back(extremes.data(), extremes.size());
    EXPECT_EQ(unreadSamples(queue), (std::vector<float>{-32768.0f, 0.0f, 32767.0f}));
}
