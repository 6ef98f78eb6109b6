// Processor time of the calling thread: what a frame costs on a machine that does other work too.
#pragma once

#include <ctime>

namespace morva_bench {

inline double cpuSeconds() {
    timespec now{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + 1e-9 * static_cast<double>(now.tv_nsec);
}

}  // namespace morva_bench
