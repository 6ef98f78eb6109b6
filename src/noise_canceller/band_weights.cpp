#include "noise_canceller/band_weights.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <string>

#include "noise_canceller/network_weights.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using CONTAINERS::Matrix;
using CONTAINERS::paddedTo;
using CONTAINERS::Parts;
using CONTAINERS::RowLayer;
using CONTAINERS::RowNorm;
using CONTAINERS::Rows;
using Values = std::vector<float>;
using WEIGHTS::Weight;

std::size_t sum(Parts const& parts) {
    return std::accumulate(parts.begin(), parts.end(), std::size_t{0});
}

// A value of the weight: alone, or an entry of a list of so many.
struct Entry {
    char const* name;
    std::size_t index = 0;
    std::size_t count = 0;
};

// Layers from values of the weight, every shape checked.
class LayerReader {
public:
    explicit LayerReader(Weight const& weight) : weight_(weight) {}

    Matrix const& matrix(Entry const& entry, std::size_t rows, std::size_t cols) const {
        auto const& matrix = valueOf<Matrix>(entry);
        requireShape(entry.name, matrix, rows, cols);
        return matrix;
    }
    Values const& vector(Entry const& entry, std::size_t length) const {
        auto const& values = valueOf<Values>(entry);
        requireLength(entry.name, values, length);
        return values;
    }
    RowLayer layer(Entry const& weights, Entry const& bias, Parts const& in,
                   Parts const& out) const {
        return {matrix(weights, sum(in), sum(out)), vector(bias, sum(out)), in, out};
    }
    RowNorm norm(Entry const& gain, Entry const& bias, std::size_t width) const {
        return {vector(gain, width), vector(bias, width)};
    }

private:
    template <class T>
    T const& valueOf(Entry const& entry) const {
        if (entry.count == 0) return weight_.getReference<T>(entry.name);
        auto const& list = weight_.getReference<std::vector<T>>(entry.name);
        if (list.size() != entry.count) {
            refuseWeight(std::string(entry.name) + " has " + std::to_string(list.size()) +
                         " entries, must have " + std::to_string(entry.count));
        }
        return list[entry.index];
    }

    Weight const& weight_;
};

std::size_t wholeNumber(Weight const& weight, char const* name, std::size_t low, std::size_t high) {
    int const value = weight.getReference<int>(name);
    if (value < 0 || static_cast<std::size_t>(value) < low ||
        static_cast<std::size_t>(value) > high) {
        refuseWeight(std::string(name) + " is " + std::to_string(value) + ", must be " +
                     std::to_string(low) + ".." + std::to_string(high));
    }
    return static_cast<std::size_t>(value);
}

// The columns of the first matrix of that name, which decide a width.
std::size_t widthOf(Matrix const& matrix, char const* name) {
    if (matrix.cols == 0) refuseWeight(std::string(name) + " has no columns");
    return matrix.cols;
}

std::vector<Matrix> const& matrices(Weight const& weight, char const* name) {
    auto const& list = weight.getReference<std::vector<Matrix>>(name);
    requireCount(name, list.size(), 1);
    return list;
}

// Any of the values of the layers across the groups asks for all of them.
bool hasAcross(Weight const& weight) {
    constexpr char const* kNames[] = {"GainGroupsNorm",    "BiasGroupsNorm", "WeightGroupsIn",
                                      "WeightGroupsState", "BiasGroupsIn",   "BiasGroupsState",
                                      "WeightGroupsOut",   "BiasGroupsOut"};
    return std::any_of(std::begin(kNames), std::end(kNames),
                       [&](char const* name) { return weight.values().contains(name); });
}

BandShape readShape(Weight const& weight, std::size_t bands) {
    BandShape shape{};
    shape.bands = bands;
    shape.groupBands = wholeNumber(weight, "GroupBands", 1, bands);
    shape.reach = wholeNumber(weight, "GroupReach", 0, bands);
    shape.groups = bands / shape.groupBands;
    if (shape.groups * shape.groupBands != bands) {
        refuseWeight("GroupBands is " + std::to_string(shape.groupBands) + ", must divide the " +
                     std::to_string(bands) + " bands");
    }
    auto const& mu = weight.getReference<Values>("MU");
    shape.kinds = mu.size() == 3 * bands ? 3 : 1;
    requireLength("MU", mu, shape.kinds * bands);
    shape.channels = widthOf(weight.getReference<Matrix>("WeightGather"), "WeightGather");
    shape.depth = matrices(weight, "WeightTimeIn").size();
    if (hasAcross(weight)) {
        constexpr char const* kName = "WeightGroupsState";
        auto const& state = matrices(weight, kName).front();
        if (state.rows == 0) refuseWeight(std::string(kName) + " has no rows");
        shape.across = state.rows;
    }
    shape.decoded = widthOf(weight.getReference<Matrix>("WeightSpread"), "WeightSpread");
    shape.scored = widthOf(matrices(weight, "WeightScore").front(), "WeightScore");
    return shape;
}

Values scaleOf(Values const& deviations) {
    Values scale;
    for (float const deviation : deviations) {
        if (!(deviation > 0.0f && std::isfinite(1.0f / deviation))) {
            refuseWeight("SD holds " + std::to_string(deviation) + ", must be positive");
        }
        scale.push_back(1.0f / deviation);
    }
    return scale;
}

