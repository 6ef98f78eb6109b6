// Script value to native value. Nothing when the value has another type or the runtime refuses.
#pragma once

#include <string>

#include "native/node_api/optional.h"
#include "native/node_api/value.h"

namespace quorral::node_api {

template <class T>
struct NativeValue;

template <>
struct NativeValue<std::string> {
    // UTF-8; lone surrogates come as the replacement character. A NUL inside is kept.
    static Optional<std::string> Get(const Value& value);
};

}  // namespace quorral::node_api
