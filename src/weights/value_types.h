// The seven types that a value of the weight format can have, and the one way to visit a value
// without knowing which of them it is.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "kernels/matrix.h"
#include "weights/any_map.h"

namespace MORVA::WEIGHTS {

template <class... Types>
struct TypeList {};

// In the order of their type codes, from 0 on.
using ValueTypes = TypeList<float, int, std::string, std::vector<float>, CONTAINERS::Matrix,
                            std::vector<std::vector<float>>, std::vector<CONTAINERS::Matrix>>;

namespace DETAIL {

template <class Visitor, class... Types>
bool visitValue(CONTAINERS::AnyMap const& values, std::string_view name, Visitor&& visitor,
                TypeList<Types...>) {
    auto const visit = [&](auto const& found) {
        if (found) visitor(*found);
        return found != nullptr;
    };
    return (visit(values.find<Types>(name)) || ...);
}

}  // namespace DETAIL

// Calls `visitor` with the value of that name. False when there is none, or none of these types.
template <class Visitor>
bool visitValue(CONTAINERS::AnyMap const& values, std::string_view name, Visitor&& visitor) {
    return DETAIL::visitValue(values, name, visitor, ValueTypes{});
}

}  // namespace MORVA::WEIGHTS
