// Collects the largest deviation from a reference and prints it beside the limit it must keep.
#pragma once

#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <span>
#include <string>
#include <utility>

namespace test_support {

// The norm of the difference over the norm of what was wanted.
inline double relativeError(std::span<float const> got, std::span<float const> wanted) {
    EXPECT_EQ(got.size(), wanted.size());
    double error = 0.0;
    double signal = 0.0;
    for (std::size_t i = 0; i < std::min(got.size(), wanted.size()); ++i) {
        error += std::pow(static_cast<double>(got[i]) - wanted[i], 2);
        signal += std::pow(static_cast<double>(wanted[i]), 2);
    }
    return std::sqrt(error / signal);
}

class ErrorBound {
public:
    ErrorBound(std::string what, double limit) : what_(std::move(what)), limit_(limit) {}
    ErrorBound(ErrorBound const&) = delete;
    ErrorBound& operator=(ErrorBound const&) = delete;
    ~ErrorBound() {
        std::printf("[    bound ] %s: %.3g (limit %.3g, %zu values)\n", what_.c_str(), worst_,
                    limit_, count_);
        EXPECT_GT(count_, 0u) << what_ << ": nothing was compared";
        EXPECT_LE(worst_, limit_) << what_;
    }

    // `scale` is what an error of 1 would mean; a NaN on one side only is an endless error.
    void add(double got, double wanted, double scale = 1.0) {
        ++count_;
        if (got == wanted || (std::isnan(got) && std::isnan(wanted))) return;
        double const error = std::abs(got - wanted) / scale;
        worst_ = std::max(worst_, std::isnan(error) ? HUGE_VAL : error);
    }

private:
    std::string what_;
    double limit_;
    double worst_ = 0.0;
    std::size_t count_ = 0;
};

}  // namespace test_support
