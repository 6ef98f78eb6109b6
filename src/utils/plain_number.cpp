#include "utils/plain_number.h"

#include <locale.h>
#include <stdlib.h>
#ifdef __APPLE__
#include <xlocale.h>
#endif

#include <algorithm>
#include <limits>

namespace MORVA::UTILS {
namespace {

#ifdef _WIN32  // the same function under another name
_locale_t plainLocale() {
    static _locale_t const plain = _create_locale(LC_ALL, "C");
    return plain;
}
auto const realIn = &_strtod_l;
#else
locale_t plainLocale() {
    static locale_t const plain = newlocale(LC_ALL_MASK, "C", nullptr);
    return plain;
}
auto const realIn = &strtod_l;
#endif

}  // namespace

float toReal(std::string const& text) {
    return static_cast<float>(realIn(text.c_str(), nullptr, plainLocale()));
}

int toInteger(std::string const& text) {
    long const value = strtol(text.c_str(), nullptr, 10);  // asks no locale
    return static_cast<int>(
        std::clamp<long>(value, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()));
}

}  // namespace MORVA::UTILS
