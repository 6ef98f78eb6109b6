#include "descriptor.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

namespace morva::cli {

Descriptor& Descriptor::operator=(Descriptor&& other) noexcept {
    std::swap(number_, other.number_);
    return *this;
}

Descriptor::~Descriptor() {
    if (number_ >= 0) ::close(number_);
}

int Descriptor::release() {
    return std::exchange(number_, -1);
}

bool writeAll(int descriptor, std::string_view text) noexcept {
    constexpr std::size_t most = 1U << 20;
    while (!text.empty()) {
        auto const count = static_cast<unsigned>(std::min(text.size(), most));
        auto const written = ::write(descriptor, text.data(), count);
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return false;
        text.remove_prefix(static_cast<std::size_t>(written));
    }
    return true;
}

}  // namespace morva::cli
