// Any bytes as a weight: registration, sessions of every kind, ten frames each.
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "harness.h"
#include "support/temp_dir.h"
#include "weight_mutator.h"

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t maxSize);

namespace {

constexpr int frames = 10;

// Some inputs are read from a file, too.
void checkFile(std::string const& bytes, bool registered) {
    static test_support::TempDir const folder;
    auto const file = folder.write("weight.mvw", bytes).wstring();
    fuzz::require((Morva_SDK_SetModel(file.c_str(), "file") == 0) == registered,
                  "a file is taken or refused as its bytes are");
}

void runNc(int inputRate, int outputRate, int durationMs) {
    fuzz::NcSession session(inputRate, outputRate, durationMs, "model");
    fuzz::TestSignal signal;
    for (int i = 0; session && i < frames; ++i) session.clean(signal.frame(session.inputSize()));
}

void runVad(int rate, int durationMs) {
    auto* const session = Morva_VAD_CreateSession(
        static_cast<MorvaSamplingRate>(rate), static_cast<MorvaFrameDuration>(durationMs), "model");
    if (session == nullptr) return;
    std::vector<short> const frame(static_cast<std::size_t>(rate * durationMs / 1000), 5000);
    for (int i = 0; i < frames; ++i) {
        Morva_VAD_FrameInt16(session, frame.data(), static_cast<unsigned>(frame.size()));
    }
    fuzz::require(Morva_VAD_CloseSession(session) == 0, "a voice-activity session closes");
}

void runLevel(int rate, int durationMs) {
    auto* const session = Morva_NoiseDB_CreateSession(
        static_cast<MorvaSamplingRate>(rate), static_cast<MorvaFrameDuration>(durationMs), "model");
    if (session == nullptr) return;
    std::vector<short> const frame(static_cast<std::size_t>(rate * durationMs / 1000), 5000);
    for (int i = 0; i < frames; ++i) {
        Morva_NoiseDB_FrameInt16(session, frame.data(), static_cast<unsigned>(frame.size()));
        if (i == frames / 2)
            fuzz::require(Morva_NoiseDB_ResetSession(session) == 1, "a level resets");
    }
    fuzz::require(Morva_NoiseDB_CloseSession(session) == 0, "a level session closes");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    fuzz::Engine const engine;
    std::string const bytes(reinterpret_cast<char const*>(data), size);
    bool const registered = engine.setModel(bytes, "model") == 0;
    if (size % 8 == 0) checkFile(bytes, registered);
    if (!registered) return 0;
    runNc(8000, 8000, 40);
    runNc(48000, 16000, 10);
    runVad(8000, 20);
    runLevel(16000, 30);
    return 0;
}

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t maxSize, unsigned seed) {
    if (seed % 4 == 0) return LLVMFuzzerMutate(data, size, maxSize);
    auto const mutated =
        test_support::mutateWeight({reinterpret_cast<char const*>(data), size}, seed);
    auto const kept = std::min(mutated.size(), maxSize);
    std::memcpy(data, mutated.data(), kept);
    return kept;
}
