// Dense row-major float matrix: element (r, c) is data[r * cols + c].
#pragma once

#include <cstddef>
#include <vector>

namespace MORVA::CONTAINERS {

struct Matrix {
    std::vector<float> data;
    std::size_t rows = 0;
    std::size_t cols = 0;
};

}  // namespace MORVA::CONTAINERS
