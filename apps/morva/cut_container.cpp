#include "cut_container.h"

#include <string>

#include "platform.h"

namespace morva::cli {
namespace {

class Bytes {
public:
    explicit Bytes(int descriptor) : descriptor_(descriptor), size_(sizeOf(descriptor)) {}

    std::uint64_t size() const { return size_; }

    // Less than `count` where the file ends.
    std::string text(std::uint64_t at, std::size_t count) const {
        std::string text(count, '\0');
        text.resize(at < size_ ? readAt(descriptor_, at, text.data(), count) : 0);
        return text;
    }

    std::uint64_t number(std::uint64_t at, std::size_t count, bool bigEndian) const {
        auto bytes = text(at, count);
        if (!bigEndian) bytes.assign(bytes.rbegin(), bytes.rend());
        std::uint64_t value = 0;
        for (char const byte : bytes) value = value << 8 | static_cast<unsigned char>(byte);
        return value;
    }

private:
    int descriptor_;
    std::uint64_t size_;
};

}  // namespace

bool isPlaceholder(std::uint64_t length) {
    constexpr std::uint64_t near = 1U << 16;
    auto const isNear = [&](std::uint64_t mark) {
        return length + near > mark && length < mark + near;
    };
    return length == 0 || isNear(std::uint64_t{1} << 31) || isNear(std::uint64_t{1} << 32);
}

bool endsInsideSound(int descriptor) {
    Bytes const file(descriptor);
    auto const kind = file.text(0, 4);
    bool const bigEndian = kind == "FORM" || kind == "RIFX";
    if (!bigEndian && kind != "RIFF" && kind != "RF64") return false;
    std::uint64_t longLength = 0;
    for (std::uint64_t at = 12; at < file.size();) {
        auto const id = file.text(at, 4);
        auto const length = file.number(at + 4, 4, bigEndian);
        if (id == "ds64") longLength = file.number(at + 16, 8, false);
        if (id == "data" || id == "SSND") {
            if (!isPlaceholder(length)) return at + 8 + length > file.size();
            return kind == "RF64" && at + 8 + longLength > file.size();
        }
        at += 8 + length + length % 2;
    }
    return false;
}

}  // namespace morva::cli
