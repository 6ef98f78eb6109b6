// What a weight file holds and what it means: for people deciding whether and where to run a model.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "weights/weight.h"

namespace morva::cli {

struct ValueFacts {
    std::string name;
    std::string type;       // "float", "int", "string", "vector", "matrix", "vectors", "matrices"
    std::string shape;      // "176", "176x128", "176x128 128x60"
    std::string text;       // the value itself for a scalar or a string
    std::size_t count = 0;  // numbers held
    double lowest = 0.0;    // over the finite ones
    double highest = 0.0;
    double mean = 0.0;
    std::size_t notFinite = 0;
};

enum class ModelKind { unknown, noiseCancellation, voiceActivity };

struct WeightFacts {
    ModelKind kind = ModelKind::unknown;
    std::string version;
    std::optional<int> sampleRateHz;
    std::optional<int> frameLength;  // samples
    std::optional<int> hop;          // samples; voice activity: one per session frame
    std::string modelName;
    std::string timeStamp;
    std::size_t parameters = 0;             // numbers in vectors and matrices
    std::uint64_t multiplyAddsPerStep = 0;  // of the network's matrix products
    std::vector<ValueFacts> values;         // by name
};

// Throws Error when the file cannot be read or holds no record.
WeightFacts readWeightFacts(std::filesystem::path const& file);

// Network multiply-adds for a second of audio; voice activity steps once per frame of `frameMs`.
std::optional<double> multiplyAddsPerSecond(WeightFacts const& facts, int frameMs);

}  // namespace morva::cli
