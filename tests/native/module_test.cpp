// The host module without script: start-up, entry points, and both when memory runs out.
#include <gtest/gtest.h>

#include <filesystem>
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
        EXPECT_FALSE(InitializeResult().has_value());
        EXPECT_TRUE(NcModelNames().empty());
        EXPECT_EQ(ValtoNCSetup(16000, 10), nullptr);
        EXPECT_EQ(OpenNcSession(16000, 10, {}).status, OpenStatus::kNotInitialized);
    };
    refuse([] { return CpuFeatures{.sse41 = false, .avx2 = false}; }, -1, "SSE 4.1\n");
    refuse([] { return CpuFeatures{.sse41 = false, .avx2 = true}; }, -1, "SSE 4.1\n");
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

TEST(ModuleBasePathTest, IsTheFolderOfThisProgram) {
    const std::string path = util::ModuleBasePath();
    EXPECT_TRUE(path.empty() || path.back() != '/');
    const auto folder = std::filesystem::read_symlink("/proc/self/exe").parent_path();
    EXPECT_TRUE(std::filesystem::equivalent(path.empty() ? "." : path, folder)) << path;
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
    const std::string full = "Setting Valto model: full_NC-ca03f4\n";
    const std::string small = "Setting Valto model: small_NC\n";
    const std::string smallest = "Setting Valto model: small_NC_8k\n";
    const auto rate = [](const char* hertz) {
        return std::string("The input sampling rate ") + hertz +
               " is not supported; using default: 16000\n";
    };
    const auto duration = [](const char* ms) {
        return std::string("The input frame duration ") + ms +
               " is not supported; using default: 10\n";
    };
    struct Case {
        int rateHz, durationMs;
        const char* choice;
        std::string lines;
        unsigned samples;  // of a frame; 0 when no session opens
    };
    const std::vector<Case> cases{{8000, 10, "", smallest, 80},
                                  {12000, 20, "", small, 240},
                                  {16000, 30, "", small, 480},
                                  {24000, 40, "", full, 960},
                                  {96000, 10, "", full, 960},
                                  {48000, 10, "small_NC", small, 480},
                                  {192000, 10, "", "", 0},
                                  {22050, 10, "", full + rate("22050"), 160},
                                  {48000, 25, "", full + duration("25"), 480},
                                  {48000, 15, "", full, 0},
                                  {48000, 32, "", full, 0},
                                  {0, 0, "", smallest + rate("0") + duration("0"), 160}};
    for (const auto& [rateHz, durationMs, choice, lines, samples] : cases) {
        SCOPED_TRACE(testing::Message() << rateHz << " Hz, " << durationMs << " ms " << choice);
        gNcModel = choice;
        testing::internal::CaptureStdout();
        void* const session = ValtoNCSetup(rateHz, durationMs);
        EXPECT_EQ(testing::internal::GetCapturedStdout(), lines);
        EXPECT_EQ(session != nullptr, samples != 0);
        std::vector<short> frame(960);
        EXPECT_EQ(ValtoNCProcess(session, frame.data(), samples, frame.data(), samples),
                  session == nullptr ? 2 : 0);
    }
}

TEST_F(EntryPointsTest, Codes) {
    void* const cleaner = ValtoNCSetup(16000, 10);
    void* const detector = ValtoVADSetup(16000, 10);
    const std::vector<short> in(160, 1000);
    std::vector<short> out(160);
    EXPECT_EQ(ValtoNCProcess(cleaner, in.data(), 160, out.data(), 160), 0);
    EXPECT_EQ(ValtoNCProcess(cleaner, in.data(), 159, out.data(), 160), 1);
    EXPECT_EQ(ValtoNCProcess(cleaner, in.data(), 160, out.data(), 159), 1);
    EXPECT_EQ(ValtoNCProcess(cleaner, nullptr, 160, out.data(), 160), 1);
    EXPECT_EQ(ValtoNCProcess(detector, in.data(), 160, out.data(), 160), 2);
    EXPECT_GE(ValtoVADProcess(detector, in.data(), 160), 0.0F);
    EXPECT_EQ(ValtoVADProcess(detector, in.data(), 161), -3.0F);
    EXPECT_EQ(ValtoVADProcess(cleaner, in.data(), 160), -4.0F);
    EXPECT_EQ(ValtoNCReset(detector), -3);
    EXPECT_EQ(ValtoNCReset(cleaner), 0);
    EXPECT_EQ(ValtoNCReset(cleaner), -3);
    EXPECT_EQ(ValtoVADReset(detector), 0);
    EXPECT_EQ(ValtoVADReset(detector), -3);
}

// Fails the first, second, ... allocation of `work` until it gets by without reaching it; how often
// it failed. What `work` has done must be taken back by itself, but for what is made once: a repeated
// failure at the same place must find that there.
template <class Work>
int FailEach(Work work) {
    for (int n = 1;; ++n) {
        bool reached = true;
        const auto kept = [&] {
            const std::size_t before = heldBytes;
            failingAllocation = static_cast<std::size_t>(n);
            work();
            reached = std::exchange(failingAllocation, 0) == 0;
            return heldBytes - before;
        };
        int keeping = 0;
        while (kept() != 0 && keeping < 4) ++keeping;
        EXPECT_LT(keeping, 4) << "at allocation " << n;
        if (!reached) return n - 1;
    }
}

// What runs between the failing allocation and the next thing to be tried.
template <class Work>
void Undisturbed(Work work) {
    const std::size_t armed = std::exchange(failingAllocation, 0);
    work();
    failingAllocation = armed;
}

TEST(MemoryTest, StartUpNamesTheStepAtWhichItRanOut) {
    std::vector<int> codes;
    codes.reserve(20);
    const int failures = FailEach([&] {
        const int code = ValtoInitialize();
        if (codes.empty() || codes.back() != code) codes.push_back(code);
        Undisturbed(ForgetEngine);
    });
    EXPECT_GT(failures, 50);
    EXPECT_EQ(codes, (std::vector{-4, -5, -6, -7, -8, 0}));
}

TEST_F(EntryPointsTest, ASessionThatFindsNoMemoryIsRefusedOrWhole) {
    std::vector<short> heard(480);
    const auto listen = [&](void* session) {
        for (int n = 0; n < 5; ++n) {
            for (int i = 0; i < 480; ++i) heard[i] = static_cast<short>((n + i) * i * 7919);
            EXPECT_EQ(ValtoNCProcess(session, heard.data(), 480, heard.data(), 480), 0);
        }
        return heard;
    };
    void* const first = ValtoNCSetup(48000, 10);
    const std::vector<short> wanted = listen(first);
    int whole = 0;
    const int failures = FailEach([&] {
        void* const session = ValtoNCSetup(48000, 10);
        Undisturbed([&] {
            if (session == nullptr) return;
            ++whole;
            EXPECT_EQ(listen(session), wanted);
            ValtoNCReset(session);
        });
    });
    EXPECT_GT(failures, 20);
    EXPECT_LT(whole, 8);
    EXPECT_GT(FailEach([] {
                  if (void* const session = ValtoVADSetup(48000, 10)) ValtoVADReset(session);
              }),
              20);
}

}  // namespace
}  // namespace quorral
