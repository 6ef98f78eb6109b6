// One-time settings of the math library. [control thread]; call before the first transform or
// product, since the library fixes its code path on first use.
#pragma once

namespace MORVA::UTILS {

// Chooses, once per process, the library's one code path that every processor runs: the same bits
// on processors of all makers. A named instruction set would be refused on those of other makers,
// and the choice left to the library differs between them. It costs a third of a microsecond per
// model frame. For 1 .. 8 also sets the library's thread count, on every call.
void configureMathLibrary(unsigned threads);

}  // namespace MORVA::UTILS
