// The engine's one exception type. Every layer throws it; the C interface turns it into a code.
#pragma once

#include <exception>
#include <string>

namespace MORVA::UTILS {

class MORVA_Exception : public std::exception {
public:
    // Copies the texts and composes what() from them.
    MORVA_Exception(char const* message, char const* file, int line, char const* function);

    char const* what() const noexcept override { return message_.c_str(); }
    std::string const& file() const { return file_; }
    std::string const& function() const { return function_; }
    int line() const { return line_; }

private:
    std::string message_;  // the composed text
    std::string file_;
    std::string function_;
    int line_;
};

// Throws with the caller's own line; `file` is the unit's path without its ending. (A builtin and
// not std::source_location, which the fuzzers' compiler does not have yet.)
[[noreturn]] void raise(std::string const& message, char const* file, char const* function,
                        int line = __builtin_LINE());

}  // namespace MORVA::UTILS
