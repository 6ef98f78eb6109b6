#include "weights/bounded_reader.h"

#include <algorithm>

namespace MORVA::UTILS {

namespace {

// Elements by which a target grows while the size of its source is unknown.
constexpr std::uint64_t growStep = std::uint64_t{1} << 16;

}  // namespace

BoundedReader::BoundedReader(std::istream& stream) : stream_(stream) {
    if (!stream_.good()) return;
    auto const start = stream_.tellg();
    stream_.seekg(0, std::ios::end);
    auto const end = stream_.tellg();
    stream_.clear();
    if (start == std::istream::pos_type(-1) || end == std::istream::pos_type(-1)) {
        left_ = unsizedLimit;
        return;
    }
    stream_.seekg(start);
    sized_ = true;
    left_ = end > start ? static_cast<std::uint64_t>(end - start) : 0;
}

bool BoundedReader::readString(std::string& target, std::uint64_t size) {
    return readBlock(target, size);
}

bool BoundedReader::readFloats(std::vector<float>& target, std::uint64_t count) {
    return readBlock(target, count);
}

bool BoundedReader::readRest(std::string& target) {
    target.clear();
    if (good()) stream_.peek();
    while (good() && left_ > 0) {
        auto const done = target.size();
        auto const step = static_cast<std::size_t>(std::min(left_, growStep));
        target.resize(done + step);
        stream_.read(target.data() + done, static_cast<std::streamsize>(step));
        auto const got = static_cast<std::size_t>(stream_.gcount());
        target.resize(done + got);
        left_ -= got;
    }
    return good() || (eof() && !stream_.bad());
}

void BoundedReader::endData() {
    if (!stream_.good()) return;
    // A source that fails to read (a directory, say) is not at its end, whatever size it reported.
    stream_.peek();
    if (!stream_.bad()) stream_.setstate(std::ios::eofbit | std::ios::failbit);
    left_ = 0;
}

bool BoundedReader::claim(std::uint64_t size) {
    if (!stream_.good()) return false;
    if (size <= left_) return true;
    endData();
    return false;
}

bool BoundedReader::readRaw(void* target, std::size_t size) {
    stream_.read(static_cast<char*>(target), static_cast<std::streamsize>(size));
    left_ -= size;
    return stream_.good();
}

template <class Container>
bool BoundedReader::readBlock(Container& target, std::uint64_t count) {
    using Element = typename Container::value_type;
    target.clear();
    // Dividing instead of multiplying: a count can not overflow the comparison.
    if (count > left_ / sizeof(Element)) {
        endData();
        return false;
    }
    // A source that cannot be read, such as a directory, may report any size: find out before
    // allocating for it.
    if (count > 0 && good()) stream_.peek();
    std::uint64_t done = 0;
    while (stream_.good() && done < count) {
        auto const step = sized_ ? count : std::min(count - done, growStep);
        target.resize(static_cast<std::size_t>(done + step));
        readRaw(target.data() + done, static_cast<std::size_t>(step * sizeof(Element)));
        done += step;
    }
    return stream_.good();
}

}  // namespace MORVA::UTILS
