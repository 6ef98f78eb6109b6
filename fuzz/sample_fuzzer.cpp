// Any float bits as samples: the output stays finite and in range, and after one second of clean
// input the session gives what an undisturbed one gives.
#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <map>

#include "harness.h"
#include "support/weight_writer.h"

namespace {

constexpr int rates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
constexpr int durations[] = {10, 20, 30, 40};

test_support::NcShape smallShape() {
    test_support::NcShape shape;
    shape.sampleRate = 8000;
    shape.frameLength = 160;
    shape.filtrEnd = 64;
    shape.previewFrames = 2;
    shape.hidden = 4;
    shape.gates = 4;
    return shape;
}

// The engine stays up from input to input, and with it one session of every kind that was opened:
// they keep the filters of their rates.
class Bench {
public:
    Bench() {
        engine_.setModel(test_support::identityNcWeight(smallShape()), "identity");
        engine_.setModel(test_support::randomNcWeight(smallShape()), "random");
    }
    void keepFilters(int inputRate, int outputRate, int durationMs) {
        kept_.try_emplace({inputRate, outputRate, durationMs}, inputRate, outputRate, durationMs,
                          "identity");
    }

private:
    fuzz::Engine engine_;
    std::map<std::array<int, 3>, fuzz::NcSession> kept_;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    if (size < 4) return 0;
    int const inputRate = rates[data[0] % std::size(rates)];
    int const outputRate = rates[data[1] % std::size(rates)];
    int const durationMs = durations[data[2] % std::size(durations)];
    bool const identity = data[3] % 2 == 0;
    char const* const model = identity ? "identity" : "random";
    std::size_t at = 4;

    static Bench bench;
    bench.keepFilters(inputRate, outputRate, durationMs);
    fuzz::NcSession disturbed(inputRate, outputRate, durationMs, model);
    fuzz::require(bool{disturbed}, "sessions of every rate and duration open");

    // At least one frame; the samples that the input does not fill keep the signal's.
    fuzz::TestSignal signal;
    int frames = 0;
    do {
        auto frame = signal.frame(disturbed.inputSize());
        auto const bytes = std::min(size - at, frame.size() * sizeof(float));
        std::memcpy(frame.data(), data + at, bytes);
        at += bytes;
        disturbed.clean(frame);
        ++frames;
    } while (at < size);

    // A network keeps its memory; with a mask of 1 nothing but the queues and resamplers remembers.
    int const cleanFrames = (identity ? 1000 : 100) / durationMs;
    for (int i = 0; i < cleanFrames; ++i) disturbed.clean(signal.frame(disturbed.inputSize()));
    if (!identity) return 0;
    fuzz::NcSession undisturbed(inputRate, outputRate, durationMs, model);
    fuzz::TestSignal again;
    for (int i = 0; i < frames + cleanFrames; ++i) {
        undisturbed.clean(again.frame(disturbed.inputSize()));
    }
    auto const frame = signal.frame(disturbed.inputSize());
    auto const& heard = disturbed.clean(frame);
    auto const& expected = undisturbed.clean(frame);
    for (std::size_t i = 0; i < heard.size(); ++i) {
        fuzz::require(std::fabs(heard[i] - expected[i]) <= 1e-4F, "clean again after one second");
    }
    return 0;
}
