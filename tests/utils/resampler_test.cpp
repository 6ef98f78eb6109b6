#include "utils/resampler.h"

#include <gtest/gtest.h>
#include <libresample.h>

#include <cmath>
#include <memory>
#include <numbers>

#include "support/error_bound.h"
#include "support/random.h"
#include "utils/exception.h"

using MORVA::UTILS::MORVA_Exception;
using MORVA::UTILS::Resampler;
using test_support::ErrorBound;
using test_support::Random;
using Block = std::vector<float>;

namespace {

constexpr unsigned long rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
constexpr unsigned long durations[] = {10, 20, 30, 40};  // ms
constexpr int blocks = 12;

// The bare stream of the library, without padding or hold-over. It takes the input in the same
// blocks, since the library's clock is rounded anew at every call.
Block libraryStream(double factor, Block in, std::size_t inBlock) {
    std::unique_ptr<void, decltype(&resample_close)> const handle(resample_open(1, factor, factor),
                                                                  &resample_close);
    Block out(static_cast<std::size_t>(factor * static_cast<double>(in.size())) + 1024);
    std::size_t consumed = 0;
    std::size_t produced = 0;
    for (std::size_t at = 0; at < in.size(); at += inBlock) {
        int got = 1;
        while (got > 0 || consumed < at + inBlock) {
            int used = 0;
            got = resample_process(handle.get(), factor, in.data() + consumed,
                                   static_cast<int>(at + inBlock - consumed), 0, &used,
                                   out.data() + produced, static_cast<int>(out.size() - produced));
            consumed += static_cast<std::size_t>(used);
            produced += static_cast<std::size_t>(std::max(got, 0));
        }
    }
    out.resize(produced);
    return out;
}

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
        Block const in = random.normal(inBlock * blocks, 3000.0f);

        Resampler resampler(inBlock, outBlock);
        EXPECT_EQ(resampler.ratio(), static_cast<double>(outBlock) / static_cast<double>(inBlock));
        Block const out = convert(resampler, in, inBlock, outBlock);
        std::size_t const zeros = resampler.leadingZeros(inBlock);
        if (inBlock == outBlock) {
            EXPECT_EQ(out, in);
            EXPECT_EQ(zeros, 0u);
            continue;
        }
        ASSERT_GT(zeros, 0u);
        ASSERT_LT(zeros, outBlock);
        Block wanted(zeros, 0.0f);
        Block const stream = libraryStream(resampler.ratio(), in, inBlock);
        wanted.insert(wanted.end(), stream.begin(), stream.end());
        ASSERT_GE(wanted.size(), out.size());
        wanted.resize(out.size());
        ASSERT_EQ(out, wanted);

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
    double error = 0.0;
    double signal = 0.0;
    for (std::size_t i = 4 * outBlock; i < out.size(); ++i) {  // behind the start of the tone
        double const wanted = 10000.0 * std::sin(step * static_cast<double>(i - zeros) /
                                                 static_cast<double>(outRate()));
        error += (out[i] - wanted) * (out[i] - wanted);
        signal += wanted * wanted;
    }
    ErrorBound bound("tone error, relative", 3e-4);
    bound.add(std::sqrt(error / signal), 0.0);
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
    ASSERT_GT(produced, 1000);
    out.resize(static_cast<std::size_t>(produced));
    EXPECT_EQ(out, libraryStream(1.0 / 3.0, in, in.size()));
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
}
