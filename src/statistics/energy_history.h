// What the energy statistics share: a frame's mean energy, and a fixed-length history that reuses
// its nodes.
#pragma once

#include <list>
#include <span>

#include "kernels/vector_math.h"

namespace MORVA::UTILS {

inline double meanEnergy(std::span<float const> frame) {
    return frame.empty() ? 0.0 : sumOfSquares(frame) / static_cast<double>(frame.size());
}

// Replaces the oldest entry by a newest one; returns by how much the sum of the list changed.
inline double replaceOldest(std::list<double>& history, double value) {
    double const change = value - history.front();
    history.splice(history.end(), history, history.begin());
    history.back() = value;
    return change;
}

}  // namespace MORVA::UTILS
