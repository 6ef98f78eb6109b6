// The built-in filter against the library: the same number of samples at every call, the same
// samples to 90 dB and better, for white noise, which leaves no part of the band untested.
#include "utils/band_limited_interpolator.h"

#include <gtest/gtest.h>

#include <cmath>

#include "support/error_bound.h"
#include "support/library_resampler.h"
#include "support/random.h"
#include "utils/exception.h"

using MORVA::UTILS::BandLimitedInterpolator;
using test_support::ErrorBound;
using test_support::LibraryResampler;
using test_support::Random;
using test_support::relativeError;
using Block = std::vector<float>;

namespace {

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

}  // namespace

class Interpolator : public testing::TestWithParam<std::uint64_t> {};

TEST_P(Interpolator, DeliversWhatTheLibraryDelivers) {
    Random random(GetParam());
    TRACE_SEED(random);
    unsigned long const inRate = random.between(20, 1000);
    unsigned long const outRate = random.between(20, 1000);
    double const factor = static_cast<double>(outRate) / static_cast<double>(inRate);
    SCOPED_TRACE(testing::Message() << inRate << " -> " << outRate);
    BandLimitedInterpolator filter(inRate, outRate);
    LibraryResampler library(factor);
    Block all;
    Block allWanted;
    for (int call = 0; call < 60; ++call) {
        Block in = random.normal(random.between(0, call < 50 ? 1000 : 9000));
        Block const wanted = library.feed(in.data(), in.size());
        Block const got = feed(filter, in, 1 << 20);
        ASSERT_EQ(got.size(), wanted.size()) << "call " << call;
        all.insert(all.end(), got.begin(), got.end());
        allWanted.insert(allWanted.end(), wanted.begin(), wanted.end());
    }
    ErrorBound bound("difference to the library, relative", std::pow(10.0, -90.0 / 20.0));
    bound.add(relativeError(all, allWanted), 0.0);
}

// However little room a call offers, the stream is the same; a reset starts it anew.
TEST_P(Interpolator, RoomDoesNotChangeTheStream) {
    Random random(GetParam() + 100);
    TRACE_SEED(random);
    unsigned long const inRate = random.between(20, 1000);
    unsigned long const outRate = random.between(20, 1000);
    Block const in = random.normal(6000);
    BandLimitedInterpolator filter(inRate, outRate);
    Block const wanted = feed(filter, in, 1 << 20);
    for (int const room : {1, 7, 500}) {
        filter.reset();
        ASSERT_EQ(feed(filter, in, room), wanted) << "room " << room;
    }
}

INSTANTIATE_TEST_SUITE_P(Seeds, Interpolator, testing::Range<std::uint64_t>(1, 25));

TEST(Interpolator, StreamsOfOneRatioShareTheirFilter) {
    using MORVA::UTILS::InterpolationFilter;
    auto const first = InterpolationFilter::forRates(48000, 32000);
    EXPECT_EQ(InterpolationFilter::forRates(960, 640), first);
    EXPECT_NE(InterpolationFilter::forRates(640, 960), first);
}

TEST(Interpolator, RefusesAFilterBeyondMeasure) {
    EXPECT_THROW(BandLimitedInterpolator(4000037, 4000081), MORVA::UTILS::MORVA_Exception);
}
