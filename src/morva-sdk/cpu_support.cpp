#include "morva-sdk/cpu_support.h"

#include <cstring>

namespace MORVA::MORVA_SDK {

char const* missingProcessorFeature() {
    __builtin_cpu_init();
    // The builtin takes literals only, hence no table.
    if (!__builtin_cpu_supports("sse4.1")) return "SSE 4.1";
    if (!__builtin_cpu_supports("avx2")) return "AVX2";
    if (!__builtin_cpu_supports("fma")) return "FMA";
    if (!__builtin_cpu_supports("bmi2")) return "BMI2";
    return nullptr;
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
