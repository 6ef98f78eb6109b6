#include "formatted.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>

namespace morva::cli {

std::string formatted(char const* format, ...) {
    char text[512];
    va_list arguments;
    va_start(arguments, format);
    // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): started in the line above
    int const length = std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    return std::string(text,
                       std::min(static_cast<std::size_t>(std::max(length, 0)), sizeof text - 1));
}

}  // namespace morva::cli
