#include "kernels/fft.h"

#include <ducc0/fft/fft1d_impl.h>

#include <algorithm>
#include <array>
#include <optional>

#include "utils/non_copyable.h"

namespace MORVA::UTILS {
namespace {

class FFT_DUCC final : public FFT, private NonCopyMovable {
public:
    explicit FFT_DUCC(std::size_t n) : size_(n) {
        if (n == 0) return;
        plan_.emplace(n);
        // What the library makes at the first call is made now and not in a frame.
        std::vector<float> values(n);
        run(values.data(), 1.0f, true);
        run(values.data(), 1.0f, false);
    }

    bool computeForward(std::vector<float> const& in,
                        std::vector<std::complex<float>>& out) const override {
        out.resize(size_ / 2 + 1);
        return computeForward(in.data(), in.size(), out.data(), out.size());
    }

    // The library leaves real and imaginary parts in a row, less the ones that are always 0: the
    // first bin's and, of an even length, the last one's. (A complex number is two floats in a row,
    // by the language's own promise.)
    bool computeForward(float const* in, std::size_t, std::complex<float>* out,
                        std::size_t) const override {
        if (!plan_) return false;
        auto* const parts = reinterpret_cast<float*>(out);
        std::copy_n(in, size_, parts + 1);
        run(parts + 1, 1.0f, true);
        parts[0] = parts[1];
        parts[1] = 0.0f;
        if (size_ % 2 == 0) parts[size_ + 1] = 0.0f;
        return true;
    }

    bool computeBackward(std::vector<std::complex<float>> const& in,
                         std::vector<float>& out) const override {
        out.resize(size_);
        return computeBackward(in.data(), in.size(), out.data(), out.size());
    }

    bool computeBackward(std::complex<float> const* in, std::size_t, float* out,
                         std::size_t) const override {
        if (!plan_) return false;
        auto const* const parts = reinterpret_cast<float const*>(in);
        out[0] = parts[0];
        std::copy_n(parts + 2, size_ - 1, out + 1);
        run(out, 1.0f / static_cast<float>(size_), false);
        return true;
    }

private:
    // In place. Working room is on the stack, but for lengths with large prime factors.
    void run(float* values, float scale, bool forward) const {
        std::array<float, 4096> stack;  // more than any frame of 40 ms at 96000 Hz
        std::vector<float> heap(plan_->bufsize() > stack.size() ? plan_->bufsize() : 0);
        plan_->exec_copyback(values, heap.empty() ? stack.data() : heap.data(), scale, forward);
    }

    std::size_t size_;
    std::optional<ducc0::detail_fft::pocketfft_r<float>> plan_;
};

}  // namespace

std::shared_ptr<FFT> FFT::create(std::size_t n) {
    return std::make_shared<FFT_DUCC>(n);
}

}  // namespace MORVA::UTILS
