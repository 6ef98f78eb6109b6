// Bounds-checked cursor over a byte stream that nobody vouches for: every request is compared with
// the bytes that are left before anything is read or allocated. Units: counts are elements, sizes
// are bytes; numbers are little-endian.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <istream>
#include <string>
#include <type_traits>
#include <vector>

namespace MORVA::UTILS {

class BoundedReader {
public:
    // A source that cannot tell its size (a pipe) is read up to this many bytes.
    static constexpr std::uint64_t unsizedLimit = std::uint64_t{256} << 20;

    // Keeps a reference to the stream and reads from its current position.
    explicit BoundedReader(std::istream& stream);

    // A request that does not fit ends the data: nothing of it is delivered and eof() holds from
    // then on. A read error of the source itself clears good() without eof().
    bool good() const { return stream_.good(); }
    bool eof() const { return stream_.eof(); }
    std::uint64_t bytesLeft() const { return left_; }

    template <class T>
    bool readNumber(T& value) {
        static_assert(std::is_arithmetic_v<T> && sizeof(T) == 4);
        static_assert(std::endian::native == std::endian::little,
                      "values are stored little-endian");
        return claim(sizeof(T)) && readRaw(&value, sizeof(T));
    }

    // Replace the target's contents; on failure the target's contents are unspecified.
    bool readString(std::string& target, std::uint64_t size);
    bool readFloats(std::vector<float>& target, std::uint64_t count);
    // Everything up to the end of the data; false only when the source cannot be read.
    bool readRest(std::string& target);

    // Marks the record being read as cut short: the data ends here.
    void endData();

private:
    bool claim(std::uint64_t size);
    bool readRaw(void* target, std::size_t size);
    template <class Container>
    bool readBlock(Container& target, std::uint64_t count);

    std::istream& stream_;
    std::uint64_t left_ = 0;
    bool sized_ = false;
};

}  // namespace MORVA::UTILS
