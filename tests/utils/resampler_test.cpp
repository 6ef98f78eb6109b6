// The converter and the block-exact resampler on it against the bare library: the same number of
// samples at every call, the same samples to 90 dB and better, for white noise, which leaves no
// part of the band untested.
#include "resampler/resampler.h"

#include <gtest/gtest.h>

#include <cmath>

#include "resampler/band_limited_interpolator.h"
#include "support/error_bound.h"
#include "support/library_resampler.h"
#include "support/random.h"
#include "utils/exception.h"

using MORVA::UTILS::BandLimitedInterpolator;
using MORVA::UTILS::InterpolationFilter;
using MORVA::UTILS::MORVA_Exception;
using MORVA::UTILS::Resampler;
using test_support::LibraryResampler;
using test_support::Random;
using test_support::relativeError;
using Block = std::vector<float>;

namespace {

constexpr unsigned long rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
constexpr int blocks = 12;
double const tolerance = std::pow(10.0, -90.0 / 20.0);

void append(Block& all, Block const& block) {
    all.insert(all.end(), block.begin(), block.end());
}

// Feeds one call's input, never offering more room than `room` at a time.
Block feed(BandLimitedInterpolator& filter, Block const& in, int room) {
    Block out;
    Block piece(static_cast<std::size_t>(room));
    int consumed = 0;
    int got = 1;
    while (got > 0 || consumed < static_cast<int>(in.size())) {
        int used = 0;
        got = filter.process(in.data() + consumed, static_cast<int>(in.size()) - consumed, used,
                             piece.data(), room);
        consumed += used;
        out.insert(out.end(), piece.begin(), piece.begin() + got);
    }
    return out;
}

// Drives the stream block by block and checks each block's length.
Block convert(Resampler& resampler, Block const& in, std::size_t inBlock, std::size_t outBlock) {
    Block all;
    Block block;
    for (auto at = in.begin(); at != in.end(); at += static_cast<std::ptrdiff_t>(inBlock)) {
        block.assign(at, at + static_cast<std::ptrdiff_t>(inBlock));
        resampler.resample(block, block);  // one vector for both
        EXPECT_EQ(block.size(), outBlock) << "at sample " << at - in.begin();
        append(all, block);
    }
    return all;
}

}  // namespace

class Interpolator : public testing::TestWithParam<std::uint64_t> {};

// However little room a call offers, the stream is the same; a reset starts it anew.
TEST_P(Interpolator, DeliversWhatTheLibraryDeliversInAnyPortions) {
    Random random(GetParam());
    TRACE_SEED(random);
    unsigned long const inRate = random.between(20, 1000);
    unsigned long const outRate = random.between(20, 1000);
    SCOPED_TRACE(testing::Message() << inRate << " -> " << outRate);
    BandLimitedInterpolator filter(inRate, outRate);
    LibraryResampler library(static_cast<double>(outRate) / static_cast<double>(inRate));
    Block all;
    Block wanted;
    for (int call = 0; call < 60; ++call) {
        Block in = random.normal(random.between(0, call < 50 ? 1000 : 9000));
        append(wanted, library.feed(in.data(), in.size()));
        append(all, feed(filter, in, 1 << 20));
        ASSERT_EQ(all.size(), wanted.size()) << "call " << call;
    }
    EXPECT_LT(relativeError(all, wanted), tolerance);

    Block const in = random.normal(6000);
    filter.reset();
    Block const whole = feed(filter, in, 1 << 20);
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
        Block in = random.normal(inBlock * blocks, 3000.0f);

        Resampler resampler(inBlock, outBlock);
        Block const out = convert(resampler, in, inBlock, outBlock);
        std::size_t const zeros = resampler.leadingZeros(inBlock);
        if (inBlock == outBlock) {
            EXPECT_EQ(out, in);
            EXPECT_EQ(zeros, 0u);
            continue;
        }
        LibraryResampler library(static_cast<double>(outBlock) / static_cast<double>(inBlock));
        Block wanted;
        for (std::size_t at = 0; at < in.size(); at += inBlock) {
            Block const stream = library.feed(in.data() + at, inBlock);
            if (at == 0) {
                ASSERT_EQ(zeros, outBlock + 1 - stream.size());
                wanted.resize(zeros);
            }
            append(wanted, stream);
        }
        ASSERT_GE(wanted.size(), out.size());
        wanted.resize(out.size());
        EXPECT_LT(relativeError(out, wanted), tolerance);

        EXPECT_TRUE(resampler.reset());
        EXPECT_EQ(convert(resampler, in, inBlock, outBlock), out);
    }
}

INSTANTIATE_TEST_SUITE_P(AllRates, RatePair,
                         testing::Combine(testing::ValuesIn(rates), testing::ValuesIn(rates)));

TEST(Resampler, StreamingGivesTheBareStreamUntilTheOutputIsFull) {
    Block in = Random(11).normal(4800);
    Block out(2000);
    Resampler resampler(48000, 16000);
    out.resize(static_cast<std::size_t>(resampler.resample(in.data(), 4800, out.data(), 2000)));
    EXPECT_LT(relativeError(out, LibraryResampler(1.0 / 3.0).feed(in.data(), in.size())), 1e-6);
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
