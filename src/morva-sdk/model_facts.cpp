#include "morva-sdk/model_facts.h"

#include <cstddef>
#include <vector>

#include "utils/matrix.h"

namespace MORVA::MORVA_SDK {
namespace {

using CONTAINERS::Matrix;
using Vector = std::vector<float>;

std::size_t floats(float) {
    return 1;
}
std::size_t floats(int) {
    return 1;
}
std::size_t floats(Vector const& values) {
    return values.size();
}
std::size_t floats(Matrix const& matrix) {
    return matrix.data.size();
}
template <class Element>
std::size_t floats(std::vector<Element> const& parts) {
    std::size_t sum = 0;
    for (auto const& part : parts) sum += floats(part);
    return sum;
}

template <class... Types>
std::size_t floatsOf(WEIGHTS::Weight const& weight, std::string const& name) {
    std::size_t sum = 0;
    auto const add = [&](auto const& found) { sum += found ? floats(*found) : 0; };
    (add(weight.values().find<Types>(name)), ...);
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
        facts.bytes +=
            sizeof(float) *
            floatsOf<float, int, Vector, Matrix, std::vector<Vector>, std::vector<Matrix>>(weight,
                                                                                           name);
    }
    return facts;
}

}  // namespace MORVA::MORVA_SDK
