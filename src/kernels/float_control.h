// The floating-point mode that the engine computes in, whatever mode the caller's thread is in:
// rounding to nearest, no traps. Set whole for a scope; the caller's control word, flags included,
// comes back at its end. [any thread]
#pragma once

#include <cstdint>

#ifdef __x86_64__
#include <xmmintrin.h>
#endif

#include "utils/non_copyable.h"

namespace MORVA::UTILS {

// The control word of this thread.
#ifdef __x86_64__
inline std::uint64_t floatControl() {
    return _mm_getcsr();
}
inline void setFloatControl(std::uint64_t word) {
    _mm_setcsr(static_cast<unsigned>(word));
}
inline constexpr std::uint64_t kPlainFloats = 0x1F80;
inline constexpr std::uint64_t kFlushDenormals = 0x8040;  // results and operands
#elif defined(__aarch64__)
inline std::uint64_t floatControl() {
    std::uint64_t word = 0;
    asm volatile("mrs %0, fpcr" : "=r"(word));
    return word;
}
inline void setFloatControl(std::uint64_t word) {
    asm volatile("msr fpcr, %0" : : "r"(word));
}
inline constexpr std::uint64_t kPlainFloats = 0;
inline constexpr std::uint64_t kFlushDenormals = std::uint64_t{1} << 24;
#else  // WebAssembly knows one mode only
inline std::uint64_t floatControl() {
    return 0;
}
inline void setFloatControl(std::uint64_t) {}
inline constexpr std::uint64_t kPlainFloats = 0;
inline constexpr std::uint64_t kFlushDenormals = 0;
#endif

// As zero for the length of a frame, so that a decaying state does not cost a hundred times its
// normal time; kept where values are read and checked.
enum class Denormals { kept, asZero };

class ScopedFloatControl : private NonCopyMovable {
public:
    explicit ScopedFloatControl(Denormals denormals) : saved_(floatControl()) {
        setFloatControl(denormals == Denormals::kept ? kPlainFloats
                                                     : kPlainFloats | kFlushDenormals);
    }
    ~ScopedFloatControl() { setFloatControl(saved_); }

private:
    std::uint64_t saved_;
};

}  // namespace MORVA::UTILS
