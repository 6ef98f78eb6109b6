// Writes weight data for tests: single records of every type, and whole models with consistent
// shapes. Everything is a function of its arguments (seeds included), so a failing case can be made
// again.
#pragma once

#include <cmath>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "utils/matrix.h"

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

// A noise-cancellation weight. `version` is "0.0.6", or "0.0.5" (no reset gate, no normalisation).
struct NcShape {
    std::string version = "0.0.6";
    int sampleRate = 16000;
    int frameLength = 320;  // samples; the hop is half of it
    int filtrBegin = 0;
    int filtrEnd = 160;  // one past the last bin that the model sees
    int compressRate = 2;
    int previewFrames = 3;
    int hidden = 8;  // H
    int layers = 3;  // L, matrices of "WeightNonLinear"; 1 has no hidden layer
    int gates = 8;   // G, equal to `hidden` or 1
    unsigned seed = 1;
    std::string modelName = "test";
    std::string timeStamp = "210301";

    int bands() const { return filtrEnd - filtrBegin; }
    int compressedBands() const { return bands() * (compressRate + 2) >> (compressRate + 1); }
    int features() const { return previewFrames * compressedBands(); }
    int coefficients() const { return frameLength / 2 + 1; }
};

// A voice-activity weight of version "VAD_0.0.1".
struct VadShape {
    int sampleRate = 8000;
    int frameLength = 240;
    int hidden = 8;
    int layers = 2;
    int gates = 8;
    std::vector<float> calibration = {-6.0F, 0.5F, 6.0F};  // low, middle, high; empty: none
    unsigned seed = 1;
    std::string modelName = "test_vad";
    std::string timeStamp = "210301";

    // Log-energy bands: the lower quarter of the bins, then pairs, then fours.
    int features() const {
        int const bins = frameLength / 2 + 1;
        int const odd = bins % 8 == 1 ? 1 : 0;
        int count = bins / 4 + odd;
        int width = 2;
        int boundary = bins / 4 * 2;
        for (int i = count; i < bins; i += width, ++count) {
            if (i - odd == boundary) {
                width *= 2;
                boundary *= 2;
            }
        }
        return count;
    }
    static constexpr int contextFrames = 5;
};

// Seeded source of parameters; matrices are scaled by their fan-in, so that outputs stay of order
// one.
class RandomValues {
public:
    explicit RandomValues(unsigned seed) : engine_(seed) {}

    std::vector<float> vector(int size, float low, float high) {
        std::uniform_real_distribution<float> range(low, high);
        std::vector<float> values(static_cast<std::size_t>(size));
        for (auto& value : values) value = range(engine_);
        return values;
    }
    MORVA::CONTAINERS::Matrix matrix(int rows, int cols) {
        auto const scale = std::sqrt(3.0F / static_cast<float>(rows));
        return {vector(rows * cols, -scale, scale), static_cast<std::size_t>(rows),
                static_cast<std::size_t>(cols)};
    }

private:
    std::mt19937 engine_;
};

