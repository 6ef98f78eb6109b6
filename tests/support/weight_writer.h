// Writes weight data for tests: single records of every type, and whole models with consistent
// shapes. Everything is a function of its arguments (seeds included), so a failing case can be made
// again.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "kernels/matrix.h"

namespace test_support {

// Appends records; every add returns the writer for chaining.
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
        return raw({reinterpret_cast<char const*>(&value), sizeof(value)});
    }
    WeightWriter& raw(std::string_view bytes) {
        bytes_.append(bytes);
        return *this;
    }
    WeightWriter& header(std::string_view name, std::int32_t typeCode) {
        return count(name.size()).raw(name).number(typeCode);
    }

    WeightWriter& add(std::string_view name, float value) { return header(name, 0).number(value); }
    WeightWriter& add(std::string_view name, int value) { return header(name, 1).number(value); }
    WeightWriter& add(std::string_view name, std::string_view value) {
        return header(name, 2).count(value.size()).raw(value);
    }
    WeightWriter& add(std::string_view name, char const* value) {
        return add(name, std::string_view(value));
    }
    WeightWriter& add(std::string_view name, Vector const& value) {
        return header(name, 3).block(value);
    }
    WeightWriter& add(std::string_view name, Matrix const& value) {
        return header(name, 4).block(value);
    }
    WeightWriter& add(std::string_view name, Vectors const& value) {
        return header(name, 5).blocks(value);
    }
    WeightWriter& add(std::string_view name, Matrices const& value) {
        return header(name, 6).blocks(value);
    }

    std::string const& bytes() const { return bytes_; }

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

    std::string bytes_;
};

// A noise-cancellation weight of version "0.0.1" to "0.0.6" or "NC_1.0.0". What a generation does
// not have is left out: reset gate and normalisation before 0.0.6, band compression before 0.0.4,
// the gate before 0.0.3. Of NC_1.0.0, H is the number of channels, G of units across the groups,
// P of kinds of features, L - 1 of blocks, and the band reaches from bin 0 to half the rate.
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
    int groupBands = 4;
    int groupReach = 2;

    // 10 for NC_1.0.0.
    int generation() const { return version.starts_with("NC") ? 10 : version.back() - '0'; }
    std::string suffix() const {
        return generation() == 10 ? "_v1_0_0" : "_v0_0_" + std::to_string(generation());
    }
    int compressedBands() const {
        int const depth = generation() >= 4 ? compressRate : 0;
        return (filtrEnd - filtrBegin) * (depth + 2) >> (depth + 1);
    }
    int inputs() const {
        return (generation() >= 3 ? hidden : 0) + previewFrames * compressedBands();
    }
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

    // Log-energy bands: the lower quarter of the bins, then pairs up to the half, then fours; of a
    // frame length that 16 divides.
    int features() const { return 1 + frameLength / 4; }
    int inputs() const { return hidden + 5 * features(); }
};

// Seeded source of parameters; matrices are scaled by their fan-in, so that outputs stay of order
// one.
class RandomValues {
public:
    // Matrices are multiplied by `matrixGain` in addition.
    explicit RandomValues(unsigned seed, float matrixGain = 1.0F)
        : engine_(seed), matrixGain_(matrixGain) {}

    std::vector<float> vector(int size, float low, float high) {
        std::uniform_real_distribution<float> range(low, high);
        std::vector<float> values(static_cast<std::size_t>(size));
        for (auto& value : values) value = range(engine_);
        return values;
    }
    WeightWriter::Vectors vectors(int count, int size, float low, float high) {
        WeightWriter::Vectors values;
        while (count-- > 0) values.push_back(vector(size, low, high));
        return values;
    }
    WeightWriter::Matrix matrix(int rows, int cols) {
        auto const scale = matrixGain_ * std::sqrt(3.0F / static_cast<float>(rows));
        return {vector(rows * cols, -scale, scale), static_cast<std::size_t>(rows),
                static_cast<std::size_t>(cols)};
    }
    // Layer 0 takes `inputs` values, every later one `hidden`; the last is `outputs` wide.
    WeightWriter::Matrices layers(int count, int inputs, int hidden, int outputs) {
        WeightWriter::Matrices values;
        for (int i = 0; i < count; ++i) {
            values.push_back(matrix(i == 0 ? inputs : hidden, i == count - 1 ? outputs : hidden));
        }
        return values;
    }

private:
    std::mt19937 engine_;
    float matrixGain_;
};

