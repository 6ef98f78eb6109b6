#include "vanishing_file.h"

#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <set>
#include <system_error>
#include <thread>
#include <utility>

#include "error.h"

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

sigset_t endingSignals() {
    sigset_t set;
    sigemptyset(&set);
    for (int const signal : {SIGINT, SIGTERM, SIGHUP}) {
        struct sigaction now {};
        sigaction(signal, nullptr, &now);
        // NOLINTNEXTLINE(*-cast*): the system's constant
        if (now.sa_handler != SIG_IGN) sigaddset(&set, signal);  // a background job ignores some
    }
    return set;
}

[[noreturn]] void endBySignal(Vanishing& all, sigset_t const& awaited) {
    int signal = SIGTERM;
    sigwait(&awaited, &signal);
    std::lock_guard const noMoreChanges(all.changing);
    for (auto const& file : all.files) ::unlink(file.c_str());
    std::signal(signal, SIG_DFL);
    pthread_sigmask(SIG_UNBLOCK, &awaited, nullptr);
    ::kill(::getpid(), signal);
    std::_Exit(128 + signal);
}

}  // namespace

void removeVanishingFilesOnSignals() {
    auto const awaited = endingSignals();
    pthread_sigmask(SIG_BLOCK, &awaited, nullptr);
    std::thread([awaited, all = vanishing()] { endBySignal(*all, awaited); }).detach();
}

VanishingFile::VanishingFile(fs::path const& start, std::string const& ending, std::string knownAs)
    : knownAs_(std::move(knownAs)) {
    auto name = start.string() + "XXXXXX" + ending;
    std::lock_guard const lock(vanishing()->changing);
    descriptor_ = Descriptor(::mkstemps(name.data(), static_cast<int>(ending.size())));
    if (descriptor_.get() < 0) fail();
    path_ = name;
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
    if (!writeAll(descriptor_.get(), text)) fail();
}

void VanishingFile::become(fs::path const& target) {
    std::lock_guard const lock(vanishing()->changing);
    if (::rename(path_.c_str(), target.c_str()) != 0) fail();
    vanishing()->files.erase(path_);
    path_.clear();
}

void VanishingFile::fail() const {
    throw Error(knownAs_ + ": cannot be written: " + std::generic_category().message(errno));
}

}  // namespace morva::cli
