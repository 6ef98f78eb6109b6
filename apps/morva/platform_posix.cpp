#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <string>
#include <system_error>
#include <thread>

#include "platform.h"

#ifdef __APPLE__
#include <mach-o/dyld.h>
#endif

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

std::optional<FileIdentity> identity(struct stat const& facts) {
    if (!S_ISREG(facts.st_mode)) return std::nullopt;
    return FileIdentity(facts.st_dev, facts.st_ino);
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

[[noreturn]] void endBySignal(std::function<void()> const& last, sigset_t const& awaited) {
    int signal = SIGTERM;
    sigwait(&awaited, &signal);
    last();
    std::signal(signal, SIG_DFL);
    pthread_sigmask(SIG_UNBLOCK, &awaited, nullptr);
    ::kill(::getpid(), signal);
    std::_Exit(128 + signal);
}

}  // namespace

void prepareStreams() {}

fs::path programFile() {
    std::error_code error;
#ifdef __APPLE__
    char name[4096];
    std::uint32_t size = sizeof name;
    if (_NSGetExecutablePath(name, &size) != 0) return {};
    return fs::canonical(name, error);
#else
    return fs::read_symlink("/proc/self/exe", error);
#endif
}

Descriptor openForReading(fs::path const& path) {
    return Descriptor(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
}

Descriptor duplicate(int descriptor) {
    return Descriptor(::fcntl(descriptor, F_DUPFD_CLOEXEC, 3));
}

std::pair<Descriptor, fs::path> makeNewFile(fs::path const& start, std::string const& ending) {
    auto name = start.string() + "XXXXXX" + ending;
    Descriptor file(::mkstemps(name.data(), static_cast<int>(ending.size())));
    return {std::move(file), name};
}

std::optional<FileIdentity> identityOf(int descriptor) {
    struct stat facts {};
    return ::fstat(descriptor, &facts) == 0 ? identity(facts) : std::nullopt;
}

std::optional<FileIdentity> identityOf(fs::path const& path) {
    struct stat facts {};
    return ::stat(path.c_str(), &facts) == 0 ? identity(facts) : std::nullopt;
}

std::uint64_t sizeOf(int descriptor) {
    struct stat facts {};
    bool const known = ::fstat(descriptor, &facts) == 0 && S_ISREG(facts.st_mode);
    return known ? static_cast<std::uint64_t>(facts.st_size) : 0;
}

std::size_t readAt(int descriptor, std::uint64_t at, char* bytes, std::size_t count) {
    auto const got = ::pread(descriptor, bytes, count, static_cast<off_t>(at));
    return got > 0 ? static_cast<std::size_t>(got) : 0;
}

bool rewriteHeader(int descriptor, std::uint64_t back, std::string_view header) {
    auto const end = ::lseek(descriptor, 0, SEEK_CUR);
    if (end < 0 || (::fcntl(descriptor, F_GETFL) & O_APPEND) != 0) return true;
    return ::pwrite(descriptor, header.data(), header.size(), end - static_cast<off_t>(back)) >= 0;
}

void takePermissions(int descriptor, fs::path const& target) {
    static mode_t const mask = [] {
        auto const set = ::umask(0);
        ::umask(set);
        return set;
    }();
    struct stat older {};
    ::fchmod(descriptor,
             ::stat(target.c_str(), &older) == 0 ? older.st_mode & 0777U : 0666U & ~mask);
}

void beforeEnding(std::function<void()> last) {
    auto const awaited = endingSignals();
    pthread_sigmask(SIG_BLOCK, &awaited, nullptr);
    std::thread([last = std::move(last), awaited] { endBySignal(last, awaited); }).detach();
}

}  // namespace morva::cli
