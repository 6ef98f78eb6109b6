// Any float bits as samples: the output stays finite and in range, and after one second of clean
// input the session gives what an undisturbed one gives.
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "harness.h"
#include "support/weight_writer.h"

namespace {

constexpr int rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
constexpr int durations[] = {10, 20, 30, 40};

std::string const& weight(bool identity) {
    static auto const shape = [] {
        test_support::NcShape small;
        small.sampleRate = 8000;
        small.frameLength = 160;
        small.filtrEnd = 64;
        small.previewFrames = 2;
        small.hidden = 4;
        small.gates = 4;
        return small;
    }();
    static auto const ones = test_support::identityNcWeight(shape);
    static auto const random = test_support::randomNcWeight(shape);
    return identity ? ones : random;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    if (size < 4) return 0;
    int const inputRate = rates[data[0] % std::size(rates)];
    int const outputRate = rates[data[1] % std::size(rates)];
    int const durationMs = durations[data[2] % std::size(durations)];
    bool const identity = data[3] % 2 == 0;
    std::size_t at = 4;

    fuzz::Engine const engine;
    engine.setModel(weight(identity), "model");
    fuzz::NcSession disturbed(inputRate, outputRate, durationMs, "model");
    fuzz::NcSession undisturbed(inputRate, outputRate, durationMs, "model");
    fuzz::require(disturbed && undisturbed, "sessions of every rate and duration open");

    // At least one frame; the samples that the input does not fill keep the signal's.
    fuzz::TestSignal signal;
    do {
        auto frame = signal.frame(disturbed.inputSize());
        undisturbed.clean(frame);
        auto const bytes = std::min(size - at, frame.size() * sizeof(float));
        std::memcpy(frame.data(), data + at, bytes);
        at += bytes;
        disturbed.clean(frame);
    } while (at < size);

    for (int ms = 0; ms < 1000; ms += durationMs) {
        auto const frame = signal.frame(disturbed.inputSize());
        disturbed.clean(frame);
        undisturbed.clean(frame);
    }
    auto const frame = signal.frame(disturbed.inputSize());
    auto const& heard = disturbed.clean(frame);
    auto const& expected = undisturbed.clean(frame);
    // A network keeps its memory; with a mask of 1 nothing but the queues and resamplers remembers.
    for (std::size_t i = 0; identity && i < heard.size(); ++i) {
        fuzz::require(std::fabs(heard[i] - expected[i]) <= 1e-4F, "clean again after one second");
    }
    return 0;
}
