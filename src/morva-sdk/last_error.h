// The last failure that the C interface told, per thread. [any thread]
#pragma once

namespace MORVA::MORVA_SDK {

// Keeps a copy, cut to 1023 bytes. Allocates nothing.
void rememberError(char const* text) noexcept;
// Valid until the next failure on this thread; empty when there was none.
char const* lastError() noexcept;

}  // namespace MORVA::MORVA_SDK
