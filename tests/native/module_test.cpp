// The host module without script: start-up, also when memory runs out, and entry points.
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "morva-sdk/morva-sdk.h"
#include "native_modules/quorral_valto/src/valto_wrapper/entry_points.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"
#include "native_modules/quorral_valto/src/valto_wrapper/util.h"
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"
#include "support/allocation_counter.h"

namespace quorral {
namespace {

using test_support::failingAllocation;
using test_support::heldBytes;

// First, since an engine that once was leaves the result of its start-up.
TEST(StartUpTest, AnOldProcessorIsRefusedWithItsLineBeforeTheEngineExists) {
    const std::string refusal = "Failed to initialize Morva SDK: CPU does not support ";
    const auto refuse = [&](CpuFeatureQuery query, int code, const char* missing) {
        testing::internal::CaptureStdout();
        EXPECT_EQ(ValtoInitialize(query), code);
        EXPECT_EQ(testing::internal::GetCapturedStdout(), refusal + missing);
        EXPECT_EQ(ValtoNCSetup(16000, 10), nullptr);
        EXPECT_EQ(OpenNcSession(16000, 10, {}).status, OpenStatus::kNotInitialized);
    };
    refuse([] { return CpuFeatures{.sse41 = false, .avx2 = false}; }, -1, "SSE 4.1\n");
    refuse([] { return CpuFeatures{.sse41 = true, .avx2 = false}; }, -2, "AVX2\n");
}

TEST(TextTest, BothDirectionsAgreeOnlyWithinTheBasicPlane) {
    const std::string text = "/home/J\u00fcrgen \u4f60\u597d/\u0416";
    EXPECT_EQ(util::ToUTF8(util::ToUTF16(text)), text);
    const std::wstring units = util::ToUTF16("a\xF0\x9F\x98\x80");
    EXPECT_EQ(units, (std::wstring{L'a', wchar_t{0xD83D}, wchar_t{0xDE00}}));
    EXPECT_EQ(util::ToUTF8(std::wstring{wchar_t{0x1F600}}), "\xF0\x9F\x98\x80");
    EXPECT_THROW(util::ToUTF16("\xC3("), std::range_error);
}

// The module as it was before its start-up.
void ForgetEngine() {
    Morva_SDK_GlobalDestroy();
    gNcModels = {};
    gNcModel = {};
    gVadModels = {};
    gVadModel = {};
}

class EntryPointsTest : public testing::Test {
protected:
    void SetUp() override { ASSERT_EQ(ValtoInitialize(), 0); }
    void TearDown() override { ForgetEngine(); }
};

TEST_F(EntryPointsTest, ModelRateAndDurationOfASetUp) {
    const auto setUp = [](int rateHz, int durationMs) {
        testing::internal::CaptureStdout();
        EXPECT_NE(ValtoNCSetup(rateHz, durationMs), nullptr);
        return testing::internal::GetCapturedStdout();
    };
    const std::string model = "Setting Valto model: ";
    EXPECT_EQ(setUp(8000, 10), model + "small_NC_8k\n");
    EXPECT_EQ(setUp(16000, 30), model + "small_NC\n");
    EXPECT_EQ(setUp(24000, 40), model + "full_NC-ca03f4\n");
    EXPECT_EQ(setUp(0, 0), model +
                               "small_NC_8k\n"
                               "The input sampling rate 0 is not supported; using default: 16000\n"
                               "The input frame duration 0 is not supported; using default: 10\n");
    for (const auto& [rateHz, durationMs] : {std::pair{192000, 10}, {48000, 15}, {48000, 32}}) {
        EXPECT_EQ(ValtoNCSetup(rateHz, durationMs), nullptr) << rateHz << ' ' << durationMs;
    }
    gNcModel = "small_NC";
    EXPECT_EQ(setUp(48000, 10), model + "small_NC\n");
}

TEST_F(EntryPointsTest, Codes) {
    void* const cleaner = ValtoNCSetup(16000, 10);
    void* const detector = ValtoVADSetup(16000, 10);
    std::vector<short> frame(160, 1000);
    const auto clean = [&](void* session, unsigned inputSize, unsigned outputSize) {
        return ValtoNCProcess(session, frame.data(), inputSize, frame.data(), outputSize);
    };
    EXPECT_EQ(clean(cleaner, 159, 160), 1);
    EXPECT_EQ(clean(cleaner, 160, 159), 1);
    EXPECT_EQ(clean(detector, 160, 160), 2);
    EXPECT_EQ(ValtoVADProcess(detector, frame.data(), 161), -3.0F);
    EXPECT_EQ(ValtoVADProcess(cleaner, frame.data(), 160), -4.0F);
    EXPECT_EQ(ValtoNCReset(detector), -3);
    EXPECT_EQ(ValtoNCReset(cleaner), 0);
    EXPECT_EQ(ValtoVADReset(cleaner), -3);
    EXPECT_EQ(ValtoVADReset(detector), 0);
}

// Fails the first, second, ... allocation of a start-up until it gets by without reaching it.
TEST(MemoryTest, StartUpNamesTheStepAtWhichItRanOutAndKeepsNothing) {
    std::vector<int> codes;
    int failures = 0;
    for (bool reached = true; reached; ++failures) {
        // What is made once is kept at first: a repeated failure at the same place finds it there.
        int keeping = 0;
        for (std::size_t before = 0, after = 1; after != before && keeping < 5; ++keeping) {
            before = heldBytes;
            failingAllocation = static_cast<std::size_t>(failures) + 1;
            const int code = ValtoInitialize();
            reached = std::exchange(failingAllocation, 0) == 0;
            ForgetEngine();
            after = heldBytes;
            if (codes.empty() || codes.back() != code) codes.push_back(code);
        }
        EXPECT_LT(keeping, 5) << "at allocation " << failures + 1;
    }
    EXPECT_GT(failures, 50);
    EXPECT_EQ(codes, (std::vector{-4, -5, -6, -7, -8, 0}));
}

}  // namespace
}  // namespace quorral
