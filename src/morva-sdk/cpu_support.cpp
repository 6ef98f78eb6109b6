#include "morva-sdk/cpu_support.h"

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

}  // namespace MORVA::MORVA_SDK
