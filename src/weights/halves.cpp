#include "weights/halves.h"

#include <cstdint>
#include <cstring>
#include <sstream>
#include <utility>

#include "weights/bounded_reader.h"

namespace MORVA::WEIGHTS {

namespace {

// The exponent of a half counts from 15, that of a float from 127; the product is exact, that of
// numbers without a leading one included.
float widened(std::uint16_t half) {
    std::uint32_t const bits = (half & 0x7fffU) << 13U;
    float magnitude = 0.0F;
    std::memcpy(&magnitude, &bits, sizeof magnitude);
    magnitude *= 0x1p112F;
    return (half & 0x8000U) != 0 ? -magnitude : magnitude;
}

class Widener {
public:
    explicit Widener(std::string const& halves) : stream_(halves), reader_(stream_) {}

    std::string operator()() {
        value(copyNumber());
        return std::move(plain_);
    }

private:
    std::uint32_t copyNumber() {
        std::uint32_t number = 0;
        if (reader_.readNumber(number)) append(number);
        return number;
    }

    void value(std::uint32_t typeCode) {
        if (typeCode == 3) floats(copyNumber());
        if (typeCode == 4) {
            std::uint64_t const rows = copyNumber();
            floats(rows * copyNumber());
        }
        if (typeCode == 5 || typeCode == 6) {
            for (auto count = copyNumber(); count > 0 && reader_.good(); --count) {
                value(typeCode - 2);
            }
        }
    }

    void floats(std::uint64_t count) {
        if (count > reader_.bytesLeft() / sizeof(std::uint16_t)) return reader_.endData();
        std::string halves;
        if (!reader_.readString(halves, count * sizeof(std::uint16_t))) return;
        for (std::size_t at = 0; at < halves.size(); at += sizeof(std::uint16_t)) {
            std::uint16_t half = 0;
            std::memcpy(&half, halves.data() + at, sizeof half);
            append(widened(half));
        }
    }

    template <class Number>
    void append(Number number) {
        char bytes[sizeof number];
        std::memcpy(bytes, &number, sizeof number);
        plain_.append(bytes, sizeof number);
    }

    std::istringstream stream_;
    UTILS::BoundedReader reader_;
    std::string plain_;
};

}  // namespace

std::string withWholeFloats(std::string const& halves) {
    return Widener(halves)();
}

}  // namespace MORVA::WEIGHTS
