// Text conversion and the place where the module lies. Thread rule: any thread.
#pragma once

#include <string>

namespace quorral::util {

// Each wchar_t is one full code point. Throws std::range_error for what UTF-8 cannot express.
std::string ToUTF8(const std::wstring& text);

// UTF-16 code units, one per wchar_t: a character outside the Basic Multilingual Plane becomes two
// surrogates. Deliberately not the inverse of ToUTF8 for those. Throws std::range_error for
// ill-formed UTF-8.
std::wstring ToUTF16(const std::string& text);

// Directory of the file that this code was loaded from, without the separator behind it. Empty when
// unknown.
std::string ModuleBasePath();

}  // namespace quorral::util
