#include "vanishing_file.h"

#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <system_error>

#include "descriptor.h"
#include "error.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

// Creates the file.
std::string newTemporaryName(std::string const& ending) {
    auto name = (fs::temp_directory_path() / ("morva-XXXXXX" + ending)).string();
    Descriptor const created(::mkstemps(name.data(), static_cast<int>(ending.size())));
    if (created.get() < 0)
        throw Error("cannot write a temporary file: " + std::generic_category().message(errno));
    return name;
}

}  // namespace

VanishingFile::~VanishingFile() {
    std::error_code ignored;
    if (!path_.empty()) fs::remove(path_, ignored);
}

void VanishingFile::become(fs::path const& target) {
    fs::rename(path_, target);
    path_.clear();
}

TemporaryFile::TemporaryFile(std::string const& ending, std::string const& content)
    : file_(newTemporaryName(ending)) {
    std::ofstream stream(file_.path(), std::ios::binary);
    if (!(stream << content << std::flush)) throw Error("cannot write " + file_.path().string());
}

}  // namespace morva::cli
