// Writes whole models for tests, with consistent shapes. Everything is a function of its arguments
// (seeds included), so a failing case can be made again.
#pragma once

#include <algorithm>
#include <cmath>
#include <random>
#include <string>
#include <vector>

#include "support/record_writer.h"

namespace test_support {

// A noise-cancellation weight of version "0.0.1" to "0.0.6". What a generation does not have is
// left out: reset gate and normalisation before 0.0.6, band compression before 0.0.4, the gate
// before 0.0.3.
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

    int generation() const { return version.back() - '0'; }
    int bands() const { return filtrEnd - filtrBegin; }
    int compressedBands() const {
        int const depth = generation() >= 4 ? compressRate : 0;
        return bands() * (depth + 2) >> (depth + 1);
    }
    int stateWidth() const { return generation() >= 3 ? hidden : 0; }
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
    // Matrices are multiplied by `matrixGain` in addition.
    explicit RandomValues(unsigned seed, float matrixGain = 1.0F)
        : engine_(seed), matrixGain_(matrixGain) {}

    std::vector<float> vector(int size, float low, float high) {
        std::uniform_real_distribution<float> range(low, high);
        std::vector<float> values(static_cast<std::size_t>(size));
        for (auto& value : values) value = range(engine_);
        return values;
    }
    MORVA::CONTAINERS::Matrix matrix(int rows, int cols) {
        auto const scale = matrixGain_ * std::sqrt(3.0F / static_cast<float>(rows));
        return {vector(rows * cols, -scale, scale), static_cast<std::size_t>(rows),
                static_cast<std::size_t>(cols)};
    }

private:
    std::mt19937 engine_;
    float matrixGain_;
};

namespace DETAIL {

inline WeightWriter::Vectors vectors(RandomValues& random, int count, int size, float low,
                                     float high) {
    WeightWriter::Vectors values;
    for (int i = 0; i < count; ++i) values.push_back(random.vector(size, low, high));
    return values;
}

// Layer 0 takes `inputs` values, every later one `hidden`; the last is `outputs` wide.
inline WeightWriter::Matrices layers(RandomValues& random, int count, int inputs, int hidden,
                                     int outputs) {
    WeightWriter::Matrices values;
    for (int i = 0; i < count; ++i) {
        values.push_back(
            random.matrix(i == 0 ? inputs : hidden, i == count - 1 ? outputs : hidden));
    }
    return values;
}

inline void addNcStructure(WeightWriter& writer, NcShape const& shape) {
    auto suffix = "_v" + shape.version;
    std::ranges::replace(suffix, '.', '_');
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
        .add("CONTROL_MORVA_COMPRESS_RATE" + suffix, shape.compressRate);
}

// A `matrixGain` of 0 makes every product 0; `outputBias` is what the output layer adds.
inline std::string ncWeight(NcShape const& shape, float matrixGain, float outputBias) {
    RandomValues random(shape.seed, matrixGain);
    WeightWriter writer;
    addNcStructure(writer, shape);
    int const h = shape.hidden;
    int const inputs = shape.stateWidth() + shape.features();
    int const k = shape.compressedBands();
    int const hiddenLayers = shape.layers - 1;
    writer.add("MU", random.vector(k, 6.0F, 12.0F)).add("SD", random.vector(k, 1.0F, 4.0F));
    writer.add("WeightLinear", layers(random, hiddenLayers, inputs, h, h))
        .add("BaesLinear", vectors(random, hiddenLayers, h, -0.5F, 0.5F))
        .add("WeightNonLinear", layers(random, shape.layers, inputs, h, k));
    auto biases = vectors(random, hiddenLayers, h, -0.5F, 0.5F);
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
            writer.add("Gain" + branch, vectors(random, hiddenLayers, h, 0.5F, 1.5F))
                .add("Bias" + branch, vectors(random, hiddenLayers, h, -0.5F, 0.5F));
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
    int const inputs = h + VadShape::contextFrames * shape.features();
    writer.add("Version", "VAD_0.0.1")
        .add("SampleRate", shape.sampleRate)
        .add("FrameLength", shape.frameLength)
        .add("ModelName", shape.modelName)
        .add("TimeStamp", shape.timeStamp)
        .add("MU", random.vector(shape.features(), 6.0F, 12.0F))
        .add("SD", random.vector(shape.features(), 1.0F, 16.0F))
        .add("WeightGRU", random.matrix(inputs, shape.gates))
        .add("BaesGRU", random.vector(shape.gates, -1.0F, 1.0F));
    for (std::string const branch : {"Linear", "NonLinear"}) {
        auto biases = DETAIL::vectors(random, shape.layers - 1, h, -0.5F, 0.5F);
        biases.push_back(random.vector(1, -0.5F, 0.5F));
        writer.add("Weight" + branch, DETAIL::layers(random, shape.layers, inputs, h, 1))
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
