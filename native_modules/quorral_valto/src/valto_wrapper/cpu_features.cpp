// Reads the compiler runtime's processor record, which also knows whether the system saves the wide
// registers.
#include "native_modules/quorral_valto/src/valto_wrapper/cpu_features.h"

namespace quorral {

CpuFeatures QueryCpuFeatures() {
    __builtin_cpu_init();
    return {.sse41 = __builtin_cpu_supports("sse4.1") != 0,
            .avx2 = __builtin_cpu_supports("avx2") != 0};
}

}  // namespace quorral
