#include "weight_facts.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>
#include <span>

#include "engine.h"
#include "error.h"
#include "utils/matrix.h"

namespace morva::cli {
namespace {

using MORVA::CONTAINERS::AnyMap;
using MORVA::CONTAINERS::Matrix;
using Vectors = std::vector<std::vector<float>>;
using Matrices = std::vector<Matrix>;

class Range {
public:
    void add(std::span<float const> numbers) {
        for (float const number : numbers) {
            ++count_;
            if (!std::isfinite(number)) {
                ++notFinite_;
                continue;
            }
            double const value = static_cast<double>(number);
            lowest_ = std::min(lowest_, value);
            highest_ = std::max(highest_, value);
            sum_ += value;
        }
    }

    void into(ValueFacts& facts) const {
        facts.count = count_;
        facts.notFinite = notFinite_;
        auto const finite = count_ - notFinite_;
        if (finite == 0) return;
        facts.lowest = lowest_;
        facts.highest = highest_;
        facts.mean = sum_ / static_cast<double>(finite);
    }

private:
    std::size_t count_ = 0;
    std::size_t notFinite_ = 0;
    double lowest_ = std::numeric_limits<double>::infinity();
    double highest_ = -std::numeric_limits<double>::infinity();
    double sum_ = 0.0;
};

std::string shapeOf(std::vector<float> const& vector) {
    return std::to_string(vector.size());
}
std::string shapeOf(Matrix const& matrix) {
    return std::to_string(matrix.rows) + 'x' + std::to_string(matrix.cols);
}
template <class T>
std::string shapesOf(std::vector<T> const& items) {
    std::string text;
    for (auto const& item : items) {
        if (!text.empty()) text += ' ';
        text += shapeOf(item);
    }
    return text.empty() ? "none" : text;
}

std::uint64_t products(Matrix const& matrix) {
    return matrix.data.size();
}

// The facts of one value; adds its share to the sums in `whole`.
ValueFacts describe(std::string const& name, AnyMap const& values, WeightFacts& whole) {
    ValueFacts facts{.name = name, .type = "", .shape = "", .text = ""};
    Range range;
    if (auto const number = values.find<float>(name)) {
        facts.type = "float";
        facts.text = std::to_string(*number);
        range.add({number.get(), 1});
    } else if (auto const integer = values.find<int>(name)) {
        facts.type = "int";
        facts.text = std::to_string(*integer);
        float const value = static_cast<float>(*integer);
        range.add({&value, 1});
    } else if (auto const text = values.find<std::string>(name)) {
        facts.type = "string";
        facts.text = *text;
    } else if (auto const vector = values.find<std::vector<float>>(name)) {
        facts.type = "vector";
        facts.shape = shapeOf(*vector);
        range.add(*vector);
        whole.parameters += vector->size();
    } else if (auto const vectors = values.find<Vectors>(name)) {
        facts.type = "vectors";
        facts.shape = shapesOf(*vectors);
        for (auto const& one : *vectors) {
            range.add(one);
            whole.parameters += one.size();
        }
    } else if (auto const matrix = values.find<Matrix>(name)) {
        facts.type = "matrix";
        facts.shape = shapeOf(*matrix);
        range.add(matrix->data);
        whole.parameters += matrix->data.size();
        whole.multiplyAddsPerStep += products(*matrix);
    } else if (auto const matrices = values.find<Matrices>(name)) {
        facts.type = "matrices";
        facts.shape = shapesOf(*matrices);
        for (auto const& one : *matrices) {
            range.add(one.data);
            whole.parameters += one.data.size();
            whole.multiplyAddsPerStep += products(one);
        }
    }
    range.into(facts);
    return facts;
}

std::string textValue(AnyMap const& values, char const* name) {
    auto const text = values.find<std::string>(name);
    return text ? *text : std::string();
}

std::optional<int> intValue(AnyMap const& values, char const* name) {
    auto const number = values.find<int>(name);
    return number ? std::optional(*number) : std::nullopt;
}

ModelKind kindOf(std::string const& version) {
    if (version.find("VAD") != std::string::npos) return ModelKind::voiceActivity;
    return version.starts_with("0.0.") ? ModelKind::noiseCancellation : ModelKind::unknown;
}

}  // namespace

WeightFacts readWeightFacts(std::filesystem::path const& file) {
    MORVA::WEIGHTS::Weight weight;
    if (!weight.read(MORVA::UTILS::Path(wide(file).c_str()))) {
        throw Error(file.string() + ": cannot be read: " + weight.message());
    }
    auto const& values = weight.values();
    if (values.empty()) throw Error(file.string() + ": is no weight file: not one record in it");
    WeightFacts facts{.version = textValue(values, "Version"),
                      .sampleRateHz = intValue(values, "SampleRate"),
                      .frameLength = intValue(values, "FrameLength"),
                      .hop = intValue(values, "Step"),
                      .modelName = textValue(values, "ModelName"),
                      .timeStamp = textValue(values, "TimeStamp"),
                      .values = {}};
    facts.kind = kindOf(facts.version);
    for (auto const& [name, value] : values) facts.values.push_back(describe(name, values, facts));
    return facts;
}

std::optional<double> multiplyAddsPerSecond(WeightFacts const& facts, int frameMs) {
    if (facts.kind == ModelKind::voiceActivity) {
        return static_cast<double>(facts.multiplyAddsPerStep) * 1000.0 / frameMs;
    }
    if (!facts.sampleRateHz || facts.hop.value_or(0) < 1) return std::nullopt;
    return static_cast<double>(facts.multiplyAddsPerStep) * *facts.sampleRateHz / *facts.hop;
}

}  // namespace morva::cli
