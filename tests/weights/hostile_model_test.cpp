// Weights of which one value was changed, through registration, sessions of every kind and frames:
// each is refused or runs, and what comes out of a running one is finite. The sanitizer presets see
// the rest.
#include <gtest/gtest.h>

#include <vector>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"
#include "support/captured_output.h"
#include "support/weight_mutator.h"
#include "support/weight_writer.h"

namespace {

using namespace test_support;

constexpr int frames = 5;
std::vector<short> const loud(160, 5000);

NcShape smallShape(std::string version) {
    NcShape shape;
    shape.version = std::move(version);
    shape.sampleRate = 8000;
    shape.frameLength = 160;
    shape.filtrEnd = 32;
    shape.previewFrames = 1;
    shape.hidden = 3;
    shape.gates = 3;
    return shape;
}

std::string cleanWeight(std::string const& version) {
    if (version != "VAD_0.0.1") return randomNcWeight(smallShape(version));
    VadShape shape;
    shape.hidden = 2;
    shape.gates = 2;
    return randomVadWeight(shape);
}

// Frames of the session's own size; true when it opened.
bool runNc() {
    auto* const session =
        Morva_NC_CreateSession(MORVA_RATE_8000, MORVA_RATE_8000, MORVA_FRAME_20_MS, "model");
    if (session == nullptr) return false;
    std::vector<float> input(160);
    std::vector<float> output(160);
    for (int i = 0; i < frames; ++i) {
        for (std::size_t k = 0; k < input.size(); ++k) {
            input[k] = static_cast<float>((k * 37 + static_cast<std::size_t>(i) * 11) % 64) / 80.0F;
        }
        EXPECT_EQ(Morva_NC_CleanAmbientNoiseFloat(session, input.data(), 160, output.data(), 160),
                  0);
        for (float const sample : output) EXPECT_TRUE(sample >= -1.0F && sample < 1.0F) << sample;
    }
    EXPECT_EQ(Morva_NC_CloseSession(session), 0);
    return true;
}

bool runVad() {
    auto* const session = Morva_VAD_CreateSession(MORVA_RATE_8000, MORVA_FRAME_20_MS, "model");
    if (session == nullptr) return false;
    for (int i = 0; i < frames; ++i) Morva_VAD_FrameInt16(session, loud.data(), 160);
    EXPECT_EQ(Morva_VAD_CloseSession(session), 0);
    return true;
}

bool runLevel() {
    auto* const session = Morva_NoiseDB_CreateSession(MORVA_RATE_8000, MORVA_FRAME_20_MS, "model");
    if (session == nullptr) return false;
    for (int i = 0; i < frames; ++i) Morva_NoiseDB_FrameInt16(session, loud.data(), 160);
    EXPECT_EQ(Morva_NoiseDB_ResetSession(session), 1);
    EXPECT_EQ(Morva_NoiseDB_CloseSession(session), 0);
    return true;
}

// The number of sessions that opened.
int runAll(std::string const& weight) {
    EXPECT_EQ(Morva_SDK_GlobalInit(nullptr, 1), 0);
    int opened = 0;
    if (Morva_SDK_SetModel_Blob(weight.data(), static_cast<unsigned>(weight.size()), "model") ==
        0) {
        opened = runNc() + runVad() + runLevel();
    }
    EXPECT_EQ(Morva_SDK_GlobalDestroy(), 0);
    return opened;
}

class HostileModel : public testing::TestWithParam<char const*> {};

TEST_P(HostileModel, IsRefusedOrRuns) {
    auto const clean = cleanWeight(GetParam());
    CapturedOutput const quiet(1);
    CapturedOutput const quietErrors(2);
    ASSERT_GE(runAll(clean), 1) << "the unchanged weight runs";
    int opened = 0;
    int refused = 0;
    for (unsigned seed = 1; seed <= 400; ++seed) {
        auto bytes = mutateWeight(clean, seed);
        if (seed % 2 == 0) bytes = mutateWeight(bytes, seed + 1000);
        (runAll(bytes) > 0 ? opened : refused) += 1;
        ASSERT_FALSE(HasFailure()) << GetParam() << " seed " << seed;
    }
    EXPECT_GT(opened, 20) << "the changes must not all be refused at the door";
    EXPECT_GT(refused, 20);
}

INSTANTIATE_TEST_SUITE_P(Versions, HostileModel,
                         testing::Values("0.0.1", "0.0.2", "0.0.3", "0.0.4", "0.0.5", "0.0.6",
                                         "VAD_0.0.1"));

}  // namespace
