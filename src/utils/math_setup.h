// One-time settings of the math library. [control thread]; call before the first transform or
// product, since the library fixes its code path on first use.
#pragma once

namespace MORVA::UTILS {

// Chooses reproducible results (the same bits from run to run, whatever the alignment of the
// operands) once per process, and for 1 .. 8 sets the library's thread count on every call. Other
// counts leave it as it is.
void configureMathLibrary(unsigned threads);

}  // namespace MORVA::UTILS
