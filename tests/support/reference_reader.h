// The weight format read the slow and plain way, as an oracle, and a loaded weight written back, so
// that the two can be compared byte by byte.
#pragma once

#include <cstdint>
#include <cstring>
#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "support/record_writer.h"
#include "weights/any_map.h"

namespace test_support {

// Name to the bytes of its first whole record, from the name length on.
using Records = std::map<std::string, std::string>;

class ReferenceReader {
public:
    explicit ReferenceReader(std::string_view data) : data_(data) {}

    Records read() {
        Records records;
        while (true) {
            auto const start = at_;
            auto const length = u32();
            if (!length || !skip(*length)) return records;
            auto const name = data_.substr(start + 4, *length);
            auto const code = u32();
            if (!code) return records;
            if (*code > 6) continue;
            if (!skipValue(*code)) return records;
            records.try_emplace(std::string(name), data_.substr(start, at_ - start));
        }
    }

private:
    bool skip(std::uint64_t size) {
        if (size > data_.size() - at_) return false;
        at_ += size;
        return true;
    }
    std::optional<std::uint32_t> u32() {
        auto const start = at_;
        if (!skip(4)) return std::nullopt;
        std::uint32_t value = 0;
        std::memcpy(&value, data_.data() + start, 4);
        return value;
    }
    bool skipList(bool ofMatrices) {
        auto const count = u32();
        if (!count) return false;
        for (std::uint32_t i = 0; i < *count; ++i) {
            if (!(ofMatrices ? skipMatrix() : skipElements(4))) return false;
        }
        return true;
    }
    bool skipElements(std::uint64_t size) {
        auto const count = u32();
        return count && skip(*count * size);
    }
    bool skipMatrix() {
        auto const rows = u32();
        auto const cols = u32();
        return rows && cols && *cols <= 0x7fffffffU && skipFloats(*rows, *cols);
    }
    bool skipFloats(std::uint64_t rows, std::uint64_t cols) {
        return rows == 0 || cols <= (data_.size() - at_) / 4 / rows ? skip(rows * cols * 4) : false;
    }
    bool skipValue(std::uint32_t code) {
        switch (code) {
            case 2:
                return skipElements(1);
            case 3:
                return skipElements(4);
            case 4:
                return skipMatrix();
            case 5:
                return skipList(false);
            case 6:
                return skipList(true);
            default:
                return skip(4);
        }
    }

    std::string_view data_;
    std::size_t at_ = 0;
};

template <class T>
bool writeBack(Records& records, MORVA::CONTAINERS::AnyMap const& values, std::string const& name) {
    auto const value = values.find<T>(name);
    if (value != nullptr) records[name] = WeightWriter().add(name, *value).bytes();
    return value != nullptr;
}

inline Records writeBack(MORVA::CONTAINERS::AnyMap const& values) {
    Records records;
    for (auto const& [name, object] : values) {
        bool const known = writeBack<float>(records, values, name) ||
                           writeBack<int>(records, values, name) ||
                           writeBack<std::string>(records, values, name) ||
                           writeBack<WeightWriter::Vector>(records, values, name) ||
                           writeBack<WeightWriter::Matrix>(records, values, name) ||
                           writeBack<WeightWriter::Vectors>(records, values, name) ||
                           writeBack<WeightWriter::Matrices>(records, values, name);
        if (!known) records[name] = "unknown type";
    }
    return records;
}

}  // namespace test_support
