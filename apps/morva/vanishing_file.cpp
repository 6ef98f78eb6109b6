#include "vanishing_file.h"

#include <cerrno>
#include <memory>
#include <mutex>
#include <set>
#include <system_error>
#include <utility>

#include "error.h"
#include "platform.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

// The files that are there and have no lasting name yet.
struct Vanishing {
    std::mutex changing;
    std::set<fs::path> files;
};

// Shared with the thread that waits for signals, which outlives main().
std::shared_ptr<Vanishing> const& vanishing() {
    static auto const all = std::make_shared<Vanishing>();
    return all;
}

}  // namespace

void removeVanishingFilesOnSignals() {
    beforeEnding([all = vanishing()] {
        all->changing.lock();  // for good: no more changes
        std::error_code ignored;
        for (auto const& file : all->files) fs::remove(file, ignored);
    });
}

VanishingFile::VanishingFile(fs::path const& start, std::string const& ending, std::string knownAs)
    : knownAs_(std::move(knownAs)) {
    std::lock_guard const lock(vanishing()->changing);
    auto [descriptor, name] = makeNewFile(start, ending);
    if (descriptor.get() < 0) fail(errno);
    descriptor_ = std::move(descriptor);
    path_ = std::move(name);
    vanishing()->files.insert(path_);
}

VanishingFile::~VanishingFile() {
    std::error_code ignored;
    if (path_.empty()) return;
    fs::remove(path_, ignored);
    std::lock_guard const lock(vanishing()->changing);
    vanishing()->files.erase(path_);
}

void VanishingFile::write(std::string_view text) {
    if (!writeAll(descriptor_.get(), text)) fail(errno);
}

void VanishingFile::become(fs::path const& target) {
    std::lock_guard const lock(vanishing()->changing);
    std::error_code error;
    fs::rename(path_, target, error);
    if (error) fail(error.default_error_condition().value());
    vanishing()->files.erase(path_);
    path_.clear();
}

void VanishingFile::fail(int reason) const {
    throw Error(knownAs_ + ": cannot be written: " + std::generic_category().message(reason));
}

}  // namespace morva::cli
