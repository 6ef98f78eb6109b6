// Any float bits as samples: the output stays finite and in range, and after one second of clean
// input the session gives what an undisturbed one gives.
#include <algorithm>
#include <array>
#include <cstring>
#include <map>

#include "harness.h"
#include "morva-sdk/vocabulary.h"

using namespace MORVA::MORVA_SDK;

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    if (size < 4) return 0;
    int const in = kSamplingRatesHz[data[0] % kSamplingRatesHz.size()];
    int const out = kSamplingRatesHz[data[1] % kSamplingRatesHz.size()];
    int const ms = kFrameDurationsMs[data[2] % kFrameDurationsMs.size()];
    bool const identity = data[3] % 2 == 0;
    char const* const model = identity ? "identity" : "random";
    std::size_t at = 4;

    // The engine stays up from input to input, and with it one session of every kind that was
    // opened: they keep the filters of their rates.
    static fuzz::Engine const engine;
    static std::map<std::array<int, 3>, fuzz::NcSession> kept;
    static int const registered =
        fuzz::Engine::setModel(test_support::identityNcWeight(fuzz::smallShape()), "identity") +
        fuzz::Engine::setModel(test_support::randomNcWeight(fuzz::smallShape("0.0.5")), "random");
    fuzz::require(registered == 0, "the models register");
    kept.try_emplace({in, out, ms}, in, out, ms, "identity");
    fuzz::NcSession disturbed(in, out, ms, model);
    fuzz::require(bool{disturbed}, "sessions of every rate and duration open");

    // At least one frame; the samples that the input does not fill keep the signal's.
    std::size_t frames = 0;
    do {
        auto frame = fuzz::signalFrame(disturbed.inputSize(), frames++);
        auto const bytes = std::min(size - at, frame.size() * sizeof(float));
        std::memcpy(frame.data(), data + at, bytes);
        at += bytes;
        disturbed.clean(frame);
    } while (at < size);

    // A network keeps its memory; with a mask of 1 nothing but the queues and resamplers remembers.
    auto const cleanFrames = static_cast<std::size_t>((identity ? 1000 : 100) / ms);
    fuzz::NcSession undisturbed(in, out, ms, model);
    for (std::size_t i = 0; i < frames + cleanFrames; ++i) {
        auto const frame = fuzz::signalFrame(disturbed.inputSize(), i);
        auto const& expected = undisturbed.clean(frame);
        if (i < frames) continue;
        auto const& heard = disturbed.clean(frame);
        if (!identity || i + 1 < frames + cleanFrames) continue;
        for (std::size_t k = 0; k < heard.size(); ++k) {
            fuzz::require(std::fabs(heard[k] - expected[k]) <= 1e-4F, "clean after one second");
        }
    }
    return 0;
}
