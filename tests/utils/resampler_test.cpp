// The block-exact resampler against the bare library: the same samples to 90 dB and better, for
// white noise, which leaves no part of the band untested.
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

constexpr std::size_t rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
double const tolerance = std::pow(10.0, -90.0 / 20.0);

void append(Block& all, Block const& block) {
    all.insert(all.end(), block.begin(), block.end());
}

// One stream of the library. (Its clock is rounded anew at every call, so that the division into
// calls matters.)
class Library {
public:
    explicit Library(double factor)
        : factor_(factor), handle_(resample_open(1, factor, factor), &resample_close) {}

    Block feed(Block in) {
        Block out;
        Block piece(static_cast<std::size_t>(factor_ * static_cast<double>(in.size())) + 1024);
        auto const size = static_cast<int>(in.size());
        auto const room = static_cast<int>(piece.size());
        int consumed = 0;
        for (int got = 1; got > 0 || consumed < size;) {
            int used = 0;
            got = resample_process(handle_.get(), factor_, in.data() + consumed, size - consumed, 0,
                                   &used, piece.data(), room);
            if (got < 0) break;
            consumed += used;
            out.insert(out.end(), piece.begin(), piece.begin() + got);
        }
        return out;
    }

private:
    double factor_;
    std::unique_ptr<void, decltype(&resample_close)> handle_;
};

}  // namespace

class RatePair : public testing::TestWithParam<std::tuple<std::size_t, std::size_t>> {};

// Every block has its exact length; the stream is the library's, shifted by the leading zeros; a
// reset begins it anew, bit for bit.
TEST_P(RatePair, BlocksAreTheLibrarysStreamAfterTheLeadingZeros) {
    auto const [inRate, outRate] = GetParam();
    for (std::size_t const ms : {10, 20, 30, 40}) {
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

TEST(Resampler, RefusesWhatItCannotConvert) {
    for (auto const& [in, out] :
         {std::pair(0, 160), std::pair(160, 0), std::pair(1, 1000000), std::pair(1000000, 1)}) {
        EXPECT_THROW(Resampler(in, out), MORVA_Exception) << in << " -> " << out;
    }
    // Three rows of 40 coefficients per phase: 14.4 MiB, and 19.2 MiB.
    EXPECT_NO_THROW(BandLimitedInterpolator(31489, 31490));
    EXPECT_THROW(BandLimitedInterpolator(41999, 42000), MORVA_Exception);
}
