// A model's named, typed values, read from a weight file or from the same bytes in memory.
//
// The data is a plain run of records up to its end, little-endian, without header or padding:
//   u32 name length, name, i32 type code, value
//   0 float   1 int32   2 u32 n, n bytes   3 u32 n, n floats   4 matrix: u32 rows, i32 cols, floats
//   5 u32 k, k times (u32 n, n floats)     6 u32 k, k matrices
// A name that occurs twice keeps its first value. A record that is cut short is dropped and what
// came before it is kept.
//
// Threads: filled by one thread at registration, read-only and safe for any thread afterwards.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>

#include "morva-sdk/morva-sdk.h"
#include "utils/path.h"
#include "weights/any_map.h"
#include "weights/serializers.h"

namespace MORVA::WEIGHTS {

// Names of the values that every model carries.
inline std::string const SAMPLERATE = "SampleRate";    // int, hertz
inline std::string const FRAMELENGHT = "FrameLength";  // int, samples
inline std::string const VERSION = "Version";          // string

// The version of the noise models that know voice and noise level too, and the rate of 48000 Hz.
inline constexpr std::string_view BAND_VERSION = "NC_1.0.0";

class Weight {
public:
    // True also for a source without any record (a warning line is printed) or with a cut last one;
    // false when the source cannot be opened or read. The weight is then empty.
    bool read(UTILS::Path const& path);
    bool read(char const* data, std::size_t size);

    // Decode one value of the given type and keep it under `name`. False, and nothing kept, when
    // the code is unknown (nothing is read then) or the value is cut short.
    bool read_value(std::string const& name, int typeCode, UTILS::SerializerFstream& source);
    bool read_value(std::string const& name, int typeCode, UTILS::SerializerSstream& source);

    // The value of that name and type; lives as long as the weight. Throws MORVA_Exception when it
    // is absent or of another type. T is one of ValueTypes.
    template <class T>
    T const& getReference(std::string const& name) const {
        auto const value = values_.find<T>(name);
        if (value == nullptr) throwMissing(name);
        return *value;
    }

    // Both throw MORVA_Exception when the values they need are missing or unusable.
    std::string getWeightVersion() const;
    std::pair<MorvaSamplingRate, MorvaFrameDuration> getWeightInfo() const;

    CONTAINERS::AnyMap const& values() const { return values_; }
    // "" after a successful read, "Corrupted weight file!" after a failed one.
    std::string const& message() const { return message_; }

private:
    [[noreturn]] static void throwMissing(std::string const& name);
    template <class Serializer>
    bool readRecords(Serializer& source);

    CONTAINERS::AnyMap values_;
    std::string message_;
};

}  // namespace MORVA::WEIGHTS
