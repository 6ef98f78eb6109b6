// What an x86-64 processor offers: its own answer, and whether the system keeps the registers.
// Reads no record of the compiler's runtime, which not every tool chain has. Uses nothing but
// baseline instructions. [any thread]
#pragma once

namespace MORVA::UTILS {

enum class CpuRegister { eax, ebx, ecx, edx };

struct ProcessorFeature {
    char const* name;
    unsigned leaf;  // where the answer stands, by the manufacturers' numbering
    CpuRegister where;
    unsigned bit;
    unsigned state = 0;  // register files that the system has to keep, as in XCR0
};

inline constexpr unsigned kWideState = 0x6;     // the registers of AVX
inline constexpr unsigned kWidestState = 0xe6;  // those of AVX-512

bool processorHas(ProcessorFeature const& feature);

}  // namespace MORVA::UTILS
