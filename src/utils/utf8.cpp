#include "utils/utf8.h"

#include <bit>
#include <cstddef>
#include <stdexcept>

namespace MORVA::UTILS {
namespace {

constexpr bool kUtf16 = sizeof(wchar_t) == 2;

char32_t checked(char32_t point) {
    bool const surrogate = point >= 0xd800 && point < 0xe000;
    if (surrogate || point > 0x10ffff) throw std::range_error("text with no code point");
    return point;
}

char32_t takePoint(std::wstring_view& wide) {
    auto const unit = static_cast<char32_t>(wide.front());
    bool const pair = kUtf16 && wide.size() > 1 && (unit & 0xfc00) == 0xd800 &&
                      (static_cast<char32_t>(wide[1]) & 0xfc00) == 0xdc00;
    char32_t const point =
        pair ? 0x10000 + ((unit & 0x3ff) << 10) + (static_cast<char32_t>(wide[1]) & 0x3ff) : unit;
    wide.remove_prefix(pair ? 2 : 1);
    return checked(point);
}

char32_t takePoint(std::string_view& bytes) {
    auto const lead = static_cast<unsigned char>(bytes.front());
    auto const ones = static_cast<std::size_t>(std::countl_one(lead));
    std::size_t const length = ones == 0 ? 1 : ones;
    bool good = ones != 1 && ones <= 4 && length <= bytes.size();
    char32_t point = lead & (0x7fU >> ones);
    for (std::size_t i = 1; good && i < length; ++i) {
        auto const next = static_cast<unsigned char>(bytes[i]);
        good = (next & 0xc0) == 0x80;
        point = point << 6 | (next & 0x3fU);
    }
    constexpr char32_t kShortest[] = {0, 0, 0x80, 0x800, 0x10000};
    if (!good || point < kShortest[length]) throw std::range_error("text that is not UTF-8");
    bytes.remove_prefix(length);
    return checked(point);
}

}  // namespace

std::string toUtf8(std::wstring_view wide) {
    std::string bytes;
    while (!wide.empty()) {
        char32_t const point = takePoint(wide);
        int const more = point < 0x80 ? 0 : point < 0x800 ? 1 : point < 0x10000 ? 2 : 3;
        constexpr unsigned kLead[] = {0, 0xc0, 0xe0, 0xf0};
        bytes += static_cast<char>(kLead[more] | point >> (6 * more));
        for (int i = more - 1; i >= 0; --i)
            bytes += static_cast<char>(0x80 | (point >> (6 * i) & 0x3f));
    }
    return bytes;
}

std::wstring toWide(std::string_view bytes) {
    std::wstring wide;
    while (!bytes.empty()) {
        char32_t const point = takePoint(bytes);
        if (kUtf16 && point >= 0x10000) {
            wide += static_cast<wchar_t>(0xd800 + ((point - 0x10000) >> 10));
            wide += static_cast<wchar_t>(0xdc00 + (point & 0x3ff));
        } else {
            wide += static_cast<wchar_t>(point);
        }
    }
    return wide;
}

}  // namespace MORVA::UTILS
