// The floating-point mode that the engine computes in, whatever mode the caller's thread is in:
// rounding to nearest, no traps. Set whole for a scope; the caller's control word, flags included,
// comes back at its end. [any thread]
#pragma once

#include <xmmintrin.h>

#include "utils/non_copyable.h"

namespace MORVA::UTILS {

// As zero for the length of a frame, so that a decaying state does not cost a hundred times its
// normal time; kept where values are read and checked.
enum class Denormals { kept, asZero };

class ScopedFloatControl : private NonCopyMovable {
public:
    explicit ScopedFloatControl(Denormals denormals) : saved_(_mm_getcsr()) {
        _mm_setcsr(denormals == Denormals::kept ? kAllMasked : kAllMasked | kFlush);
    }
    ~ScopedFloatControl() { _mm_setcsr(saved_); }

private:
    static constexpr unsigned kAllMasked = 0x1F80;
    static constexpr unsigned kFlush = 0x8040;  // results and operands
    unsigned saved_;
};

}  // namespace MORVA::UTILS
