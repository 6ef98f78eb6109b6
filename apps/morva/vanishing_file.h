// Files that go with their holder, unless they are given a lasting name: whatever ends the holder,
// an exception or a signal that ends the process.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

#include "descriptor.h"

namespace morva::cli {

// Lets a thread wait for the signals that end a program (interrupt, termination, hang-up); it
// removes what vanishes, then the process ends by the signal. To be called before other threads
// start, since these must not take the signals.
void removeVanishingFilesOnSignals();

// Threads: different ones may hold different files.
class VanishingFile {
public:
    // Makes an empty file whose name is `start`, some letters and `ending`. Errors, here and below,
    // speak of it as `knownAs`.
    VanishingFile(std::filesystem::path const& start, std::string const& ending,
                  std::string knownAs);
    ~VanishingFile();
    VanishingFile(VanishingFile const&) = delete;
    VanishingFile& operator=(VanishingFile const&) = delete;

    std::filesystem::path const& path() const { return path_; }
    // Open for writing.
    Descriptor const& descriptor() const { return descriptor_; }

    void write(std::string_view text);
    // Takes the place of `target`.
    void become(std::filesystem::path const& target);

private:
    [[noreturn]] void fail(int reason) const;

    std::string knownAs_;
    std::filesystem::path path_;
    Descriptor descriptor_;
};

}  // namespace morva::cli
