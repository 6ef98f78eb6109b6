#include "weights/value_decoder.h"

#include <array>
#include <cstdint>
#include <sstream>
#include <type_traits>
#include <utility>
#include <vector>

#include "weights/halves.h"
#include "weights/serializers.h"
#include "weights/value_types.h"

namespace MORVA::WEIGHTS {

namespace {

using CONTAINERS::AnyMap;
using CONTAINERS::InsertMode;
using CONTAINERS::Matrix;
using UTILS::BoundedReader;

void decode(BoundedReader& reader, float& value) {
    reader.readNumber(value);
}

void decode(BoundedReader& reader, int& value) {
    reader.readNumber(value);
}

void decode(BoundedReader& reader, std::string& value) {
    std::uint32_t size = 0;
    if (reader.readNumber(size)) reader.readString(value, size);
}

void decode(BoundedReader& reader, std::vector<float>& value) {
    std::uint32_t count = 0;
    if (reader.readNumber(count)) reader.readFloats(value, count);
}

void decode(BoundedReader& reader, Matrix& value) {
    UTILS::readMatrix(reader, value);
}

// What an element without values takes in the file: its count, or its two.
template <class Element>
constexpr std::uint64_t emptySize = sizeof(std::uint32_t);
template <>
constexpr std::uint64_t emptySize<Matrix> = 2 * sizeof(std::uint32_t);

// A count that the bytes left cannot hold cuts the record before anything is allocated. Below that
// the list grows with the elements that really arrive: in memory an empty one takes more than in
// the file.
template <class Element>
void decode(BoundedReader& reader, std::vector<Element>& value) {
    std::uint32_t count = 0;
    if (!reader.readNumber(count)) return;
    if (count > reader.bytesLeft() / emptySize<Element>) reader.endData();
    for (std::uint32_t i = 0; i < count && reader.good(); ++i) {
        decode(reader, value.emplace_back());
    }
}

// What is damaged inside is a cut record of that name and no end of the data around it.
void decodeHalves(std::string const& name, std::string const& halves, AnyMap& values) {
    std::istringstream stream(withWholeFloats(halves));
    BoundedReader reader(stream);
    int code = 0;
    if (reader.readNumber(code) && code > 2) decodeValue(reader, code, name, values);
}

template <class T>
bool decodeAs(BoundedReader& reader, std::string const& name, AnyMap& values) {
    T value{};
    decode(reader, value);
    if (!reader.good()) return false;
    if constexpr (std::is_same_v<T, std::string>) {
        if (name.starts_with(HALF_PREFIX)) {
            decodeHalves(name.substr(HALF_PREFIX.size()), value, values);
            return true;
        }
    }
    values.insert<T>(name, std::move(value), InsertMode::keep);
    return true;
}

using Decoder = bool (*)(BoundedReader&, std::string const&, AnyMap&);

template <class... Types>
constexpr std::array<Decoder, sizeof...(Types)> decodersOf(TypeList<Types...>) {
    return {decodeAs<Types>...};
}

// Indexed by type code.
constexpr auto decoders = decodersOf(ValueTypes{});

}  // namespace

bool decodeValue(BoundedReader& reader, int typeCode, std::string const& name, AnyMap& values) {
    if (typeCode < 0 || typeCode >= static_cast<int>(decoders.size())) return false;
    return decoders[static_cast<std::size_t>(typeCode)](reader, name, values);
}

}  // namespace MORVA::WEIGHTS
