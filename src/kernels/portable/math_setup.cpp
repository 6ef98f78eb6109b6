#include "kernels/math_setup.h"

namespace MORVA::UTILS {

void configureMathLibrary(unsigned) {}  // one code path, one thread

}  // namespace MORVA::UTILS
