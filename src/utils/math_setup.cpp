#include "utils/math_setup.h"

#include <mkl_service.h>
#include <mkl_types.h>

namespace MORVA::UTILS {
namespace {

constexpr unsigned maxThreads = 8;

// A named instruction set with strict results is refused on processors of other makers; there the
// automatic choice stays, whose results depend on neither run nor alignment for the operands used
// here (the tests compare them).
bool makeReproducible() {
    return mkl_cbwr_set(MKL_CBWR_AVX2 | MKL_CBWR_STRICT) == MKL_CBWR_SUCCESS ||
           mkl_cbwr_set(MKL_CBWR_AUTO | MKL_CBWR_STRICT) == MKL_CBWR_SUCCESS;
}

}  // namespace

void configureMathLibrary(unsigned threads) {
    [[maybe_unused]] static bool const reproducible = makeReproducible();
    if (threads >= 1 && threads <= maxThreads) MKL_Set_Num_Threads(static_cast<int>(threads));
}

}  // namespace MORVA::UTILS
