// File descriptors that close themselves.
#pragma once

#include <string_view>

namespace morva::cli {

class Descriptor {
public:
    explicit Descriptor(int number = -1) : number_(number) {}
    Descriptor(Descriptor&& other) noexcept : number_(other.release()) {}
    Descriptor& operator=(Descriptor&& other) noexcept;
    ~Descriptor();

    int get() const { return number_; }
    int release();

private:
    int number_;
};

// False when not all can be written.
bool writeAll(int descriptor, std::string_view text) noexcept;

}  // namespace morva::cli
