// Any bytes as a weight: registration, sessions of every kind, ten frames each. The mutator takes
// the records apart, changes one typed value and writes them back: byte-wise changes alone would
// rarely get past the shape checks of the cleaners.
#include <array>
#include <cstring>
#include <iterator>
#include <limits>

#include "harness.h"
#include "support/reference_reader.h"
#include "weights/value_types.h"
#include "weights/weight.h"

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t maxSize);

namespace {

using test_support::Records;
using test_support::WeightWriter;
using Matrix = WeightWriter::Matrix;

// Names that the engine may do without, blank-separated.
constexpr std::string_view optionalNames =
    "COMPRESS_RATE SMOOT_COEF SMOOT_RM_MODIFY HIGH_FREQ_SMOOT ENABLE_CLIP_FIX CLIP_FIX_POINT "
    "SKIP_FRAME VOLUME_UP VOLUME_UP_PERCENT ENABLE_THRESH_CUT THRESH_CUT_REF_EN RESCALE_REF_AMPL "
    "ENABLE_RM_THRESHOLD RM_THRESHOLD ENABLE_RESCALE RESCALE_REF_EN ENABLE_BACKGROUND_SPEAKER_FIX ";

class Mutator {
public:
    explicit Mutator(unsigned seed) : engine_(seed) {}

    std::string operator()(std::string const& bytes) {
        auto records = test_support::ReferenceReader(bytes).read();
        if (records.empty()) return bytes;
        auto const victim = std::next(records.begin(), below(static_cast<long>(records.size())));
        std::string tail;
        auto const choice = below(10);
        if (choice == 1) replace(records, optionalName());
        if (choice == 2) tail = victim->second.substr(0, below(victim->second.size()));
        if (choice > 2) changeValue(victim->first, victim->second);
        if (choice == 0) records.erase(victim);
        std::string all;
        for (auto const& [name, record] : records) all += record;
        return all + tail;
    }

private:
    template <class Number>
    Number below(Number limit) {
        return static_cast<Number>(engine_() % static_cast<unsigned long>(limit));
    }
    template <class Values>
    auto oneOf(Values const& values) {
        return values[below(std::size(values))];
    }
    std::string optionalName() {
        auto const end = optionalNames.find(' ', below(optionalNames.size()));
        auto const start = optionalNames.rfind(' ', end - 1) + 1;
        auto const generation = 1 + below(7);
        return "CONTROL_MORVA_" + std::string(optionalNames.substr(start, end - start)) +
               (generation < 7 ? "_v0_0_" + std::to_string(generation) : "_v1_0_0");
    }

    void change(float& value) {
        constexpr float inf = std::numeric_limits<float>::infinity();
        constexpr std::array values = {0.0F,  -0.0F,  1.0F, -1.0F, 0.5F,   1e-40F, 1e-20F, 1e20F,
                                       3e38F, -3e38F, inf,  -inf,  100.0F, 0.05F,  NAN};
        value = below(2) == 0 ? oneOf(values) : std::normal_distribution<float>(0, 10)(engine_);
    }
    void change(int& value) {
        constexpr std::array values = {0, 1, -1, 2, 31, 32, 80, 160, 8000, 16000, 32000, 48000};
        auto const bits = static_cast<unsigned>(value);
        std::array const near = {bits + 1, bits - 1, bits * 2, bits / 2, 1U << 31U};
        value = below(2) == 0 ? oneOf(values) : static_cast<int>(oneOf(near));
    }
    void change(std::string& value) {
        constexpr std::array values = {"0.0.1",    "0.0.2",     "0.0.3", "0.0.4", "0.0.5", "0.0.6",
                                       "NC_1.0.0", "VAD_0.0.1", "t",     "TRUE",  ""};
        value = oneOf(values);
    }
    void change(Matrix& matrix) {
        int const kind = below(5);
        if (kind == 0) matrix.rows = below(2 * matrix.rows + 2);
        if (kind == 1) matrix.cols = below(2 * matrix.cols + 2);
        if (matrix.rows * matrix.cols > 100'000) matrix = {};
        matrix.data.resize(matrix.rows * matrix.cols, 0.1F);
        if (kind > 1 && !matrix.data.empty()) change(matrix.data[below(matrix.data.size())]);
    }
    template <class Element>
    void change(std::vector<Element>& list) {
        int const kind = below(8);
        if (kind == 0 || list.empty()) {
            list.emplace_back();
        } else if (kind == 1) {
            list.pop_back();
        } else if (kind == 2) {
            list.push_back(list[below(list.size())]);
        } else {
            change(list[below(list.size())]);
        }
    }

    void changeValue(std::string const& name, std::string& record) {
        MORVA::WEIGHTS::Weight weight;
        weight.read(record.data(), record.size());
        MORVA::WEIGHTS::visitValue(weight.values(), name, [&](auto value) {
            change(value);
            record = WeightWriter().add(name, value).bytes();
        });
    }
    void replace(Records& records, std::string const& name) {
        auto& record = records[name] = below(2) == 0 ? WeightWriter().add(name, 0.5F).bytes()
                                                     : WeightWriter().add(name, "t").bytes();
        if (below(2) == 0) changeValue(name, record);
    }

    std::mt19937 engine_;
};

void runValues(void* session, float (*frame)(void*, short const*, unsigned), unsigned size) {
    std::vector<short> const sound(size, 5000);
    for (int i = 0; session != nullptr && i < 10; ++i) {
        frame(session, sound.data(), size);
        if (i == 5) Morva_NoiseDB_ResetSession(session);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const bytes(reinterpret_cast<char const*>(data), size);
    MORVA::WEIGHTS::Weight weight;
    bool const isRead = weight.read(bytes.data(), size);
    auto const expected = test_support::ReferenceReader(bytes).read();
    bool const isPlain = bytes.find("half:") == bytes.npos;  // which the oracle does not know
    fuzz::require(isRead && (!isPlain || test_support::writeBack(weight.values()) == expected),
                  "read in full");
    fuzz::Engine const engine;
    if (fuzz::Engine::setModel(bytes, "model") != 0) return 0;
    fuzz::run(8000, 8000, 40, "model");
    fuzz::run(48000, 16000, 10, "model");
    runValues(Morva_VAD_CreateSession(MORVA_RATE_8000, MORVA_FRAME_20_MS, "model"),
              Morva_VAD_FrameInt16, 160);
    runValues(Morva_NoiseDB_CreateSession(MORVA_RATE_16000, MORVA_FRAME_30_MS, "model"),
              Morva_NoiseDB_FrameInt16, 480);
    return 0;
}

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t maxSize, unsigned seed) {
    if (seed % 4 == 0) return LLVMFuzzerMutate(data, size, maxSize);
    auto const mutated = Mutator(seed)(std::string(reinterpret_cast<char const*>(data), size));
    auto const kept = std::min(mutated.size(), maxSize);
    std::memcpy(data, mutated.data(), kept);
    return kept;
}
