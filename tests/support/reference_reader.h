// The weight format read the slow and plain way, as an oracle, and a loaded weight written back, so
// that the two can be compared byte by byte.
#pragma once

#include <cstdint>
#include <cstring>
#include <map>
#include <string>
#include <string_view>

#include "support/weight_writer.h"
#include "weights/any_map.h"

namespace test_support {

// Name to the bytes of its first whole record, from the name length on.
using Records = std::map<std::string, std::string>;

class ReferenceReader {
public:
    explicit ReferenceReader(std::string_view data) : data_(data) {}

    Records read() {
        Records records;
        try {
            while (true) {
                auto const start = at_;
                auto const length = u32();
                skip(length);
                auto const name = data_.substr(start + 4, static_cast<std::size_t>(length));
                auto const code = u32();
                if (code > 6) continue;
                skipValue(code);
                records.try_emplace(std::string(name), data_.substr(start, at_ - start));
            }
        } catch (Cut const&) {
            return records;
        }
    }

private:
    struct Cut {};

    void skip(std::uint64_t size) {
        if (size > data_.size() - at_) throw Cut();
        at_ += size;
    }
    std::uint64_t u32() {
        auto const start = at_;
        skip(4);
        std::uint32_t value = 0;
        std::memcpy(&value, data_.data() + start, 4);
        return value;
    }
    void skipMatrix() {
        auto const rows = u32();
        auto const cols = u32();
        if (cols > 0x7fffffffU || (rows > 0 && cols > data_.size() / rows)) throw Cut();
        skip(rows * cols * 4);
    }
    void skipValue(std::uint64_t code) {
        if (code < 2) return skip(4);
        if (code == 2) return skip(u32());
        if (code == 3) return skip(4 * u32());
        if (code == 4) return skipMatrix();
        for (auto count = u32(); count > 0; --count) skipValue(code - 2);
    }

    std::string_view data_;
    std::size_t at_ = 0;
};

template <class... Types>
Records writeBackAs(MORVA::CONTAINERS::AnyMap const& values) {
    Records records;
    auto const isWritten = [&]<class T>(std::string const& name, T const* value) {
        if (value != nullptr) records[name] = WeightWriter().add(name, *value).bytes();
        return value != nullptr;
    };
    for (auto const& [name, object] : values) {
        bool const known = (isWritten(name, values.find<Types>(name).get()) || ...);
        if (!known) records[name] = "unknown type";
    }
    return records;
}

inline Records writeBack(MORVA::CONTAINERS::AnyMap const& values) {
    return writeBackAs<float, int, std::string, WeightWriter::Vector, WeightWriter::Matrix,
                       WeightWriter::Vectors, WeightWriter::Matrices>(values);
}

}  // namespace test_support
