// The project's name for "a value or nothing", the result of every conversion that can fail.
#pragma once

#include <optional>

namespace quorral {

template <class T>
using Optional = std::optional<T>;

}  // namespace quorral