Rows placesOf(Matrix const& matrix) {
    Rows place(matrix.rows, matrix.cols);
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        std::copy_n(matrix.data.data() + r * matrix.cols, matrix.cols, place[r]);
    }
    return place;
}

// The three gates of a recurrent layer.
Parts gates(std::size_t units) {
    return {units, units, units};
}

BandWeights::Across readAcross(LayerReader const& read, BandShape const& shape, std::size_t block) {
    std::size_t const units = shape.across;
    Parts const three = gates(units);
    auto const one = [&](char const* name) { return Entry{name, block, shape.depth}; };
    auto const forwards = [&](char const* name) { return Entry{name, 2 * block, 2 * shape.depth}; };
    auto const backwards = [&](char const* name) {
        return Entry{name, 2 * block + 1, 2 * shape.depth};
    };
    auto const state = [&](auto const& direction) {
        return read.layer(direction("WeightGroupsState"), direction("BiasGroupsState"), {units},
                          three);
    };
    auto const weightsFor = [&](Entry const& entry) {
        return read.matrix(entry, shape.channels, 3 * units);
    };
    Values biases = read.vector(forwards("BiasGroupsIn"), 3 * units);
    auto const& others = read.vector(backwards("BiasGroupsIn"), 3 * units);
    biases.insert(biases.end(), others.begin(), others.end());
    return {
        read.norm(one("GainGroupsNorm"), one("BiasGroupsNorm"), shape.channels),
        RowLayer(CONTAINERS::besideEachOther(weightsFor(forwards("WeightGroupsIn")),
                                             weightsFor(backwards("WeightGroupsIn"))),
                 biases, {shape.channels}, Parts(6, units)),
        state(forwards), state(backwards),
        read.layer(one("WeightGroupsOut"), one("BiasGroupsOut"), {units, units}, {shape.channels})};
}

BandWeights::Along readAlong(LayerReader const& read, BandShape const& shape, std::size_t block) {
    auto const one = [&](char const* name) { return Entry{name, block, shape.depth}; };
    std::size_t const units = shape.channels;
    auto const stateTo = [&](std::size_t first, Parts const& parts) {
        auto const& matrix = read.matrix(one("WeightTimeState"), units, 3 * units);
        auto const bias = read.vector(one("BiasTimeState"), 3 * units).begin() +
                          static_cast<std::ptrdiff_t>(first);
        return RowLayer(CONTAINERS::columnsOf(matrix, first, sum(parts)),
                        Values(bias, bias + static_cast<std::ptrdiff_t>(sum(parts))), {units},
                        parts);
    };
    return {read.norm(one("GainTimeNorm"), one("BiasTimeNorm"), units),
            read.layer(one("WeightTimeIn"), one("BiasTimeIn"), {units}, gates(units)),
            stateTo(0, {units, units}), stateTo(2 * units, {units})};
}

std::vector<BandWeights::Block> readBlocks(LayerReader const& read, BandShape const& shape) {
    std::vector<BandWeights::Block> blocks;
    for (std::size_t i = 0; i < shape.depth; ++i) {
        std::optional<BandWeights::Across> across;
        if (shape.across > 0) across = readAcross(read, shape, i);
        blocks.push_back({std::move(across), readAlong(read, shape, i)});
    }
    return blocks;
}

}  // namespace

BandWeights readBandWeights(Weight const& weight, std::size_t bins) {
    BandLayout layout(bins, weight.getReference<Values>("BandWidths"));
    BandShape const shape = readShape(weight, layout.bands());
    LayerReader const read(weight);
    Parts const channels = {shape.channels};
    Parts const seen = {shape.seen()};
    Parts const decoded = {shape.decoded};
    std::size_t const features = shape.kinds * shape.bands;
    auto const& spread =
        read.matrix({"WeightSpread"}, shape.channels + shape.seen(), shape.decoded);
    auto const& spreadBias = read.vector({"BiasSpread"}, shape.decoded);
    auto const& score =
        read.matrix({"WeightScore", 0, 2}, shape.groups * shape.channels, shape.scored);
    return {
        .layout = std::move(layout),
        .shape = shape,
        .mean = read.vector({"MU"}, features),
        .scale = scaleOf(read.vector({"SD"}, features)),
        .gather = read.layer({"WeightGather"}, {"BiasGather"}, seen, channels),
        .place = placesOf(read.matrix({"WeightPlace"}, shape.groups, shape.channels)),
        .blocks = readBlocks(read, shape),
        .norm = read.norm({"GainNorm"}, {"BiasNorm"}, shape.channels),
        .spread = {CONTAINERS::rowsOf(spread, 0, shape.channels), spreadBias, channels, decoded},
        .spreadSeen = {CONTAINERS::rowsOf(spread, shape.channels, shape.seen()),
                       Values(shape.decoded), seen, decoded},
        .output = read.layer({"WeightOutput"}, {"BiasOutput"}, decoded, {2 * shape.groupBands}),
        .score = CONTAINERS::PackedMatrix(
            CONTAINERS::paddedInputs(score, Parts(shape.groups, shape.channels))),
        .scoreBias = read.vector({"BiasScore", 0, 2}, shape.scored),
        .voice = read.matrix({"WeightScore", 1, 2}, shape.scored, 1).data,
        .voiceBias = read.vector({"BiasScore", 1, 2}, 1).front()};
}

}  // namespace MORVA::NOISE_CANCELLER