namespace DETAIL {

// What every weight begins with.
template <class Shape>
WeightWriter frontOf(Shape const& shape, std::string_view version) {
    WeightWriter writer;
    return writer.add("Version", version)
        .add("SampleRate", shape.sampleRate)
        .add("FrameLength", shape.frameLength)
        .add("ModelName", shape.modelName)
        .add("TimeStamp", shape.timeStamp);
}

// A `matrixGain` of 0 makes every product 0; `outputBias` is what the output layer adds.
inline std::string ncWeight(NcShape const& shape, float matrixGain, float outputBias) {
    auto const suffix = shape.suffix();
    int const h = shape.hidden;
    int const inputs = shape.inputs();
    int const k = shape.compressedBands();
    int const hiddenLayers = shape.layers - 1;
    RandomValues random(shape.seed, matrixGain);
    auto writer = frontOf(shape, shape.version);
    writer.add("Step", shape.frameLength / 2)
        .add("FiltrBegin", shape.filtrBegin)
        .add("FiltrEnd", shape.filtrEnd)
        .add("PreviewFrames", shape.previewFrames)
        .add("CoefficientNumber", shape.coefficients())
        .add("CONTROL_MORVA_COMPRESS_RATE" + suffix, shape.compressRate)
        .add("MU", random.vector(k, 6.0F, 12.0F))
        .add("SD", random.vector(k, 1.0F, 4.0F))
        .add("WeightLinear", random.layers(hiddenLayers, inputs, h, h))
        .add("BaesLinear", random.vectors(hiddenLayers, h, -0.5F, 0.5F))
        .add("WeightNonLinear", random.layers(shape.layers, inputs, h, k));
    auto biases = random.vectors(hiddenLayers, h, -0.5F, 0.5F);
    biases.emplace_back(static_cast<std::size_t>(k), outputBias);
    writer.add("BaesNonLinear", biases);
    if (shape.generation() >= 3) {
        writer.add("WeightGRU", random.matrix(inputs, shape.gates))
            .add("BaesGRU", random.vector(shape.gates, -1.0F, 1.0F));
    }
    if (shape.generation() >= 6) {
        writer.add("WeightGRU_reset", random.matrix(inputs, h))
            .add("BiasGRU_reset", random.vector(h, -1.0F, 1.0F));
        for (std::string const branch : {"LinearNorm", "NonLinearNorm"}) {
            writer.add("Gain" + branch, random.vectors(hiddenLayers, h, 0.5F, 1.5F))
                .add("Bias" + branch, random.vectors(hiddenLayers, h, -0.5F, 0.5F));
        }
    }
    return writer.bytes();
}

// The bins of each band, as COMPRESS_RATE makes them of all bins below half the rate.
inline std::vector<float> bandWidths(NcShape const& shape) {
    int const single = shape.frameLength / 2 >> shape.compressRate;
    std::vector<float> widths(static_cast<std::size_t>(single), 1.0F);
    for (int octave = 1; octave <= shape.compressRate; ++octave) {
        widths.insert(widths.end(), static_cast<std::size_t>(single / 2),
                      static_cast<float>(1 << octave));
    }
    return widths;
}

inline std::string bandWeight(NcShape const& shape) {
    auto const widths = bandWidths(shape);
    int const bands = static_cast<int>(widths.size());
    int const groups = bands / shape.groupBands;
    int const features = shape.previewFrames * bands;
    int const seen = shape.previewFrames * (shape.groupBands + 2 * shape.groupReach);
    int const c = shape.hidden;
    int const a = shape.gates;
    int const depth = shape.layers - 1;
    int const decoded = 12;
    int const scored = 6;
    RandomValues random(shape.seed);
    auto writer = frontOf(shape, shape.version);
    auto const vectors = [&](std::string const& name, int count, int size) {
        bool const gain = name.starts_with("Gain");
        writer.add(name, random.vectors(count, size, gain ? 0.5F : -0.5F, gain ? 1.5F : 0.5F));
    };
    auto const matrices = [&](std::string const& name, int count, int rows, int cols) {
        WeightWriter::Matrices list;
        while (count-- > 0) list.push_back(random.matrix(rows, cols));
        writer.add(name, list);
    };
    auto mean = random.vector(features, -0.3F, 0.3F);
    auto deviation = random.vector(features, 0.3F, 0.7F);
    for (std::size_t k = 0; k < widths.size(); ++k) mean[k] += 9.0F, deviation[k] *= 5.0F;
    writer.add("Step", shape.frameLength / 2)
        .add("BandWidths", widths)
        .add("GroupBands", shape.groupBands)
        .add("GroupReach", shape.groupReach)
        .add("MU", mean)
        .add("SD", deviation)
        .add("WeightGather", random.matrix(seen, c))
        .add("BiasGather", random.vector(c, -0.5F, 0.5F))
        .add("WeightPlace", random.matrix(groups, c));
    if (a > 0) {
        vectors("GainGroupsNorm", depth, c);
        vectors("BiasGroupsNorm", depth, c);
        matrices("WeightGroupsIn", 2 * depth, c, 3 * a);
        matrices("WeightGroupsState", 2 * depth, a, 3 * a);
        vectors("BiasGroupsIn", 2 * depth, 3 * a);
        vectors("BiasGroupsState", 2 * depth, 3 * a);
        matrices("WeightGroupsOut", depth, 2 * a, c);
        vectors("BiasGroupsOut", depth, c);
    }
    vectors("GainTimeNorm", depth, c);
    vectors("BiasTimeNorm", depth, c);
    matrices("WeightTimeIn", depth, c, 3 * c);
    matrices("WeightTimeState", depth, c, 3 * c);
    vectors("BiasTimeIn", depth, 3 * c);
    vectors("BiasTimeState", depth, 3 * c);
    writer.add("GainNorm", random.vector(c, 0.5F, 1.5F))
        .add("BiasNorm", random.vector(c, -0.5F, 0.5F))
        .add("WeightSpread", random.matrix(c + seen, decoded))
        .add("BiasSpread", random.vector(decoded, -0.5F, 0.5F))
        .add("WeightOutput", random.matrix(decoded, 2 * shape.groupBands))
        .add("BiasOutput", random.vector(2 * shape.groupBands, 0.0F, 1.0F))
        .add("WeightScore",
             WeightWriter::Matrices{random.matrix(groups * c, scored), random.matrix(scored, 1)})
        .add("BiasScore", WeightWriter::Vectors{random.vector(scored, -0.5F, 0.5F), {0.2F}});
    return writer.bytes();
}

}  // namespace DETAIL

