#include "output_file.h"

#include <sys/stat.h>
#include <unistd.h>

#include <optional>
#include <system_error>

#include "error.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

// Device and number of a regular file.
std::optional<std::pair<dev_t, ino_t>> identity(fs::path const& path) {
    struct stat facts {};
    bool const found = path == standardStream ? ::fstat(STDIN_FILENO, &facts) == 0
                                              : ::stat(path.c_str(), &facts) == 0;
    if (!found || !S_ISREG(facts.st_mode)) return std::nullopt;
    return std::pair(facts.st_dev, facts.st_ino);
}

// What `target` is a link to is written, not the link.
fs::path checked(fs::path const& target) {
    std::error_code error;
    auto const status = fs::status(target, error);
    if (fs::is_directory(status)) throw Error(target.string() + ": is a folder");
    if (!fs::exists(status)) return target;
    if (!fs::is_regular_file(status))
        throw Error(target.string() + ": cannot be written: not a regular file");
    return fs::canonical(target);
}

// As programs make their files; an older one's permissions stay.
mode_t permissionsFor(fs::path const& target) {
    static mode_t const mask = [] {
        auto const set = ::umask(0);
        ::umask(set);
        return set;
    }();
    struct stat older {};
    return ::stat(target.c_str(), &older) == 0 ? older.st_mode & 0777U : 0666U & ~mask;
}

}  // namespace

InputFiles::InputFiles(std::initializer_list<fs::path> paths) {
    for (auto const& path : paths) add(path);
}

void InputFiles::add(fs::path const& path) {
    if (auto const file = identity(path)) files_.insert(*file);
}

void InputFiles::mustNotHold(fs::path const& output) const {
    if (output == standardStream) return;
    auto const file = identity(output);
    if (file && files_.contains(*file))
        throw Error(output.string() + ": is an input as well; choose another output");
}

OutputFile::OutputFile(fs::path const& target)
    : target_(checked(target)), unfinished_(target_.string() + ".part-", "", target.string()) {}

void OutputFile::finish() {
    ::fchmod(unfinished_.descriptor().get(), permissionsFor(target_));
    unfinished_.become(target_);
}

}  // namespace morva::cli
