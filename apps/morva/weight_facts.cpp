#include "weight_facts.h"

#include <algorithm>
#include <cmath>
#include <span>
#include <utility>

#include "engine.h"
#include "error.h"
#include "weights/value_types.h"

namespace morva::cli {
namespace {

using MORVA::CONTAINERS::AnyMap;
using MORVA::CONTAINERS::Matrix;

// What a value's type means for the facts: one overload for each.
class Describer {
public:
    Describer(ValueFacts& facts, WeightFacts& whole, std::size_t runs)
        : facts_(facts), whole_(whole), runs_(runs) {}

    void operator()(float value) { number("float", std::to_string(value), value); }
    void operator()(int value) { number("int", std::to_string(value), static_cast<float>(value)); }
    void operator()(std::string const& value) {
        facts_.type = "string";
        facts_.text = value;
    }
    void operator()(std::vector<float> const& value) { numbers("vector", value); }
    void operator()(Matrix const& value) { numbers("matrix", value); }
    void operator()(std::vector<std::vector<float>> const& value) { numbers("vectors", value); }
    void operator()(std::vector<Matrix> const& value) { numbers("matrices", value); }

    // To be called when all numbers are there.
    void finish() {
        auto const finite = facts_.count - facts_.notFinite;
        if (finite > 0) facts_.mean = sum_ / static_cast<double>(finite);
    }

private:
    void number(char const* type, std::string text, float value) {
        facts_.type = type;
        facts_.text = std::move(text);
        range({&value, 1});
    }
    template <class Value>
    void numbers(char const* type, Value const& value) {
        facts_.type = type;
        parts(value);
        if (facts_.shape.empty()) facts_.shape = "none";
    }

    template <class Part>
    void parts(std::vector<Part> const& list) {
        for (auto const& part : list) parts(part);
    }
    void parts(std::vector<float> const& vector) { part(std::to_string(vector.size()), vector); }
    void parts(Matrix const& matrix) {
        part(std::to_string(matrix.rows) + 'x' + std::to_string(matrix.cols), matrix.data);
        whole_.multiplyAddsPerStep += runs_ * matrix.data.size();
    }
    void part(std::string const& shape, std::vector<float> const& data) {
        if (!facts_.shape.empty()) facts_.shape += ' ';
        facts_.shape += shape;
        range(data);
        whole_.parameters += data.size();
    }

    void range(std::span<float const> data) {
        for (float const number : data) {
            bool const first = facts_.count++ == facts_.notFinite;  // of the finite ones
            if (!std::isfinite(number)) {
                ++facts_.notFinite;
                continue;
            }
            double const value = static_cast<double>(number);
            facts_.lowest = first ? value : std::min(facts_.lowest, value);
            facts_.highest = first ? value : std::max(facts_.highest, value);
            sum_ += value;
        }
    }

    ValueFacts& facts_;
    WeightFacts& whole_;
    std::size_t runs_;  // of a step
    double sum_ = 0.0;
};

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
    bool const isNoise = version.starts_with("0.0.") || version == MORVA::WEIGHTS::BAND_VERSION;
    return isNoise ? ModelKind::noiseCancellation : ModelKind::unknown;
}

// How often a step runs a value's matrices: those of version NC_1.0.0 once for every group of
// bands, except for what all groups have together.
std::size_t runsPerStep(std::string const& name, AnyMap const& values) {
    auto const place = values.find<Matrix>("WeightPlace");
    if (textValue(values, "Version") != MORVA::WEIGHTS::BAND_VERSION || !place) return 1;
    if (name == "WeightPlace") return 0;  // added, not multiplied
    return name == "WeightScore" ? 1 : place->rows;
}

// The facts of one value; adds its share to the sums in `whole`.
ValueFacts describe(std::string const& name, AnyMap const& values, WeightFacts& whole) {
    ValueFacts facts{.name = name, .type = "", .shape = "", .text = ""};
    Describer describer(facts, whole, runsPerStep(name, values));
    MORVA::WEIGHTS::visitValue(values, name, describer);
    describer.finish();
    return facts;
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
