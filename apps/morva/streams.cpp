#include "streams.h"

#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "error.h"
#include "morva-ext.h"
#include "platform.h"
#include "utils/diagnostics.h"

namespace morva::cli {
namespace {

constexpr std::string_view blanks = " \t\r\n";

// Where this thread's EngineTalk keeps what it hears.
thread_local std::string* listening = nullptr;

void hear(int /*stream*/, char const* text) {
    if (listening != nullptr) listening->append(text).append("\n");
}

std::string_view trimmed(std::string_view text) {
    auto const first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

// The message of an exception text, otherwise the last line that says something.
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

void hearAndShow(int stream, char const* text) {
    hear(stream, text);
    writeAll(STDERR_FILENO, std::string(text) + "\n");
}

// The library's, and those of the weight reader that `inspect` has linked in.
void takeDiagnostics(MorvaExtDiagnostic take) {
    MorvaExt_SetDiagnostics(take);
    MORVA::UTILS::takeDiagnostics(take);
}

}  // namespace

Streams::Streams(bool verbose)
    : verbose_(verbose), out_(duplicate(STDOUT_FILENO)), err_(duplicate(STDERR_FILENO)) {
    takeDiagnostics(verbose_ ? hearAndShow : hear);
}

Streams::~Streams() {
    takeDiagnostics(nullptr);
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

EngineTalk::EngineTalk() {
    listening = &heard_;
}

EngineTalk::~EngineTalk() {
    listening = nullptr;
}

std::string EngineTalk::reason() const {
    return explain(heard_);
}

}  // namespace morva::cli
