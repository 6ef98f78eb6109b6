// Which of the widths that a unit is compiled for runs on this processor.
#pragma once

#include "utils/processor.h"

namespace MORVA::UTILS {

// Registers of 64 bytes, from the generation on that does not slow its clock down for them; of
// x86-64 only. [any thread]
inline bool wideRegistersPay() {
    using enum CpuRegister;
    static bool const pays = processorHas({"AVX512_VBMI2", 7, ecx, 6, kWidestState});
    return pays;
}

}  // namespace MORVA::UTILS
