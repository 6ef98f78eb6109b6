#include "utils/resampler.h"

#include <gtest/gtest.h>

#include <cmath>
#include <numbers>
#include <span>

#include "support/error_bound.h"
#include "support/library_resampler.h"
#include "support/random.h"
#include "utils/exception.h"

using MORVA::UTILS::MORVA_Exception;
using MORVA::UTILS::Resampler;
using test_support::ErrorBound;
using test_support::LibraryResampler;
using test_support::Random;
using test_support::relativeError;
using Block = std::vector<float>;

namespace {

constexpr unsigned long rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
constexpr unsigned long durations[] = {10, 20, 30, 40};  // ms
constexpr int blocks = 12;

// Drives the stream block by block and checks each block's length.
Block convert(Resampler& resampler, Block const& in, std::size_t inBlock, std::size_t outBlock) {
    Block all;
    Block out;
    for (std::size_t at = 0; at < in.size(); at += inBlock) {
        resampler.resample({in.begin() + static_cast<std::ptrdiff_t>(at),
                            in.begin() + static_cast<std::ptrdiff_t>(at + inBlock)},
                           out);
        EXPECT_EQ(out.size(), outBlock) << "at sample " << at;
        all.insert(all.end(), out.begin(), out.end());
    }
    return all;
}

}  // namespace

class RatePair : public testing::TestWithParam<std::tuple<unsigned long, unsigned long>> {
protected:
    unsigned long inRate() const { return std::get<0>(GetParam()); }
    unsigned long outRate() const { return std::get<1>(GetParam()); }
};

// Every block has its exact length; the stream is the library's, shifted by the leading zeros; a
// reset begins it anew, bit for bit.
TEST_P(RatePair, BlocksAreTheLibrarysStreamAfterTheLeadingZeros) {
    for (unsigned long const ms : durations) {
        std::size_t const inBlock = inRate() * ms / 1000;
        std::size_t const outBlock = outRate() * ms / 1000;
        SCOPED_TRACE(testing::Message() << ms << " ms, " << inBlock << " -> " << outBlock);
        Random random(inBlock * 5000 + outBlock);
        Block in = random.normal(inBlock * blocks, 3000.0f);

        Resampler resampler(inBlock, outBlock);
        EXPECT_EQ(resampler.ratio(), static_cast<double>(outBlock) / static_cast<double>(inBlock));
        Block const out = convert(resampler, in, inBlock, outBlock);
        std::size_t const zeros = resampler.leadingZeros(inBlock);
        if (inBlock == outBlock) {
            EXPECT_EQ(out, in);
            EXPECT_EQ(zeros, 0u);
            continue;
        }
        LibraryResampler library(resampler.ratio());
        Block wanted;
        for (std::size_t at = 0; at < in.size(); at += inBlock) {
            Block const stream = library.feed(in.data() + at, inBlock);
            if (at == 0) {
                ASSERT_EQ(zeros, outBlock + 1 - stream.size());
                wanted.resize(zeros);
            }
            wanted.insert(wanted.end(), stream.begin(), stream.end());
        }
        ASSERT_GE(wanted.size(), out.size());
        wanted.resize(out.size());
        ErrorBound bound("difference to the library, relative", std::pow(10.0, -90.0 / 20.0));
        bound.add(relativeError(out, wanted), 0.0);

        EXPECT_TRUE(resampler.reset());
        EXPECT_EQ(convert(resampler, in, inBlock, outBlock), out);
    }
}

// A tone inside both bands keeps its level and arrives late by exactly the leading zeros.
TEST_P(RatePair, ATonePassesWithTheReportedDelay) {
    std::size_t const inBlock = inRate() / 100;
    std::size_t const outBlock = outRate() / 100;
    double const hertz = 0.2 * static_cast<double>(std::min(inRate(), outRate()));
    double const step = 2.0 * std::numbers::pi * hertz;
    Block in(inBlock * blocks);
    for (std::size_t i = 0; i < in.size(); ++i) {
        in[i] = static_cast<float>(
            10000.0 * std::sin(step * static_cast<double>(i) / static_cast<double>(inRate())));
    }
    Resampler resampler(inBlock, outBlock);
    Block const out = convert(resampler, in, inBlock, outBlock);
    std::size_t const zeros = resampler.leadingZeros(inBlock);
    Block wanted(out.size());
    for (std::size_t i = zeros; i < out.size(); ++i) {
        wanted[i] = static_cast<float>(10000.0 * std::sin(step * static_cast<double>(i - zeros) /
                                                          static_cast<double>(outRate())));
    }
    std::size_t const settled = 4 * outBlock;  // behind the start of the tone
    ErrorBound bound("tone error, relative", 3e-4);
    bound.add(relativeError(std::span(out).subspan(settled), std::span(wanted).subspan(settled)),
              0.0);
}

INSTANTIATE_TEST_SUITE_P(AllRates, RatePair,
                         testing::Combine(testing::ValuesIn(rates), testing::ValuesIn(rates)));

TEST(Resampler, OneVectorMayBeInputAndOutput) {
    for (std::size_t const outBlock : {160u, 480u, 80u}) {
        Random random(outBlock);
        Resampler apart(160, outBlock);
        Resampler inPlace(160, outBlock);
        for (int i = 0; i < 5; ++i) {
            Block const in = random.normal(160);
            Block out;
            Block both = in;
            EXPECT_EQ(apart.resample(in, out), inPlace.resample(both, both));
            EXPECT_EQ(both, out);
        }
    }
}

TEST(Resampler, ReturnsWhatTheFilterDelivered) {
    Resampler resampler(160, 480);
    Block out;
    unsigned const first = resampler.resample(Block(160), out);
    EXPECT_EQ(first, 480 + 1 - resampler.leadingZeros(160));
    EXPECT_EQ(resampler.resample(Block(160), out), 480u);
    EXPECT_EQ(Resampler(160, 160).resample(Block(99), out), 99u);
}

TEST(Resampler, StreamingGivesTheBareStream) {
    Random random(11);
    Block in = random.normal(4800);
    Block out(2000);
    Resampler resampler(48000, 16000);
    int const produced = resampler.resample(in.data(), 4800, out.data(), 2000);
    Block const wanted = LibraryResampler(1.0 / 3.0).feed(in.data(), in.size());
    ASSERT_EQ(static_cast<std::size_t>(produced), wanted.size());
    out.resize(wanted.size());
    EXPECT_LT(relativeError(out, wanted), 1e-6);
}

TEST(Resampler, StreamingStopsWhenTheOutputIsFull) {
    Block in(4800, 1.0f);
    Block out(101, -1.0f);
    Resampler resampler(48000, 16000);
    EXPECT_EQ(resampler.resample(in.data(), 4800, out.data(), 100), 100);
    EXPECT_EQ(out.back(), -1.0f);
}

TEST(Resampler, RefusesRatesItCannotConvert) {
    EXPECT_THROW(Resampler(0, 160), MORVA_Exception);
    EXPECT_THROW(Resampler(160, 0), MORVA_Exception);
    EXPECT_THROW(Resampler(0, 0), MORVA_Exception);
    EXPECT_THROW(Resampler(1, 1000000), MORVA_Exception);
    EXPECT_THROW(Resampler(1000000, 1), MORVA_Exception);
}
