// The engine's answers to a fixed sound, to the last bit: the same on every processor, whoever made
// it, and whatever the floating-point mode of the thread that calls.
#include <gtest/gtest.h>

#include <bit>
#include <cstdint>
#include <string>
#include <vector>

#include "kernels/float_control.h"
#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"
#include "support/captured_output.h"
#include "support/weight_writer.h"

namespace {

// Two triangle waves that come and go, and noise; whole numbers only, so that no library has a part
// in it. 16-bit scale.
std::vector<short> sound(int hz, int frames) {
    std::vector<short> samples(static_cast<std::size_t>(hz / 100 * frames));
    std::uint32_t noise = 12345;
    int phase = 0;
    for (std::size_t i = 0; i < samples.size(); ++i) {
        noise = noise * 1664525U + 1013904223U;
        phase = (phase + 150) % hz;
        int const low = std::abs(phase * 4000 / hz - 2000) - 1000;
        int const high = std::abs(phase * 5 % hz * 4000 / hz - 2000) - 1000;
        bool const voiced = i * 100 / static_cast<std::size_t>(hz) % 16 > 3;
        samples[i] = static_cast<short>((voiced ? 5 * low + 3 * high : 0) +
                                        static_cast<int>(noise >> 23) - 256);
    }
    return samples;
}

// FNV-1a over the bytes of numbers.
void add(std::uint64_t& sum, float value) {
    auto const bits = std::bit_cast<std::uint32_t>(value);
    for (int byte = 0; byte < 4; ++byte) sum = (sum ^ (bits >> 8 * byte & 0xFF)) * 1099511628211ULL;
}

enum class Kind { cleaned, voice, level };

struct Row {
    char const* model;
    Kind kind;
    int hz;
    int frames;
    std::uint64_t checksums[2];  // with oneMKL, portable; made anew: a failing test prints it
};
// Rates that are converted by long filters and short ones, and the models of every kind. As few
// frames as an emulated processor has time for.
// clang-format off
constexpr Row kRows[] = {
    {"NC_small_8k", Kind::cleaned, 44100, 24, {0xb2d417f349503c75, 0x5307c6bea9b7cb77}},
    {"NC_small_16k", Kind::cleaned, 16000, 24, {0x812be6bac0895df3, 0x0870f09c1bdba6a7}},
    {"c6.xs.f.ca03f4", Kind::cleaned, 48000, 12, {0xc2502577d3789c3f, 0x4c821237df77bbec}},
    {"VAD_weight", Kind::voice, 48000, 6, {0x7b28db1de01a0189, 0xf3eb574eb70f1add}},
    {"noise_level_16k", Kind::level, 44100, 24, {0x75f55f692177e961, 0x183d76b196a9fd28}},
    {"NC_1.0.0", Kind::cleaned, 16000, 12, {0x0cdc00e9c16db94c, 0xef3e82002c928da9}},
};
// clang-format on

// Made before any mode is set; of widths that fill whole registers and parts.
std::string const kBandWeight =
    test_support::randomNcWeight({.version = "NC_1.0.0", .hidden = 20, .gates = 28});

// A file, or the weight above under the name of its version.
int addModel(std::string const& name) {
    test_support::CapturedOutput const quiet(1);
    if (name == "NC_1.0.0") {
        auto const size = static_cast<unsigned>(kBandWeight.size());
        return Morva_SDK_SetModel_Blob(kBandWeight.data(), size, name.c_str());
    }
    std::string const file = MORVA_TEST_MODELS + name + ".mvw";
    std::wstring const path(file.begin(), file.end());
    return Morva_SDK_SetModel(path.c_str(), name.c_str());
}

std::uint64_t answers(Row const& row) {
    auto const rate = static_cast<MorvaSamplingRate>(row.hz);
    auto const size = static_cast<unsigned>(row.hz / 100);
    auto* const open =
        row.kind == Kind::voice ? Morva_VAD_CreateSession : Morva_NoiseDB_CreateSession;
    void* const session = row.kind == Kind::cleaned
                              ? Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, row.model)
                              : open(rate, MORVA_FRAME_10_MS, row.model);
    auto const in = sound(row.hz, row.frames);
    std::vector<float> frame(size);
    std::uint64_t sum = 14695981039346656037ULL;
    for (std::size_t at = 0; at < in.size(); at += size) {
        if (row.kind == Kind::voice) {
            add(sum, Morva_VAD_FrameInt16(session, &in[at], size));
        } else if (row.kind == Kind::level) {
            add(sum, Morva_NoiseDB_FrameInt16(session, &in[at], size));
        } else {
            for (std::size_t i = 0; i < size; ++i) {
                frame[i] = static_cast<float>(in[at + i]) / 32768.0F;
            }
            Morva_NC_CleanAmbientNoiseFloat(session, frame.data(), size, frame.data(), size);
            for (float const sample : frame) add(sum, sample);
        }
    }
    return sum;
}

// Control words of a caller: the usual one, the other three roundings, division by zero and
// invalid operations as traps, and the fast modes.
#ifdef __x86_64__
constexpr std::uint64_t kControlWords[] = {0x1F80, 0x3F80, 0x5F80, 0x7F80, 0x1D00, 0x9FC0};
#else
constexpr std::uint64_t kControlWords[] = {0, 0x400000, 0x800000, 0xC00000, 0x1000000};
#endif

}  // namespace

TEST(SameBits, OnEveryProcessorInEveryMode) {
    using namespace MORVA::UTILS;
    std::uint64_t const before = floatControl();
    for (std::uint64_t const word : kControlWords) {
        setFloatControl(word);
        EXPECT_EQ(Morva_SDK_GlobalInit(nullptr, 1), 0);
        for (Row const& row : kRows) {
            EXPECT_EQ(addModel(row.model), 0);
            std::uint64_t const sum = answers(row);
            EXPECT_EQ(floatControl() & ~std::uint64_t{0x3F}, word) << "given back";
            EXPECT_EQ(sum, row.checksums[MORVA_MATH_PORTABLE])
                << row.model << std::hex << ", mode " << word << ": 0x" << sum;
        }
        EXPECT_EQ(Morva_SDK_GlobalDestroy(), 0);
    }
    setFloatControl(before);
}
