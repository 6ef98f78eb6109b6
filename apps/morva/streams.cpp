#include "streams.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <iostream>
#include <system_error>

#include "error.h"

namespace morva::cli {
namespace {

constexpr std::string_view blanks = " \t\r\n";

std::string_view trimmed(std::string_view text) {
    auto const first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

void flushLibraries() {
    std::cout.flush();
    std::cerr.flush();
    std::fflush(nullptr);
}

}  // namespace

Streams::Streams(bool verbose)
    : verbose_(verbose),
      out_(::fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, 3)),
      err_(::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3)),
      heard_(memoryFile()) {
    if (heard_.get() >= 0) ::fcntl(heard_.get(), F_SETFL, O_APPEND);
    int const target = verbose_ ? err_.get() : heard_.get();
    if (target >= 0) ::dup2(target, STDOUT_FILENO);
}

Streams::~Streams() {
    flushLibraries();
    if (out_.get() >= 0) ::dup2(out_.get(), STDOUT_FILENO);
}

void Streams::out(std::string_view text) {
    if (!writeAll(out_.get(), text)) {
        throw Error(std::string("cannot write to standard output: ") +
                    std::generic_category().message(errno));
    }
}

void Streams::err(std::string_view text) noexcept {
    writeAll(err_.get(), text);
}

bool Streams::errIsTerminal() const {
    return ::isatty(err_.get()) == 1;
}

EngineTalk::EngineTalk(Streams& streams) : streams_(streams), lock_(streams.talking_) {
    if (streams_.verbose_ || streams_.heard_.get() < 0) return;
    flushLibraries();
    from_ = ::lseek(streams_.heard_.get(), 0, SEEK_END);
    ::dup2(streams_.heard_.get(), STDERR_FILENO);
}

EngineTalk::~EngineTalk() {
    if (streams_.verbose_ || streams_.err_.get() < 0) return;
    flushLibraries();
    ::dup2(streams_.err_.get(), STDERR_FILENO);
}

std::string EngineTalk::reason() const {
    flushLibraries();
    return explain(contentFrom(streams_.heard_, from_));
}

std::string explain(std::string_view diagnostics) {
    constexpr std::string_view mark = "messege ";
    if (auto const at = diagnostics.rfind(mark); at != std::string_view::npos) {
        return std::string(trimmed(diagnostics.substr(at + mark.size())));
    }
    auto const text = trimmed(diagnostics);
    auto const lineStart = text.rfind('\n');
    return std::string(
        trimmed(lineStart == std::string_view::npos ? text : text.substr(lineStart)));
}

}  // namespace morva::cli
