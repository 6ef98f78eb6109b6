// Start-up on processors that the engine cannot run on, and the text conversions of the module
// path.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <stdexcept>
#include <string>

#include "native_modules/quorral_valto/src/valto_wrapper/entry_points.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"
#include "native_modules/quorral_valto/src/valto_wrapper/util.h"
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"

namespace quorral {
namespace {

template <bool Sse41, bool Avx2>
CpuFeatures Pretend() {
    return {.sse41 = Sse41, .avx2 = Avx2};
}

struct OldProcessor {
    CpuFeatureQuery query;
    int code;
    const char* line;
};

class OldProcessorTest : public testing::TestWithParam<OldProcessor> {};

TEST_P(OldProcessorTest, IsRefusedWithItsLineBeforeTheEngineExists) {
    testing::internal::CaptureStdout();
    EXPECT_EQ(ValtoInitialize(GetParam().query), GetParam().code);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), GetParam().line);
    EXPECT_FALSE(InitializeResult().has_value());
    EXPECT_TRUE(NcModelNames().empty());
    EXPECT_EQ(ValtoNCSetup(16000, 10), nullptr);
    EXPECT_EQ(OpenNcSession(16000, 10, {}).status, OpenStatus::kNotInitialized);
}

constexpr const char* kNoSse41 = "Failed to initialize Morva SDK: CPU does not support SSE 4.1\n";
constexpr const char* kNoAvx2 = "Failed to initialize Morva SDK: CPU does not support AVX2\n";
INSTANTIATE_TEST_SUITE_P(AllKinds, OldProcessorTest,
                         testing::Values(OldProcessor{Pretend<false, false>, -1, kNoSse41},
                                         OldProcessor{Pretend<false, true>, -1, kNoSse41},
                                         OldProcessor{Pretend<true, false>, -2, kNoAvx2}));

TEST(TextTest, CodePointsOfTheBasicPlaneSurviveBothDirections) {
    const std::string text = "/home/J\u00fcrgen \u4f60\u597d/\u0416";
    EXPECT_EQ(util::ToUTF8(util::ToUTF16(text)), text);
}

TEST(TextTest, OtherCodePointsBecomeTwoUnitsOneWayAndStayOneTheOther) {
    const std::wstring units = util::ToUTF16("a\xF0\x9F\x98\x80");
    EXPECT_EQ(units, (std::wstring{L'a', wchar_t{0xD83D}, wchar_t{0xDE00}}));
    EXPECT_EQ(util::ToUTF8(std::wstring{wchar_t{0x1F600}}), "\xF0\x9F\x98\x80");
}

TEST(TextTest, IllFormedTextThrows) {
    EXPECT_THROW(util::ToUTF16("\xC3("), std::range_error);
    EXPECT_THROW(util::ToUTF16("\xFF"), std::range_error);
}

TEST(ModuleBasePathTest, IsTheFolderOfThisProgram) {
    namespace fs = std::filesystem;
    const std::string path = util::ModuleBasePath();
    EXPECT_TRUE(path.empty() || path.back() != '/');
    const fs::path folder = fs::read_symlink("/proc/self/exe").parent_path();
    EXPECT_TRUE(fs::equivalent(path.empty() ? "." : path, folder)) << path;
}

}  // namespace
}  // namespace quorral
