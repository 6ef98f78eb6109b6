#include "weights/serializers.h"

#include <cstdint>
#include <utility>

namespace MORVA::UTILS {

namespace {

std::ifstream openInput(SerializeMode mode, Path const& path) {
    std::ifstream stream;
    if (mode == SerializeMode::read) path.openIfstream(stream, std::ios::binary);
    return stream;
}

std::ofstream openOutput(SerializeMode mode, Path const& path) {
    std::ofstream stream;
    if (mode != SerializeMode::read) path.openOfstream(stream, std::ios::binary);
    return stream;
}

}  // namespace

void readMatrix(BoundedReader& reader, CONTAINERS::Matrix& matrix) {
    std::uint32_t rows = 0;
    std::int32_t cols = 0;
    if (!reader.readNumber(rows) || !reader.readNumber(cols)) return;
    if (cols < 0) {
        reader.endData();
        return;
    }
    // 32 bits times 31 bits: the product fits.
    auto const count = std::uint64_t{rows} * static_cast<std::uint64_t>(cols);
    std::vector<float> data;
    if (!reader.readFloats(data, count)) return;
    matrix.data = std::move(data);
    matrix.rows = rows;
    matrix.cols = static_cast<std::size_t>(cols);
}

SerializerFstream::SerializerFstream(SerializeMode mode, Path const& path)
    : mode_(mode),
      output_(openOutput(mode, path)),
      input_(openInput(mode, path)),
      reader_(input_) {}

SerializerFstream& SerializerFstream::operator>>(CONTAINERS::Matrix& matrix) {
    readMatrix(reader_, matrix);
    return *this;
}

SerializerSstream::SerializerSstream(std::string bytes)
    : stream_(std::move(bytes), std::ios::in | std::ios::binary), reader_(stream_) {}

SerializerSstream& SerializerSstream::operator>>(CONTAINERS::Matrix& matrix) {
    readMatrix(reader_, matrix);
    return *this;
}

}  // namespace MORVA::UTILS
