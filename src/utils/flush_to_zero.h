// Treats denormal numbers as zero on this thread for a scope, so that a decaying state does not
// cost a hundred times its normal time. The caller's mode comes back at the end. Any thread.
#pragma once

#include <xmmintrin.h>

#include "utils/non_copyable.h"

namespace MORVA::UTILS {

class ScopedFlushToZero : private NonCopyMovable {
public:
    ScopedFlushToZero() : saved_(_mm_getcsr()) { _mm_setcsr(saved_ | flushResults | zeroOperands); }
    ~ScopedFlushToZero() { _mm_setcsr(saved_); }

private:
    static constexpr unsigned flushResults = 0x8000;
    static constexpr unsigned zeroOperands = 0x0040;
    unsigned saved_;
};

}  // namespace MORVA::UTILS
