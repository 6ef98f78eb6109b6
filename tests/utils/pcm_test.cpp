#include "kernels/pcm.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <vector>

#include "kernels/float_control.h"
#include "support/random.h"

using namespace MORVA::UTILS;
using Samples = std::vector<float>;

namespace {

// Floats of every kind: random bit patterns and the usual suspects.
Samples anyFloats() {
    test_support::Random random(1);
    float const nan = std::numeric_limits<float>::quiet_NaN();
    float const infinity = std::numeric_limits<float>::infinity();
    Samples values{nan,    -nan,     infinity, -infinity, 0.0f,      -0.0f,
                   1e-42f, 32767.0f, 32768.0f, -32768.0f, -32769.0f, 1.0f,
                   -1.0f,  12.9f,    -12.9f,   32767.5f,  3e38f};
    std::vector<std::uint32_t> patterns;
    for (int i = 0; i < 1000; ++i)
        patterns.push_back(static_cast<std::uint32_t>(
            random.between(0, std::numeric_limits<std::uint32_t>::max())));
    values.resize(values.size() + patterns.size());
    std::memcpy(values.data() + values.size() - patterns.size(), patterns.data(),
                4 * patterns.size());
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
    EXPECT_EQ(floats, Samples(all.begin(), all.end()));
    std::vector<short> back(all.size());
    floatToPcm16(floats, back);
    EXPECT_EQ(back, all);
}

// What is no sound is dropped, what is too loud limited; 16-bit samples are truncated.
TEST(Pcm, TakesAnyFloat) {
    Samples const in = anyFloats();
    Samples scaled(in.size());
    unitToPcm16Scale(in, scaled);
    Samples limited = in;
    clipToPcm16(limited);
    std::vector<short> shorts(in.size());
    floatToPcm16(in, shorts);
    for (std::size_t i = 0; i < in.size(); ++i) {
        SCOPED_TRACE(in[i]);
        float const finite = std::isfinite(in[i]) ? clipped(in[i], -1e6f, 1e6f) : 0.0f;
        ASSERT_EQ(scaled[i], std::abs(finite) < 1e-20f ? 0.0f : finite * 32768.0f);
        float const pcm = clipped(in[i], -32768.0f, 32767.0f);
        ASSERT_EQ(limited[i], pcm);
        ASSERT_EQ(shorts[i], static_cast<short>(pcm));
    }
}

TEST(FloatControl, HoldsForItsScopeOnly) {
    if (kFlushDenormals == 0) GTEST_SKIP() << "one mode only";
    float volatile tiny = 1e-39f;
    auto const denormalSurvives = [&] { return tiny * 1.0f != 0.0f; };
    auto const before = floatControl();
    {
        ScopedFloatControl const outer(Denormals::asZero);
        EXPECT_FALSE(denormalSurvives());
        {
            ScopedFloatControl const inner(Denormals::kept);
            EXPECT_TRUE(denormalSurvives());
        }
        EXPECT_FALSE(denormalSurvives());
    }
    EXPECT_EQ(floatControl(), before);
}
