// A registered model: its weight (null until one is loaded) and its environment parameters, which
// are always strings, besides the objects that the model's sessions share.
#pragma once

#include <memory>
#include <utility>

#include "weights/any_map.h"
#include "weights/weight.h"

namespace MORVA::CONTAINERS {

using ModelEnvironment = std::shared_ptr<std::pair<std::shared_ptr<WEIGHTS::Weight>, AnyMap>>;

inline ModelEnvironment makeModelEnvironment() {
    return std::make_shared<ModelEnvironment::element_type>();
}

}  // namespace MORVA::CONTAINERS
