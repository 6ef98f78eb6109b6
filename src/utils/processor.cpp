#include "utils/processor.h"

#ifdef __x86_64__
#include <cpuid.h>

namespace MORVA::UTILS {
namespace {

unsigned keptState() {
    unsigned registers[4] = {};
    constexpr unsigned kSystemSaves = 1U << 27;
    if (__get_cpuid(1, &registers[0], &registers[1], &registers[2], &registers[3]) == 0 ||
        (registers[2] & kSystemSaves) == 0) {
        return 0;
    }
    unsigned low = 0, high = 0;
    __asm__("xgetbv" : "=a"(low), "=d"(high) : "c"(0));
    return low;
}

}  // namespace

bool processorHas(ProcessorFeature const& feature) {
    unsigned registers[4] = {};
    return __get_cpuid_count(feature.leaf, 0, &registers[0], &registers[1], &registers[2],
                             &registers[3]) != 0 &&
           (registers[static_cast<unsigned>(feature.where)] >> feature.bit & 1U) != 0 &&
           (feature.state == 0 || (keptState() & feature.state) == feature.state);
}

}  // namespace MORVA::UTILS
#endif
