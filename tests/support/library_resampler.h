// The bare sample-rate conversion library as a reference: one stream, fed in calls of any length.
#pragma once

#include <libresample.h>

#include <algorithm>
#include <cstddef>
#include <memory>
#include <vector>

namespace test_support {

class LibraryResampler {
public:
    explicit LibraryResampler(double factor)
        : factor_(factor), handle_(resample_open(1, factor, factor), &resample_close) {}

    // All that the library delivers for this call's input. (Its clock is rounded anew at every
    // call, so that the division into calls matters.)
    std::vector<float> feed(float* in, std::size_t count) {
        std::vector<float> out(static_cast<std::size_t>(factor_ * static_cast<double>(count)) +
                               1024);
        std::size_t consumed = 0;
        std::size_t produced = 0;
        int got = 1;
        while (got > 0 || (got == 0 && consumed < count)) {
            int used = 0;
            got = resample_process(handle_.get(), factor_, in + consumed,
                                   static_cast<int>(count - consumed), 0, &used,
                                   out.data() + produced, static_cast<int>(out.size() - produced));
            consumed += static_cast<std::size_t>(used);
            produced += static_cast<std::size_t>(std::max(got, 0));
        }
        out.resize(produced);
        return out;
    }

private:
    double factor_;
    std::unique_ptr<void, decltype(&resample_close)> handle_;
};

}  // namespace test_support
