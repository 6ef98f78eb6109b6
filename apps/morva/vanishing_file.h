// A file that goes with its holder, whatever ends its life, unless it is given its lasting name.
#pragma once

#include <filesystem>
#include <string>
#include <utility>

namespace morva::cli {

class VanishingFile {
public:
    // The file may be made later, under this name.
    explicit VanishingFile(std::filesystem::path path) : path_(std::move(path)) {}
    ~VanishingFile();
    VanishingFile(VanishingFile const&) = delete;
    VanishingFile& operator=(VanishingFile const&) = delete;

    std::filesystem::path const& path() const { return path_; }

    // Takes the place of `target`. Throws std::filesystem::filesystem_error.
    void become(std::filesystem::path const& target);

private:
    std::filesystem::path path_;
};

// One among the system's temporary files.
class TemporaryFile {
public:
    // Throws Error when it cannot be written.
    TemporaryFile(std::string const& ending, std::string const& content);

    std::filesystem::path const& path() const { return file_.path(); }

private:
    VanishingFile file_;
};

}  // namespace morva::cli
