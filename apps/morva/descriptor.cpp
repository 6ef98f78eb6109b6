#include "descriptor.h"

#include <sys/mman.h>
#include <unistd.h>

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
    while (!text.empty()) {
        auto const written = ::write(descriptor, text.data(), text.size());
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return false;
        text.remove_prefix(static_cast<std::size_t>(written));
    }
    return true;
}

Descriptor memoryFile() {
    return Descriptor(::memfd_create("morva", MFD_CLOEXEC));
}

std::string contentFrom(Descriptor const& file, long start) {
    std::string text;
    char block[4096];
    for (auto at = start;;) {
        auto const got = ::pread(file.get(), block, sizeof block, at);
        if (got <= 0) return text;
        text.append(block, static_cast<std::size_t>(got));
        at += got;
    }
}

}  // namespace morva::cli
