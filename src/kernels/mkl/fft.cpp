#include "kernels/fft.h"

#include <mkl_dfti.h>
#include <mkl_service.h>

#include "kernels/math_setup.h"
#include "utils/non_copyable.h"

namespace MORVA::UTILS {
namespace {

class FFT_MKL final : public FFT, private NonCopyMovable {
public:
    explicit FFT_MKL(std::size_t n) : size(n) {
        // A status other than 0 leaves the descriptor uncommitted, which every compute call then
        // reports; so none is looked at here.
        DftiCreateDescriptor(&descriptor, DFTI_SINGLE, DFTI_REAL, 1, static_cast<MKL_LONG>(n));
        DftiSetValue(descriptor, DFTI_PLACEMENT, DFTI_NOT_INPLACE);
        DftiSetValue(descriptor, DFTI_BACKWARD_SCALE, 1.0 / static_cast<double>(n));
        DftiCommitDescriptor(descriptor);
    }

    ~FFT_MKL() override {
        DftiFreeDescriptor(&descriptor);
        MKL_Free_Buffers();
    }

    bool computeForward(std::vector<float> const& in,
                        std::vector<std::complex<float>>& out) const override {
        out.resize(size / 2 + 1);
        return computeForward(in.data(), in.size(), out.data(), out.size());
    }

    bool computeForward(float const* in, std::size_t, std::complex<float>* out,
                        std::size_t) const override {
        return DftiComputeForward(descriptor, const_cast<float*>(in), out) == DFTI_NO_ERROR;
    }

    bool computeBackward(std::vector<std::complex<float>> const& in,
                         std::vector<float>& out) const override {
        out.resize(size);
        return computeBackward(in.data(), in.size(), out.data(), out.size());
    }

    bool computeBackward(std::complex<float> const* in, std::size_t, float* out,
                         std::size_t) const override {
        return DftiComputeBackward(descriptor, const_cast<std::complex<float>*>(in), out) ==
               DFTI_NO_ERROR;
    }

private:
    std::size_t size;
    DFTI_DESCRIPTOR_HANDLE descriptor = nullptr;
};

}  // namespace

std::shared_ptr<FFT> FFT::create(std::size_t n) {
    configureMathLibrary(0);  // for those who did not come through the engine
    return std::make_unique<FFT_MKL>(n);
}

}  // namespace MORVA::UTILS
