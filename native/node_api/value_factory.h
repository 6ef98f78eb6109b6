// Native value to script value. Empty when the runtime refuses (out of memory, shutting down).
#pragma once

#include <string>
#include <vector>

#include "native/node_api/value.h"

namespace quorral::node_api {

template <class T>
struct ValueFactory;

template <>
struct ValueFactory<std::string> {
    static Value Make(const std::string& text);
};

template <>
struct ValueFactory<std::vector<std::string>> {
    static Value Make(const std::vector<std::string>& texts);
};

}  // namespace quorral::node_api
