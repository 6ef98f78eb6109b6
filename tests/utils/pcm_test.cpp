#include "kernels/pcm.h"

#include <gtest/gtest.h>

#include <array>
#include <bit>
#include <cmath>
#include <limits>
#include <vector>

#include "kernels/float_control.h"
#include "support/random.h"

using namespace MORVA::UTILS;
using test_support::Random;
using Samples = std::vector<float>;

namespace {

constexpr float nan = std::numeric_limits<float>::quiet_NaN();
constexpr float infinity = std::numeric_limits<float>::infinity();

// Floats of every kind: random bit patterns and the usual suspects.
Samples anyFloats(std::uint64_t seed) {
    Random random(seed);
    Samples values{nan,    -nan,     infinity, -infinity, 0.0f,      -0.0f,
                   1e-42f, 32767.0f, 32768.0f, -32768.0f, -32769.0f, 1.0f,
                   -1.0f,  12.9f,    -12.9f,   32767.5f,  3e38f};
    for (int i = 0; i < 1000; ++i) {
        values.push_back(std::bit_cast<float>(static_cast<std::uint32_t>(
            random.between(0, std::numeric_limits<std::uint32_t>::max()))));
    }
    for (float const value : random.normal(1000, 20000.0f)) values.push_back(value);
    return values;
}

float clipped(float x, float low, float high) {
    return std::isnan(x) ? 0.0f : std::min(std::max(x, low), high);
}

}  // namespace

TEST(Pcm, SixteenBitSamplesGoThereAndBack) {
    std::vector<short> all;
    for (int v = -32768; v <= 32767; ++v) all.push_back(static_cast<short>(v));
    Samples floats(all.size());
    pcm16ToFloat(all, floats);
    for (std::size_t i = 0; i < all.size(); ++i) ASSERT_EQ(floats[i], static_cast<float>(all[i]));
    std::vector<short> back(all.size());
    floatToPcm16(floats, back);
    EXPECT_EQ(back, all);
}

TEST(Pcm, UnitScaleDropsWhatIsNoSoundAndBoundsWhatIsTooLoud) {
    Samples const in = anyFloats(1);
    Samples out(in.size());
    unitToPcm16Scale(in, out);
    for (std::size_t i = 0; i < in.size(); ++i) {
        float const wanted = std::isfinite(in[i]) ? clipped(in[i], -1e6f, 1e6f) : 0.0f;
        ASSERT_EQ(out[i], wanted * 32768.0f) << in[i];
    }
}

TEST(Pcm, ClippingKeepsTheSixteenBitRange) {
    Samples const in = anyFloats(2);
    Samples out = in;
    clipToPcm16(out);
    for (std::size_t i = 0; i < in.size(); ++i) {
        ASSERT_EQ(out[i], clipped(in[i], -32768.0f, 32767.0f)) << in[i];
    }
}

TEST(Pcm, ConversionTruncatesAndSaturates) {
    Samples const in = anyFloats(3);
    std::vector<short> out(in.size());
    floatToPcm16(in, out);
    for (std::size_t i = 0; i < in.size(); ++i) {
        ASSERT_EQ(out[i], static_cast<short>(std::trunc(clipped(in[i], -32768.0f, 32767.0f))))
            << in[i];
    }
}

TEST(FloatControl, HoldsForItsScopeOnly) {
    float volatile tiny = 1e-39f;
    auto const denormalSurvives = [&] { return tiny * 1.0f != 0.0f; };
    unsigned const before = _mm_getcsr();
    {
        ScopedFloatControl const outer(Denormals::asZero);
        EXPECT_FALSE(denormalSurvives());
        {
            ScopedFloatControl const inner(Denormals::kept);
            EXPECT_TRUE(denormalSurvives());
        }
        EXPECT_FALSE(denormalSurvives());
    }
    EXPECT_EQ(_mm_getcsr(), before);
}