// Random parameters: the mask moves with the signal, nothing saturates.
inline std::string randomNcWeight(NcShape const& shape) {
    if (shape.generation() == 10) return DETAIL::bandWeight(shape);
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
    int const h = shape.hidden;
    RandomValues random(shape.seed);
    auto writer = DETAIL::frontOf(shape, "VAD_0.0.1");
    writer.add("MU", random.vector(shape.features(), 6.0F, 12.0F))
        .add("SD", random.vector(shape.features(), 1.0F, 16.0F))
        .add("WeightGRU", random.matrix(shape.inputs(), shape.gates))
        .add("BaesGRU", random.vector(shape.gates, -1.0F, 1.0F));
    for (std::string const branch : {"Linear", "NonLinear"}) {
        auto biases = random.vectors(shape.layers - 1, h, -0.5F, 0.5F);
        biases.push_back(random.vector(1, -0.5F, 0.5F));
        writer.add("Weight" + branch, random.layers(shape.layers, shape.inputs(), h, 1))
            .add("Baes" + branch, biases);
    }
    if (shape.calibration.size() == 3) {
        auto const& points = shape.calibration;
        writer.add("Test_MINMAX", WeightWriter::Vector{points[0], points[2]})
            .add("Test_BestF1", WeightWriter::Vector{points[1]});
    }
    return writer.bytes();
}

}  // namespace test_support
