#include "weight_mutator.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <iterator>
#include <limits>
#include <random>
#include <vector>

#include "support/record_writer.h"
#include "support/reference_reader.h"
#include "weights/weight.h"

namespace test_support {

namespace {

using Vector = WeightWriter::Vector;
using Matrix = WeightWriter::Matrix;

constexpr int maxInt = std::numeric_limits<int>::max();
constexpr float infinity = std::numeric_limits<float>::infinity();

// The names whose absence or type the engine treats in a way of its own.
constexpr std::array optionalNames = {
    "Test_MINMAX",
    "Test_BestF1",
    "CONTROL_MORVA_COMPRESS_RATE_v0_0_6",
    "CONTROL_MORVA_COMPRESS_RATE_v0_0_5",
    "CONTROL_MORVA_SMOOT_COEF_v0_0_6",
    "CONTROL_MORVA_SMOOT_RM_MODIFY_v0_0_6",
    "CONTROL_MORVA_HIGH_FREQ_SMOOT_v0_0_6",
    "CONTROL_MORVA_ENABLE_CLIP_FIX_v0_0_6",
    "CONTROL_MORVA_CLIP_FIX_POINT_v0_0_6",
    "CONTROL_MORVA_SKIP_FRAME_v0_0_6",
    "CONTROL_MORVA_VOLUME_UP_v0_0_6",
    "CONTROL_MORVA_VOLUME_UP_PERCENT_v0_0_6",
    "CONTROL_MORVA_ENABLE_THRESH_CUT_v0_0_6",
    "CONTROL_MORVA_THRESH_CUT_REF_EN_v0_0_6",
    "CONTROL_MORVA_ENABLE_RM_THRESHOLD_v0_0_6",
    "CONTROL_MORVA_RM_THRESHOLD_v0_0_6",
    "CONTROL_MORVA_ENABLE_RESCALE_v0_0_6",
    "CONTROL_MORVA_RESCALE_REF_AMPL_v0_0_6",
    "CONTROL_MORVA_RESCALE_REF_EN_v0_0_6",
    "CONTROL_MORVA_ENABLE_BACKGROUND_SPEAKER_FIX_v0_0_6",
};

class Mutator {
public:
    explicit Mutator(unsigned seed) : engine_(seed) {}

    std::string operator()(std::string_view bytes) {
        auto records = ReferenceReader(bytes).read();
        if (records.empty()) return std::string(bytes);
        auto const victim = std::next(records.begin(), below(static_cast<int>(records.size())));
        switch (below(12)) {
            case 0:
                records.erase(victim);
                break;
            case 1:
                addOptional(records);
                break;
            case 2:
                addOptional(records);
                break;
            case 3:
                retype(records, victim->first);
                break;
            case 4:
                return stack(records) + victim->second.substr(0, below(victim->second.size()));
            default:
                changeValue(victim->first, victim->second);
                break;
        }
        return stack(records);
    }

private:
    int below(int limit) { return std::uniform_int_distribution(0, limit - 1)(engine_); }
    std::size_t below(std::size_t limit) { return engine_() % limit; }

    static std::string stack(Records const& records) {
        std::string bytes;
        for (auto const& [name, record] : records) bytes += record;
        return bytes;
    }

    float number() {
        constexpr std::array values = {
            0.0F,   -0.0F,  1.0F,      -1.0F,    0.5F,
            1e-40F, 1e-20F, 1e20F,     infinity, 3e38F,
            -3e38F, 100.0F, -infinity, 0.05F,    std::numeric_limits<float>::quiet_NaN()};
        return below(2) == 0 ? values[below(values.size())]
                             : std::normal_distribution<float>(0, 10)(engine_);
    }
    int integer() {
        constexpr std::array values = {
            0,  1,   -1,  2,   3,   4,    5,     16,    17,    30,     31,          32,     80,
            81, 121, 160, 161, 240, 8000, 16000, 32000, 48000, maxInt, -maxInt - 1, 1 << 30};
        return values[below(values.size())];
    }
    std::string text() {
        constexpr std::array values = {"0.0.1", "0.0.2",     "0.0.3", "0.0.4", "0.0.5",
                                       "0.0.6", "VAD_0.0.1", "t",     "TRUE",  ""};
        return values[below(values.size())];
    }

    void change(float& value) { value = number(); }
    void change(int& value) {
        auto const bits = static_cast<unsigned>(value);
        switch (below(5)) {
            case 0:
                value = static_cast<int>(bits + 1);
                break;
            case 1:
                value = static_cast<int>(bits - 1);
                break;
            case 2:
                value = static_cast<int>(bits * 2);
                break;
            case 3:
                value /= 2;
                break;
            default:
                value = integer();
                break;
        }
    }
    void change(std::string& value) { value = text(); }
    void change(Vector& values) {
        switch (below(5)) {
            case 0:
                values.resize(below(2 * values.size() + 2), number());
                break;
            case 1:
                values.assign(values.size(), number());
                break;
            default:
                if (!values.empty()) values[below(values.size())] = number();
                break;
        }
    }
    void change(Matrix& matrix) {
        switch (below(6)) {
            case 0:
                matrix.rows = below(2 * matrix.rows + 2);
                break;
            case 1:
                matrix.cols = below(2 * matrix.cols + 2);
                break;
            case 2:
                std::swap(matrix.rows, matrix.cols);
                break;
            default:
                change(matrix.data);
                break;
        }
        if (matrix.rows * matrix.cols > 100'000) matrix = {};
        matrix.data.resize(matrix.rows * matrix.cols, 0.1F);
    }
    template <class Element>
    void change(std::vector<Element>& list) {
        int const kind = below(6);
        if (kind == 0 || list.empty())
            list.emplace_back();
        else if (kind == 1)
            list.pop_back();
        else if (kind == 2)
            list.push_back(list[below(list.size())]);
        else
            change(list[below(list.size())]);
    }

    template <class T>
    bool changeAs(MORVA::CONTAINERS::AnyMap const& values, std::string const& name,
                  std::string& record) {
        auto const value = values.find<T>(name);
        if (value == nullptr) return false;
        change(*value);
        record = WeightWriter().add(name, *value).bytes();
        return true;
    }
    void changeValue(std::string const& name, std::string& record) {
        MORVA::WEIGHTS::Weight weight;
        weight.read(record.data(), record.size());
        auto const& values = weight.values();
        changeAs<float>(values, name, record) || changeAs<int>(values, name, record) ||
            changeAs<std::string>(values, name, record) || changeAs<Vector>(values, name, record) ||
            changeAs<Matrix>(values, name, record) ||
            changeAs<WeightWriter::Vectors>(values, name, record) ||
            changeAs<WeightWriter::Matrices>(values, name, record);
    }

    void retype(Records& records, std::string const& name) {
        WeightWriter writer;
        switch (below(4)) {
            case 0:
                writer.add(name, number());
                break;
            case 1:
                writer.add(name, integer());
                break;
            case 2:
                writer.add(name, text());
                break;
            default:
                writer.add(name, Vector(below(std::size_t{8}), number()));
                break;
        }
        records[name] = writer.bytes();
    }
    void addOptional(Records& records) {
        retype(records, optionalNames[below(optionalNames.size())]);
    }

    std::mt19937 engine_;
};

}  // namespace

std::string mutateWeight(std::string_view bytes, unsigned seed) {
    return Mutator(seed)(bytes);
}

}  // namespace test_support
