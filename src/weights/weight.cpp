#include "weights/weight.h"

#include <algorithm>
#include <array>
#include <cstdint>

#include "utils/diagnostics.h"
#include "utils/exception.h"
#include "weights/value_decoder.h"

namespace MORVA::WEIGHTS {

namespace {

constexpr char const* sourceFile = "src/weights/weight";
constexpr std::array sampleRates = {8000, 16000, 32000};
constexpr std::array frameDurations = {10, 15, 20, 30, 32, 40};

template <std::size_t n>
bool isOneOf(std::array<int, n> const& legal, std::int64_t value) {
    return std::find(legal.begin(), legal.end(), value) != legal.end();
}

}  // namespace

bool Weight::read(UTILS::Path const& path) {
    UTILS::SerializerFstream source(UTILS::SerializeMode::read, path);
    return readRecords(source);
}

bool Weight::read(char const* data, std::size_t size) {
    UTILS::SerializerSstream source(data != nullptr ? std::string(data, size) : std::string());
    return readRecords(source);
}

bool Weight::read_value(std::string const& name, int typeCode, UTILS::SerializerFstream& source) {
    return decodeValue(source.reader(), typeCode, name, values_);
}

bool Weight::read_value(std::string const& name, int typeCode, UTILS::SerializerSstream& source) {
    return decodeValue(source.reader(), typeCode, name, values_);
}

template <class Serializer>
bool Weight::readRecords(Serializer& source) {
    auto& reader = source.reader();
    std::string name;
    while (!reader.eof()) {
        std::uint32_t nameLength = 0;
        reader.readNumber(nameLength);
        reader.readString(name, nameLength);
        if (!reader.good()) {
            if (reader.eof()) break;
            values_.clear();
            message_ = "Corrupted weight file!";
            return false;
        }
        std::int32_t typeCode = 0;
        // An unknown code is deliberately not resynchronised: its value's length is not known, so
        // the bytes that follow are taken as the next record.
        if (reader.readNumber(typeCode)) read_value(name, typeCode, source);
    }
    if (values_.empty()) {
        UTILS::say(UTILS::Channel::output, "Warning Nothing added from weight");
    }
    message_.clear();
    return true;
}

std::string Weight::getWeightVersion() const {
    auto const version = values_.find<std::string>(VERSION);
    if (version == nullptr) {
        throw UTILS::MORVA_Exception("there are no Weight version in Weight ", sourceFile, 348,
                                     "getWeightVersion");
    }
    return *version;
}

std::pair<MorvaSamplingRate, MorvaFrameDuration> Weight::getWeightInfo() const {
    auto const rate = values_.find<int>(SAMPLERATE);
    auto const length = values_.find<int>(FRAMELENGHT);
    auto const version = values_.find<std::string>(VERSION);
    bool const higher = version != nullptr && *version == BAND_VERSION && rate != nullptr &&
                        *rate == MORVA_RATE_48000;
    if (rate != nullptr && length != nullptr && (higher || isOneOf(sampleRates, *rate))) {
        // Wider than the stored values: a hostile length must not overflow into a legal duration.
        auto const duration = std::int64_t{*length} * 1000 / *rate;
        if (isOneOf(frameDurations, duration)) {
            return {static_cast<MorvaSamplingRate>(*rate),
                    static_cast<MorvaFrameDuration>(duration)};
        }
    }
    throw UTILS::MORVA_Exception("there are no needing Weight information in Weight ", sourceFile,
                                 339, "getWeightInfo");
}

void Weight::throwMissing(std::string const& name) {
    auto const message = "ERROR DATA With Key: " + name + "doesn't exists";
    throw UTILS::MORVA_Exception(message.c_str(), sourceFile, 90, "getReference");
}

}  // namespace MORVA::WEIGHTS
