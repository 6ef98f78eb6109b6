#include "morva-sdk/last_error.h"

#include <algorithm>
#include <array>
#include <cstring>

namespace MORVA::MORVA_SDK {
namespace {

thread_local std::array<char, 1024> text{};

}  // namespace

void rememberError(char const* message) noexcept {
    std::size_t const length = std::min(std::strlen(message), text.size() - 1);
    std::copy_n(message, length, text.begin());
    text[length] = '\0';
}

char const* lastError() noexcept {
    return text.data();
}

}  // namespace MORVA::MORVA_SDK
