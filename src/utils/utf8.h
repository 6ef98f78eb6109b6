// Between UTF-8 and wide strings, which hold code points where wchar_t has 32 bits and UTF-16 where
// it has 16. Both throw std::range_error on what is neither. Any thread.
#pragma once

#include <string>
#include <string_view>

namespace MORVA::UTILS {

std::string toUtf8(std::wstring_view wide);
std::wstring toWide(std::string_view bytes);

}  // namespace MORVA::UTILS
