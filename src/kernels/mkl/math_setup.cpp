#include "kernels/math_setup.h"

#include <mkl_service.h>
#include <mkl_types.h>

namespace MORVA::UTILS {
namespace {

constexpr unsigned kMaxThreads = 8;

}  // namespace

void configureMathLibrary(unsigned threads) {
    [[maybe_unused]] static bool const same = mkl_cbwr_set(MKL_CBWR_COMPATIBLE) == MKL_CBWR_SUCCESS;
    if (threads >= 1 && threads <= kMaxThreads) MKL_Set_Num_Threads(static_cast<int>(threads));
}

}  // namespace MORVA::UTILS
