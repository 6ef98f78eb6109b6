#include "native_modules/quorral_valto/src/valto_wrapper/util.h"

#include "utils/utf8.h"

namespace quorral::util {

std::string ToUTF8(const std::wstring& text) {
    return MORVA::UTILS::toUtf8(text);
}

std::wstring ToUTF16(const std::string& text) {
    std::wstring units;
    for (const wchar_t character : MORVA::UTILS::toWide(text)) {
        const auto point = static_cast<char32_t>(character);
        if (point < 0x10000) {
            units += character;
        } else {
            units += static_cast<wchar_t>(0xD800 + ((point - 0x10000) >> 10));
            units += static_cast<wchar_t>(0xDC00 + (point & 0x3FF));
        }
    }
    return units;
}

}  // namespace quorral::util
