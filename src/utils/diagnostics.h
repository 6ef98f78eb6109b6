// What the engine says beside its results: lines for people, printed on standard output or standard
// error unless somebody takes them. [any thread] No lock; memory only where a text is put together.
#pragma once

#include <string>

namespace MORVA::UTILS {

// The values are file descriptors.
enum class Channel : int { output = 1, error = 2 };

using DiagnosticTaker = void (*)(int channel, char const* text);

// Null: printed again, which they are at first. Another thread may still be in the taker before.
void takeDiagnostics(DiagnosticTaker taker) noexcept;

// `end` closes the text where it is printed; a taker gets the text alone.
void say(Channel channel, char const* text, char const* end = "\n") noexcept;
inline void say(Channel channel, std::string const& text, char const* end = "\n") noexcept {
    say(channel, text.c_str(), end);
}

}  // namespace MORVA::UTILS
