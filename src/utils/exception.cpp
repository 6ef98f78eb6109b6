#include "utils/exception.h"

#include <sstream>

namespace MORVA::UTILS {

MORVA_Exception::MORVA_Exception(char const* message, char const* file, int line,
                                 char const* function)
    : message_(message), file_(file), function_(function), line_(line) {
    std::ostringstream text;
    text << "MORVA_Exeption in file " << file_ << " Line " << line_ << " Function " << function_
         << "\n messege " << message_;
    message_ = text.str();
}

void raise(std::string const& message, char const* file, char const* function, int line) {
    throw MORVA_Exception(message.c_str(), file, line, function);
}

}  // namespace MORVA::UTILS
