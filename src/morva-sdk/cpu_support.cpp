#include "morva-sdk/cpu_support.h"

#ifdef __x86_64__
#include <cstring>

#include "utils/processor.h"

namespace MORVA::MORVA_SDK {
namespace {

using UTILS::ProcessorFeature;
using enum UTILS::CpuRegister;

constexpr ProcessorFeature kSse41{"SSE 4.1", 1, ecx, 19};
constexpr ProcessorFeature kAvx2{"AVX2", 7, ebx, 5, UTILS::kWideState};
constexpr ProcessorFeature kFma{"FMA", 1, ecx, 12};
constexpr ProcessorFeature kBmi2{"BMI2", 7, ebx, 8};
constexpr ProcessorFeature kAvx512{"AVX512F", 7, ebx, 16, UTILS::kWidestState};

// The level x86-64-v3 beyond the baseline: what the vector kernels are compiled for, and what was
// always asked for. The two that hosts ask for come first.
constexpr ProcessorFeature kNeeded[] = {
    kSse41,
    kAvx2,
    {"AVX", 1, ecx, 28},
    kFma,
    kBmi2,
    {"BMI1", 7, ebx, 3},
    {"F16C", 1, ecx, 29},
    {"LZCNT", 0x80000001, ecx, 5},
    {"MOVBE", 1, ecx, 22},
    {"POPCNT", 1, ecx, 23},
    {"SSE 4.2", 1, ecx, 20},
    {"SSSE3", 1, ecx, 9},
    {"SSE3", 1, ecx, 0},
    {"CMPXCHG16B", 1, ecx, 13},
    {"LAHF", 0x80000001, ecx, 0},
};

}  // namespace

char const* missingProcessorFeature() {
    for (ProcessorFeature const& feature : kNeeded) {
        if (!processorHas(feature)) return feature.name;
    }
    return nullptr;
}

char const* processorFeatures() {
    static char const* const text = [] {
        static char buffer[64] = "";
        auto const add = [](ProcessorFeature const& feature, char const* name) {
            if (!processorHas(feature)) return;
            if (buffer[0] != '\0') std::strcat(buffer, " ");
            std::strcat(buffer, name);
        };
        add(kSse41, "sse4.1");
        add(kAvx2, "avx2");
        add(kFma, "fma");
        add(kBmi2, "bmi2");
        add(kAvx512, "avx512f");
        return buffer;
    }();
    return text;
}

}  // namespace MORVA::MORVA_SDK

#else  // what the kernels use is part of every processor of the family

namespace MORVA::MORVA_SDK {

char const* missingProcessorFeature() {
    return nullptr;
}

char const* processorFeatures() {
#ifdef __aarch64__
    return "neon";
#elif defined(__wasm_simd128__)
    return "simd128";
#else
    return "";
#endif
}

}  // namespace MORVA::MORVA_SDK
#endif
