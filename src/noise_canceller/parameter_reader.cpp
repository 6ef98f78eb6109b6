#include "noise_canceller/parameter_reader.h"

#include <locale.h>
#include <stdlib.h>

#include <algorithm>
#include <limits>

#include "utils/diagnostics.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// The host's locale, with its decimal comma, has no say.
locale_t plainLocale() {
    static locale_t const plain = newlocale(LC_ALL_MASK, "C", nullptr);
    return plain;
}

// atof in that locale.
float toReal(std::string const& text) {
    return static_cast<float>(strtod_l(text.c_str(), nullptr, plainLocale()));
}

// atoi, without its undefined behaviour on overflow.
int toInteger(std::string const& text) {
    long const value = strtol_l(text.c_str(), nullptr, 10, plainLocale());
    return static_cast<int>(
        std::clamp<long>(value, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()));
}

}  // namespace

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
    if (auto const value = text(k)) return toReal(*value);
    if (auto const value = stored<float>(k)) return *value;
    return byDefault;
}

int ParameterReader::integer(char const* name, int byDefault) const {
    auto const k = key(name);
    if (auto const value = text(k)) return toInteger(*value);
    if (auto const value = stored<int>(k)) return *value;
    return byDefault;
}

float ParameterReader::wholeNumber(char const* name, float byDefault) const {
    auto const k = key(name);
    if (auto const value = text(k)) return static_cast<float>(toInteger(*value));
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
