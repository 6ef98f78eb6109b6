#include "morva-sdk/cpu_support.h"

#ifdef __x86_64__
#include <cpuid.h>

#include <cstring>

namespace MORVA::MORVA_SDK {
namespace {

// Where the processor says that it has a feature, by the manufacturers' numbering.
enum Register { eax, ebx, ecx, edx };
struct Feature {
    char const* name;
    unsigned leaf;
    Register where;
    unsigned bit;
};
// The level x86-64-v3 beyond the baseline: what the vector kernels are compiled for, and what was
// always asked for. The two that hosts ask for come first.
constexpr Feature kNeeded[] = {
    {"SSE 4.1", 1, ecx, 19}, {"AVX2", 7, ebx, 5},           {"AVX", 1, ecx, 28},
    {"FMA", 1, ecx, 12},     {"BMI2", 7, ebx, 8},           {"BMI1", 7, ebx, 3},
    {"F16C", 1, ecx, 29},    {"LZCNT", 0x80000001, ecx, 5}, {"MOVBE", 1, ecx, 22},
    {"POPCNT", 1, ecx, 23},  {"SSE 4.2", 1, ecx, 20},       {"SSSE3", 1, ecx, 9},
    {"SSE3", 1, ecx, 0},     {"CMPXCHG16B", 1, ecx, 13},    {"LAHF", 0x80000001, ecx, 0}};

bool has(Feature const& feature) {
    unsigned registers[4] = {};
    return __get_cpuid_count(feature.leaf, 0, &registers[eax], &registers[ebx], &registers[ecx],
                             &registers[edx]) != 0 &&
           (registers[feature.where] >> feature.bit & 1U) != 0;
}

}  // namespace

char const* missingProcessorFeature() {
    for (Feature const& feature : kNeeded) {
        if (!has(feature)) return feature.name;
    }
    // Present and yet unusable: the operating system must keep the wide registers.
    __builtin_cpu_init();
    return __builtin_cpu_supports("avx2") ? nullptr : "AVX2";
}

char const* processorFeatures() {
    static char const* const text = [] {
        static char buffer[64] = "";
        __builtin_cpu_init();
        auto const add = [](bool present, char const* name) {
            if (!present) return;
            if (buffer[0] != '\0') std::strcat(buffer, " ");
            std::strcat(buffer, name);
        };
        add(__builtin_cpu_supports("sse4.1"), "sse4.1");
        add(__builtin_cpu_supports("avx2"), "avx2");
        add(__builtin_cpu_supports("fma"), "fma");
        add(__builtin_cpu_supports("bmi2"), "bmi2");
        add(__builtin_cpu_supports("avx512f"), "avx512f");
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
#else
    return "";
#endif
}

}  // namespace MORVA::MORVA_SDK
#endif
