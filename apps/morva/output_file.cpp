#include "output_file.h"

#include <unistd.h>

#include <optional>
#include <system_error>

#include "error.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

std::optional<FileIdentity> identity(fs::path const& path) {
    return path == standardStream ? identityOf(STDIN_FILENO) : identityOf(path);
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
    takePermissions(unfinished_.descriptor().get(), target_);
    unfinished_.become(target_);
}

}  // namespace morva::cli
