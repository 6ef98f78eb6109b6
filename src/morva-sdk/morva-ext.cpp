#include "morva-sdk/morva-ext.h"

#include <cmath>

#include "morva-sdk/error_funnel.h"
#include "morva-sdk/instance.h"

namespace {

using namespace MORVA::MORVA_SDK;

constexpr char const* kWrongSession =
    "The Session pointer is wrong insert existing session pointer";

// The live session behind a handle, of any type, or null.
MorvaSessionT* sessionOf(void* handle) {
    auto const* const instance = MorvaInstanceT::Instance(MorvaInstanceT::MODE::get, nullptr);
    auto* const session = static_cast<MorvaSessionT*>(handle);
    return instance->isSessionTrue(session) ? session : nullptr;
}

int wrongSession() {
    printError(kWrongSession);
    return 2;
}

}  // namespace

extern "C" {

int MorvaExt_SessionLatencySamples(void* handle) {
    return funnel(kIntFailures, [&] {
        auto const* const session = sessionOf(handle);
        if (session == nullptr || session->getType() != MorvaSessionType::NoiseCancellation) {
            MORVA::UTILS::raise("Latency asked of a session that makes no sound",
                                "src/morva-sdk/morva-ext", "MorvaExt_SessionLatencySamples");
        }
        return static_cast<int>(std::lround(session->latencySamples()));
    });
}

int MorvaExt_SessionFrameSizes(void* handle, unsigned int* inputSize, unsigned int* outputSize) {
    return funnel(kIntFailures, [&] {
        auto const* const session = sessionOf(handle);
        if (session == nullptr) return wrongSession();
        if (inputSize != nullptr) *inputSize = static_cast<unsigned>(session->inputFrameSize());
        if (outputSize != nullptr) *outputSize = static_cast<unsigned>(session->outputFrameSize());
        return 0;
    });
}

int MorvaExt_NoiseDB_FrameFloat(void* handle, float const* input, unsigned int inputSize,
                                float* levelDb) {
    return funnel(kIntFailures, [&] {
        auto* const session = sessionOf(handle);
        if (session == nullptr || session->getType() != MorvaSessionType::NoiseLevel) {
            return wrongSession();
        }
        if (input == nullptr || levelDb == nullptr || inputSize != session->inputFrameSize()) {
            return 1;
        }
        *levelDb = session->frameNoiseDB(input, inputSize);
        return 0;
    });
}

}  // extern "C"
