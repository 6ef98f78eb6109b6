#include "morva-sdk/model_facts.h"

#include <cstddef>
#include <string>
#include <vector>

#include "kernels/matrix.h"
#include "weights/value_types.h"

namespace MORVA::MORVA_SDK {
namespace {

std::size_t numbersIn(std::string const&) {
    return 0;
}
template <class Number>
std::size_t numbersIn(Number) {
    return 1;
}
std::size_t numbersIn(std::vector<float> const& values) {
    return values.size();
}
std::size_t numbersIn(CONTAINERS::Matrix const& matrix) {
    return matrix.data.size();
}
template <class Element>
std::size_t numbersIn(std::vector<Element> const& parts) {
    std::size_t sum = 0;
    for (auto const& part : parts) sum += numbersIn(part);
    return sum;
}

}  // namespace

ModelFacts modelFacts(WEIGHTS::Weight const& weight) {
    ModelFacts facts;
    if (auto const version = weight.values().find<std::string>(WEIGHTS::VERSION)) {
        facts.version = *version;
    }
    auto const rate = weight.values().find<int>(WEIGHTS::SAMPLERATE);
    auto const length = weight.values().find<int>(WEIGHTS::FRAMELENGHT);
    if (rate) facts.sampleRate = *rate;
    if (rate && length && *rate > 0) {
        facts.frameMs = static_cast<int>(static_cast<long long>(*length) * 1000 / *rate);
    }
    for (auto const& [name, value] : weight.values()) {
        WEIGHTS::visitValue(weight.values(), name, [&](auto const& typed) {
            facts.bytes += sizeof(float) * numbersIn(typed);
        });
    }
    return facts;
}

}  // namespace MORVA::MORVA_SDK
