// What the command line asks of the operating system beyond the standard library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "descriptor.h"

namespace morva::cli {

// Device and number: the same for every name of a file.
using FileIdentity = std::pair<std::uint64_t, std::uint64_t>;

// To be called first. Standard streams carry bytes, and terminals know the progress bar's marks.
void prepareStreams();

// The file that this program was started from.
std::filesystem::path programFile();

// Descriptors are not inherited by other programs. -1: not to be had.
Descriptor openForReading(std::filesystem::path const& path);
Descriptor duplicate(int descriptor);
// Makes a file that is open for writing, named `start`, some letters and `ending`. On failure -1
// and the reason in errno.
std::pair<Descriptor, std::filesystem::path> makeNewFile(std::filesystem::path const& start,
                                                         std::string const& ending);

// Only regular files have one.
std::optional<FileIdentity> identityOf(int descriptor);
std::optional<FileIdentity> identityOf(std::filesystem::path const& path);

// Of a regular file; 0 for everything else.
std::uint64_t sizeOf(int descriptor);
// The bytes that were read; 0 at the end and where it fails.
std::size_t readAt(int descriptor, std::uint64_t at, char* bytes, std::size_t count);
// Puts `header` `back` bytes before the end of what was written to a file. False when that fails;
// what is no file, or only takes bytes at its end, stays as it is.
bool rewriteHeader(int descriptor, std::uint64_t back, std::string_view header);

// Gives a new file the permissions that `target` has, or that programs give their files.
void takePermissions(int descriptor, std::filesystem::path const& target);

// Has `last` called, on a thread of its own, when a signal is about to end the program. To be
// called before other threads start.
void beforeEnding(std::function<void()> last);

}  // namespace morva::cli
