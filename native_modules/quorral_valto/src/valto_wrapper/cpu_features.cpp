// Takes the engine's word for it, which also knows whether the system saves the wide registers.
#include "native_modules/quorral_valto/src/valto_wrapper/cpu_features.h"

#include <string_view>

#include "morva-sdk/morva-ext.h"

namespace quorral {

CpuFeatures QueryCpuFeatures() {
#ifdef __x86_64__
    const std::string_view features = MorvaExt_ProcessorFeatures();
    const auto has = [&](std::string_view name) { return features.find(name) != features.npos; };
    return {.sse41 = has("sse4.1"), .avx2 = has("avx2")};
#else  // these two are names of one processor family
    return {.sse41 = true, .avx2 = true};
#endif
}

}  // namespace quorral
