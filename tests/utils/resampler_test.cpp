// The converter and the block-exact resampler on it against the bare library: the same number of
// samples at every call, the same samples to 90 dB and better, for white noise, which leaves no
// part of the band untested.
#include "resampler/resampler.h"

#include <gtest/gtest.h>
#include <libresample.h>

#include <algorithm>
#include <cmath>
#include <memory>

#include "resampler/band_limited_interpolator.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "utils/exception.h"

using namespace MORVA::UTILS;
using test_support::Random;
using test_support::relativeError;
using Block = std::vector<float>;

namespace {

constexpr unsigned long rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
double const tolerance = std::pow(10.0, -90.0 / 20.0);

void append(Block& all, Block const& block) {
    all.insert(all.end(), block.begin(), block.end());
}

// All that comes for one call's input. `process(input, its length, used, output, room)` never finds
// more room than `room`.
template <class Process>
Block feed(Block& in, int room, Process process) {
    Block out;
    Block piece(static_cast<std::size_t>(room));
    auto const size = static_cast<int>(in.size());
    int consumed = 0;
    int got = 1;
    while (got > 0 || (got == 0 && consumed < size)) {
        int used = 0;
        got = process(in.data() + consumed, size - consumed, used, piece.data(), room);
        consumed += used;
        out.insert(out.end(), piece.begin(), piece.begin() + std::max(got, 0));
    }
    return out;
}

Block feed(BandLimitedInterpolator& filter, Block& in, int room = 10000) {
    return feed(in, room, [&](float* from, int count, int& used, float* to, int most) {
        return filter.process(from, count, used, to, most);
    });
}

// One stream of the library. (Its clock is rounded anew at every call, so that the division into
// calls matters.)
class Library {
public:
    explicit Library(double factor)
        : factor_(factor), handle_(resample_open(1, factor, factor), &resample_close) {}

    Block feed(Block in) {
        auto const room = static_cast<int>(factor_ * static_cast<double>(in.size())) + 1024;
        return ::feed(in, room, [&](float* from, int count, int& used, float* to, int most) {
            return resample_process(handle_.get(), factor_, from, count, 0, &used, to, most);
        });
    }

private:
    double factor_;
    std::unique_ptr<void, decltype(&resample_close)> handle_;
};

}  // namespace

class Interpolator : public testing::TestWithParam<std::uint64_t> {};

// However little room a call offers, the stream is the same; a reset starts it anew.
TEST_P(Interpolator, DeliversWhatTheLibraryDeliversInAnyPortions) {
    Random random(GetParam());
    TRACE_SEED(random);
    unsigned long const inRate = random.between(20, 1000);
    unsigned long const outRate = random.between(20, 1000);
    BandLimitedInterpolator filter(inRate, outRate);
    Library library(static_cast<double>(outRate) / static_cast<double>(inRate));
    Block all;
    Block wanted;
    for (int call = 0; call < 60; ++call) {
        Block in = random.normal(random.between(0, call < 50 ? 1000 : 9000));
        append(wanted, library.feed(in));
        append(all, feed(filter, in));
        ASSERT_EQ(all.size(), wanted.size()) << "call " << call;
    }
    EXPECT_LT(relativeError(all, wanted), tolerance);

    Block in = random.normal(6000);
    filter.reset();
    Block const whole = feed(filter, in);
    for (int const room : {1, 7, 500}) {
        filter.reset();
        ASSERT_EQ(feed(filter, in, room), whole) << "room " << room;
    }
}
INSTANTIATE_TEST_SUITE_P(Seeds, Interpolator, testing::Range<std::uint64_t>(1, 25));

class RatePair : public testing::TestWithParam<std::tuple<unsigned long, unsigned long>> {};

// Every block has its exact length; the stream is the library's, shifted by the leading zeros; a
// reset begins it anew, bit for bit.
TEST_P(RatePair, BlocksAreTheLibrarysStreamAfterTheLeadingZeros) {
    auto const [inRate, outRate] = GetParam();
    for (unsigned long const ms : {10, 20, 30, 40}) {
        std::size_t const inBlock = inRate * ms / 1000;
        std::size_t const outBlock = outRate * ms / 1000;
        SCOPED_TRACE(testing::Message() << ms << " ms, " << inBlock << " -> " << outBlock);
        Random random(inBlock * 5000 + outBlock);
        std::vector<Block> blocks(12);
        for (auto& block : blocks) block = random.normal(inBlock, 3000.0f);
        Resampler resampler(inRate, outRate);
        auto const convert = [&] {
            Block all;
            for (Block block : blocks) {
                resampler.resample(block, block);  // one vector for both
                EXPECT_EQ(block.size(), outBlock);
                append(all, block);
            }
            return all;
        };
        Block const out = convert();
        Library library(static_cast<double>(outBlock) / static_cast<double>(inBlock));
        Block wanted;
        for (auto const& block : blocks) {
            if (inBlock != outBlock) append(wanted, library.feed(block));
            if (inBlock == outBlock) append(wanted, block);
            if (&block != &blocks.front()) continue;
            std::size_t const zeros = inBlock == outBlock ? 0 : outBlock + 1 - wanted.size();
            EXPECT_EQ(resampler.leadingZeros(inBlock), zeros);
            wanted.insert(wanted.begin(), zeros, 0.0f);
        }
        ASSERT_GE(wanted.size(), out.size());
        wanted.resize(out.size());
        EXPECT_LT(relativeError(out, wanted), inBlock == outBlock ? 1e-30 : tolerance);
        EXPECT_TRUE(resampler.reset());
        EXPECT_EQ(convert(), out);
    }
}
INSTANTIATE_TEST_SUITE_P(AllRates, RatePair,
                         testing::Combine(testing::ValuesIn(rates), testing::ValuesIn(rates)));

TEST(Resampler, StreamingGivesTheBareStreamUntilTheOutputIsFull) {
    Block in = Random(11).normal(4800);
    Block out(2000);
    Resampler resampler(48000, 16000);
    out.resize(static_cast<std::size_t>(resampler.resample(in.data(), 4800, out.data(), 2000)));
    EXPECT_LT(relativeError(out, Library(1.0 / 3.0).feed(in)), 1e-6);
    out.assign(101, -1.0f);
    EXPECT_EQ(resampler.resample(in.data(), 4800, out.data(), 100), 100);
    EXPECT_EQ(out.back(), -1.0f);
}

TEST(Resampler, RefusesWhatItCannotConvertAndSharesFilters) {
    for (auto const& [in, out] :
         {std::pair(0, 160), std::pair(160, 0), std::pair(1, 1000000), std::pair(1000000, 1)}) {
        EXPECT_THROW(Resampler(in, out), MORVA_Exception) << in << " -> " << out;
    }
    // Three rows of 40 coefficients per phase: 14.4 MiB, and 19.2 MiB.
    EXPECT_NO_THROW(BandLimitedInterpolator(31489, 31490));
    EXPECT_THROW(BandLimitedInterpolator(41999, 42000), MORVA_Exception);
    auto const first = InterpolationFilter::forRates(48000, 32000);
    EXPECT_EQ(InterpolationFilter::forRates(960, 640), first);
    EXPECT_NE(InterpolationFilter::forRates(640, 960), first);
}
