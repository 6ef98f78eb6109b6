#include "noise_canceller/parameter_reader.h"

#include "utils/diagnostics.h"
#include "utils/plain_number.h"

namespace MORVA::NOISE_CANCELLER {

ParameterReader::ParameterReader(Environment const& environment, char const* suffix)
    : environment_(environment), suffix_(suffix) {}

std::string ParameterReader::key(char const* name) const {
    return std::string("MORVA_") + name + suffix_;
}

std::shared_ptr<std::string> ParameterReader::text(std::string const& key) const {
    return environment_.second.find<std::string>(key);
}

template <class T>
std::shared_ptr<T> ParameterReader::stored(std::string const& key) const {
    return environment_.first->values().template find<T>("CONTROL_" + key);
}

float ParameterReader::real(char const* name, float byDefault) const {
    auto const k = key(name);
    if (auto const value = text(k)) return UTILS::toReal(*value);
    if (auto const value = stored<float>(k)) return *value;
    return byDefault;
}

int ParameterReader::integer(char const* name, int byDefault) const {
    auto const k = key(name);
    if (auto const value = text(k)) return UTILS::toInteger(*value);
    if (auto const value = stored<int>(k)) return *value;
    return byDefault;
}

float ParameterReader::wholeNumber(char const* name, float byDefault) const {
    auto const k = key(name);
    if (auto const value = text(k)) return static_cast<float>(UTILS::toInteger(*value));
    if (auto const value = stored<int>(k)) return static_cast<float>(*value);
    if (auto const value = stored<float>(k)) return *value;
    return byDefault;
}

bool ParameterReader::isOn(char const* name, bool byDefault) const {
    auto const k = key(name);
    if (auto const value = text(k)) return *value == "TRUE";
    if (auto const value = stored<std::string>(k)) return *value == "t";
    return byDefault;
}

float checkedOrDefault(float value, bool inRange, char const* warning, float byDefault) {
    if (inRange) return value;
    UTILS::say(UTILS::Channel::output, warning);
    return byDefault;
}

}  // namespace MORVA::NOISE_CANCELLER
