// Names are wide inside; as text they are UTF-8, which the program's manifest asks for.
#include <fcntl.h>
#include <io.h>
#include <windows.h>

#include <cerrno>
#include <memory>
#include <random>

#include "platform.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

HANDLE handleOf(int descriptor) {
    auto const handle = ::_get_osfhandle(descriptor);
    return handle < 0 ? INVALID_HANDLE_VALUE : reinterpret_cast<HANDLE>(handle);
}

std::optional<BY_HANDLE_FILE_INFORMATION> factsOf(int descriptor) {
    BY_HANDLE_FILE_INFORMATION facts{};
    HANDLE const handle = handleOf(descriptor);
    bool const known = ::GetFileType(handle) == FILE_TYPE_DISK &&
                       ::GetFileInformationByHandle(handle, &facts) != 0 &&
                       (facts.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) == 0;
    return known ? std::optional(facts) : std::nullopt;
}

std::uint64_t joined(DWORD high, DWORD low) {
    return std::uint64_t{high} << 32 | low;
}

int errorNumber(DWORD error) {
    switch (error) {
        case ERROR_FILE_EXISTS:
            return EEXIST;
        case ERROR_FILE_NOT_FOUND:
        case ERROR_PATH_NOT_FOUND:
            return ENOENT;
        case ERROR_ACCESS_DENIED:
        case ERROR_SHARING_VIOLATION:
            return EACCES;
        case ERROR_DISK_FULL:
            return ENOSPC;
        default:
            return EIO;
    }
}

// Others may read, write, rename and remove the file meanwhile.
Descriptor open(fs::path const& path, DWORD access, DWORD creation, int flags) {
    constexpr DWORD forAll = FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE;
    HANDLE const handle = ::CreateFileW(path.c_str(), access, forAll, nullptr, creation,
                                        FILE_ATTRIBUTE_NORMAL, nullptr);
    if (handle == INVALID_HANDLE_VALUE) {
        errno = errorNumber(::GetLastError());
        return Descriptor();
    }
    return Descriptor(::_open_osfhandle(reinterpret_cast<std::intptr_t>(handle), flags));
}

// Works at another place of the file, and comes back to where it is.
class Elsewhere {
public:
    Elsewhere(int descriptor, std::uint64_t at)
        : descriptor_(descriptor), here_(::_telli64(descriptor)) {
        place_.Offset = static_cast<DWORD>(at);
        place_.OffsetHigh = static_cast<DWORD>(at >> 32);
    }
    ~Elsewhere() { ::_lseeki64(descriptor_, here_, SEEK_SET); }
    Elsewhere(Elsewhere const&) = delete;
    Elsewhere& operator=(Elsewhere const&) = delete;

    OVERLAPPED* place() { return &place_; }

private:
    int descriptor_;
    __int64 here_;
    OVERLAPPED place_{};
};

// Lives as long as the process, since the system calls it on a thread of its own.
std::function<void()>& beforeTheEnd() {
    static auto& last = *std::make_unique<std::function<void()>>().release();
    return last;
}

BOOL WINAPI onControl(DWORD /*event*/) {
    beforeTheEnd()();
    return FALSE;  // the system's own handler ends the program
}

}  // namespace

void prepareStreams() {
    // A descriptor that is not open is a failed call, and does not end the program.
    ::_set_invalid_parameter_handler(
        [](wchar_t const*, wchar_t const*, wchar_t const*, unsigned, std::uintptr_t) {});
    for (int const stream : {0, 1, 2}) ::_setmode(stream, _O_BINARY);
    HANDLE const terminal = handleOf(2);
    DWORD mode = 0;
    if (::GetConsoleMode(terminal, &mode) != 0)
        ::SetConsoleMode(terminal, mode | ENABLE_VIRTUAL_TERMINAL_PROCESSING);
    ::SetConsoleOutputCP(CP_UTF8);
}

fs::path programFile() {
    std::wstring name(MAX_PATH, L'\0');
    for (;;) {
        auto const length =
            ::GetModuleFileNameW(nullptr, name.data(), static_cast<DWORD>(name.size()));
        if (length < name.size()) return name.substr(0, length);
        name.resize(2 * name.size());
    }
}

Descriptor openForReading(fs::path const& path) {
    return open(path, GENERIC_READ, OPEN_EXISTING, _O_RDONLY | _O_BINARY | _O_NOINHERIT);
}

Descriptor duplicate(int descriptor) {
    return Descriptor(::_dup(descriptor));
}

std::pair<Descriptor, fs::path> makeNewFile(fs::path const& start, std::string const& ending) {
    std::random_device random;
    for (;;) {
        fs::path name = start;
        name += std::to_string(random() % 1000000) + ending;
        auto file = open(name, GENERIC_READ | GENERIC_WRITE, CREATE_NEW, _O_RDWR | _O_BINARY);
        if (file.get() >= 0 || errno != EEXIST) return {std::move(file), std::move(name)};
    }
}

std::optional<FileIdentity> identityOf(int descriptor) {
    auto const facts = factsOf(descriptor);
    if (!facts) return std::nullopt;
    return FileIdentity(facts->dwVolumeSerialNumber,
                        joined(facts->nFileIndexHigh, facts->nFileIndexLow));
}

std::optional<FileIdentity> identityOf(fs::path const& path) {
    return identityOf(openForReading(path).get());
}

std::uint64_t sizeOf(int descriptor) {
    auto const facts = factsOf(descriptor);
    return facts ? joined(facts->nFileSizeHigh, facts->nFileSizeLow) : 0;
}

std::size_t readAt(int descriptor, std::uint64_t at, char* bytes, std::size_t count) {
    Elsewhere there(descriptor, at);
    DWORD got = 0;
    ::ReadFile(handleOf(descriptor), bytes, static_cast<DWORD>(count), &got, there.place());
    return got;
}

bool rewriteHeader(int descriptor, std::uint64_t back, std::string_view header) {
    auto const end = ::_telli64(descriptor);
    if (!factsOf(descriptor) || end < 0) return true;
    Elsewhere there(descriptor, static_cast<std::uint64_t>(end) - back);
    DWORD done = 0;
    return ::WriteFile(handleOf(descriptor), header.data(), static_cast<DWORD>(header.size()),
                       &done, there.place()) != 0;
}

void takePermissions(int /*descriptor*/, fs::path const& /*target*/) {}  // those of the folder

void beforeEnding(std::function<void()> last) {
    beforeTheEnd() = std::move(last);
    ::SetConsoleCtrlHandler(onControl, TRUE);
}

}  // namespace morva::cli
