// File descriptors that close themselves, and files that are held in memory.
#pragma once

#include <string>
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

// Empty, open for reading and writing; -1 when the system has none to give.
Descriptor memoryFile();

// What stands in the file from `start` on.
std::string contentFrom(Descriptor const& file, long start);

}  // namespace morva::cli
