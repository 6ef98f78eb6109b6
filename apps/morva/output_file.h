// What every command that writes a file does: spare the files that it reads, and write beside the
// target, which is replaced only by a complete result.
#pragma once

#include <filesystem>
#include <initializer_list>
#include <set>
#include <string_view>

#include "platform.h"
#include "vanishing_file.h"

namespace morva::cli {

// The name that stands for standard input and output.
inline constexpr std::string_view standardStream = "-";

// Files that are read, known by device and number, so that links to them are known as well.
class InputFiles {
public:
    InputFiles() = default;
    // Empty paths and files that do not exist count for nothing.
    InputFiles(std::initializer_list<std::filesystem::path> paths);

    void add(std::filesystem::path const& path);
    // Throws Error when `output` is one of them.
    void mustNotHold(std::filesystem::path const& output) const;

private:
    std::set<FileIdentity> files_;
};

class OutputFile {
public:
    // Throws Error when the target is there and is no regular file, or when nothing can be made
    // beside it.
    explicit OutputFile(std::filesystem::path const& target);

    VanishingFile& unfinished() { return unfinished_; }
    // Gives it the target's name. Throws Error.
    void finish();

private:
    std::filesystem::path target_;
    VanishingFile unfinished_;
};

}  // namespace morva::cli
