// Writes weight data for tests: single records of every type, and whole models with consistent
// shapes. Everything is a function of its arguments (seeds included), so a failing case can be made
// again.
#pragma once

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <vector>

#include "kernels/matrix.h"

namespace test_support {

// Appends records; every add returns the writer for chaining. `recordEnds` tells where each one
// ends.
class WeightWriter {
public:
    using Vector = std::vector<float>;
    using Vectors = std::vector<Vector>;
    using Matrix = MORVA::CONTAINERS::Matrix;
    using Matrices = std::vector<Matrix>;

    // Building blocks, for hostile data too.
    template <class Number>
    WeightWriter& number(Number value) {
        static_assert(sizeof(value) == 4);
        bytes_.append(reinterpret_cast<char const*>(&value), sizeof(value));
        return *this;
    }
    WeightWriter& raw(std::string_view bytes) {
        bytes_.append(bytes);
        return *this;
    }
    WeightWriter& header(std::string_view name, std::int32_t typeCode) {
        return count(name.size()).raw(name).number(typeCode);
    }

    WeightWriter& add(std::string_view name, float value) {
        return header(name, 0).number(value).endRecord();
    }
    WeightWriter& add(std::string_view name, int value) {
        return header(name, 1).number(value).endRecord();
    }
    WeightWriter& add(std::string_view name, std::string_view value) {
        return header(name, 2).count(value.size()).raw(value).endRecord();
    }
    WeightWriter& add(std::string_view name, char const* value) {
        return add(name, std::string_view(value));
    }
    WeightWriter& add(std::string_view name, Vector const& value) {
        return header(name, 3).block(value).endRecord();
    }
    WeightWriter& add(std::string_view name, Matrix const& value) {
        return header(name, 4).block(value).endRecord();
    }
    WeightWriter& add(std::string_view name, Vectors const& value) {
        return header(name, 5).blocks(value).endRecord();
    }
    WeightWriter& add(std::string_view name, Matrices const& value) {
        return header(name, 6).blocks(value).endRecord();
    }

    std::string const& bytes() const { return bytes_; }
    std::vector<std::size_t> const& recordEnds() const { return recordEnds_; }

private:
    WeightWriter& count(std::size_t value) { return number(static_cast<std::uint32_t>(value)); }
    WeightWriter& floats(Vector const& values) {
        return raw({reinterpret_cast<char const*>(values.data()), values.size() * sizeof(float)});
    }
    WeightWriter& block(Vector const& value) { return count(value.size()).floats(value); }
    WeightWriter& block(Matrix const& value) {
        return count(value.rows).count(value.cols).floats(value.data);
    }
    template <class Values>
    WeightWriter& blocks(Values const& values) {
        count(values.size());
        for (auto const& value : values) block(value);
        return *this;
    }
    WeightWriter& endRecord() {
        recordEnds_.push_back(bytes_.size());
        return *this;
    }

    std::string bytes_;
    std::vector<std::size_t> recordEnds_;
};

inline void writeFile(std::filesystem::path const& path, std::string_view bytes) {
    std::ofstream(path, std::ios::binary).write(bytes.data(), static_cast<long>(bytes.size()));
}

}  // namespace test_support
