// Looks up a model's tunable parameters by name: first in the model's environment (text under
// MORVA_ + name + version suffix), then in its weight (typed, under CONTROL_ + that key), then the
// built-in default. A value that is out of range falls back to the default with a line on standard
// output. [control thread]
#pragma once

#include <string>

#include "weights/any_map.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

class ParameterReader {
public:
    using Environment = CONTAINERS::ModelEnvironment::element_type;

    // `suffix` is the version part of every key, "_v0_0_6" for example.
    ParameterReader(Environment const& environment, char const* suffix);

    float real(char const* name, float byDefault) const;
    int integer(char const* name, int byDefault) const;
    // A whole number kept as float: read with atoi from text; a weight may store an int or a float.
    float wholeNumber(char const* name, float byDefault) const;
    // On only for "TRUE" in the environment and for "t" in the weight.
    bool isOn(char const* name, bool byDefault) const;

private:
    std::string key(char const* name) const;
    std::shared_ptr<std::string> text(std::string const& key) const;
    template <class T>
    std::shared_ptr<T> stored(std::string const& key) const;

    Environment const& environment_;
    std::string suffix_;
};

// `value` if `inRange`, else the default after printing `warning`.
float checkedOrDefault(float value, bool inRange, char const* warning, float byDefault);

}  // namespace MORVA::NOISE_CANCELLER