namespace DETAIL {

inline WeightWriter::Vectors vectors(RandomValues& random, int count, int size, float low,
                                     float high) {
    WeightWriter::Vectors values;
    for (int i = 0; i < count; ++i) values.push_back(random.vector(size, low, high));
    return values;
}

// Layer 0 takes state and features, every later one the state's width; the last is `outputs` wide.
inline WeightWriter::Matrices layers(RandomValues& random, int count, int hidden, int features,
                                     int outputs) {
    WeightWriter::Matrices values;
    for (int i = 0; i < count; ++i) {
        values.push_back(
            random.matrix(i == 0 ? hidden + features : hidden, i == count - 1 ? outputs : hidden));
    }
    return values;
}

inline void addNcStructure(WeightWriter& writer, NcShape const& shape) {
    auto const suffix = shape.version == "0.0.5" ? "_v0_0_5" : "_v0_0_6";
    writer.add("Version", shape.version)
        .add("SampleRate", shape.sampleRate)
        .add("FrameLength", shape.frameLength)
        .add("ModelName", shape.modelName)
        .add("TimeStamp", shape.timeStamp)
        .add("Step", shape.frameLength / 2)
        .add("FiltrBegin", shape.filtrBegin)
        .add("FiltrEnd", shape.filtrEnd)
        .add("PreviewFrames", shape.previewFrames)
        .add("CoefficientNumber", shape.coefficients())
        .add(std::string("CONTROL_MORVA_COMPRESS_RATE") + suffix, shape.compressRate);
}

// `scale` 0 makes every product 0; `outputBias` is what the output layer adds.
inline std::string ncWeight(NcShape const& shape, float scale, float outputBias) {
    RandomValues random(shape.seed);
    WeightWriter writer;
    addNcStructure(writer, shape);
    int const h = shape.hidden;
    int const features = shape.features();
    int const k = shape.compressedBands();
    int const hiddenLayers = shape.layers - 1;
    auto const scaled = [scale](auto values) {
        auto const apply = [scale](std::vector<float>& data) {
            for (auto& value : data) value *= scale;
        };
        if constexpr (requires { values.data.begin(); }) {
            apply(values.data);
        } else {
            for (auto& value : values) apply(value.data);
        }
        return values;
    };
    writer.add("MU", random.vector(k, 6.0F, 12.0F)).add("SD", random.vector(k, 1.0F, 4.0F));
    writer.add("WeightGRU", scaled(random.matrix(h + features, shape.gates)))
        .add("BaesGRU", random.vector(shape.gates, -1.0F, 1.0F));
    auto linear = layers(random, hiddenLayers, h, features, h);
    writer.add("WeightLinear", scaled(linear))
        .add("BaesLinear", vectors(random, hiddenLayers, h, -0.5F, 0.5F));
    writer.add("WeightNonLinear", scaled(layers(random, shape.layers, h, features, k)));
    auto biases = vectors(random, hiddenLayers, h, -0.5F, 0.5F);
    biases.emplace_back(static_cast<std::size_t>(k), outputBias);
    writer.add("BaesNonLinear", biases);
    if (shape.version != "0.0.5") {
        writer.add("WeightGRU_reset", scaled(random.matrix(h + features, h)))
            .add("BiasGRU_reset", random.vector(h, -1.0F, 1.0F));
        for (auto const* branch : {"LinearNorm", "NonLinearNorm"}) {
            writer.add(std::string("Gain") + branch, vectors(random, hiddenLayers, h, 0.5F, 1.5F))
                .add(std::string("Bias") + branch, vectors(random, hiddenLayers, h, -0.5F, 0.5F));
        }
    }
    return writer.bytes();
}

}  // namespace DETAIL

// Random parameters: the mask moves with the signal, nothing saturates.
inline std::string randomNcWeight(NcShape const& shape) {
    return DETAIL::ncWeight(shape, 1.0F, 0.5F);
}

// The mask is exactly 1 in every bin: all bins are seen one by one, the products are 0 and the
// output bias saturates the sigmoid. The output is then the delayed input.
inline std::string identityNcWeight(NcShape shape) {
    shape.filtrBegin = 0;
    shape.filtrEnd = shape.coefficients();
    shape.compressRate = 0;
    return DETAIL::ncWeight(shape, 0.0F, 100.0F);
}

inline std::string randomVadWeight(VadShape const& shape) {
    RandomValues random(shape.seed);
    WeightWriter writer;
    int const h = shape.hidden;
    int const input = VadShape::contextFrames * shape.features();
    writer.add("Version", "VAD_0.0.1")
        .add("SampleRate", shape.sampleRate)
        .add("FrameLength", shape.frameLength)
        .add("ModelName", shape.modelName)
        .add("TimeStamp", shape.timeStamp)
        .add("MU", random.vector(shape.features(), 6.0F, 12.0F))
        .add("SD", random.vector(shape.features(), 1.0F, 16.0F))
        .add("WeightGRU", random.matrix(h + input, shape.gates))
        .add("BaesGRU", random.vector(shape.gates, -1.0F, 1.0F));
    for (auto const* branch : {"Linear", "NonLinear"}) {
        auto biases = DETAIL::vectors(random, shape.layers - 1, h, -0.5F, 0.5F);
        biases.push_back(random.vector(1, -0.5F, 0.5F));
        writer
            .add(std::string("Weight") + branch, DETAIL::layers(random, shape.layers, h, input, 1))
            .add(std::string("Baes") + branch, biases);
    }
    if (shape.calibration.size() == 3) {
        auto const& points = shape.calibration;
        writer.add("Test_MINMAX", WeightWriter::Vector{points[0], points[2]})
            .add("Test_BestF1", WeightWriter::Vector{points[1]});
    }
    return writer.bytes();
}

}  // namespace test_support
