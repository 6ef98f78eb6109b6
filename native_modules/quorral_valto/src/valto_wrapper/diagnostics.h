// What the host module says: printed on standard output, where the engine's lines go, too, or
// handed to who takes both. Thread rule: any thread, no lock.
#pragma once

#include <string>

#include "morva-sdk/morva-ext.h"

namespace quorral {

void Say(const std::string& line);

// As MorvaExt_SetDiagnostics, which it calls.
void TakeDiagnostics(MorvaExtDiagnostic take);

}  // namespace quorral
