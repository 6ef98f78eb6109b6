#include "resampler/resampler.h"

#include <algorithm>

#include "utils/exception.h"

namespace MORVA::UTILS {
namespace {

constexpr std::size_t kLargestRatio = 256;
constexpr std::size_t kUsualBlock =
    3840;  // 40 ms at 96 kHz: reserved ahead, so that no frame allocates

}  // namespace

Resampler::Resampler(std::size_t inRate, std::size_t outRate) : inRate_(inRate), outRate_(outRate) {
    bool const near =
        (inRate - 1) / kLargestRatio < outRate && (outRate - 1) / kLargestRatio < inRate;
    if (inRate == 0 || outRate == 0 || !near) {
        raise("The resampler cannot convert between these rates", "src/resampler/resampler",
              "Resampler");
    }
    converter_ = makeStreamConverter(inRate, outRate);
    if (!isIdentity()) buffer_.reserve(static_cast<std::size_t>(extraRoom_) + kUsualBlock);
}

unsigned Resampler::resample(std::vector<float> const& in, std::vector<float>& out) {
    if (isIdentity()) {
        if (&in != &out) out = in;
        return static_cast<unsigned>(in.size());
    }
    int const expected = static_cast<int>(in.size() * outRate_ / inRate_);
    buffer_.resize(static_cast<std::size_t>(extraRoom_) + static_cast<std::size_t>(expected));
    int const room = extraRoom_ + expected - heldOver_;
    int const produced =
        convert(in.data(), static_cast<int>(in.size()), buffer_.data() + heldOver_, room);
    out.resize(static_cast<std::size_t>(expected));  // only now: it may be `in` itself
    if (firstBlock_) {
        startWithDelay(out, produced);
    } else {
        continueStream(out, produced);
    }
    firstBlock_ = false;
    return static_cast<unsigned>(produced);
}

int Resampler::resample(float* in, int inCount, float* out, int outCapacity) {
    return convert(in, inCount, out, outCapacity);
}

bool Resampler::reset() {
    converter_->reset();
    firstBlock_ = true;
    heldOver_ = 0;
    return true;
}

std::size_t Resampler::leadingZeros(std::size_t blockLength) const {
    if (isIdentity()) return 0;
    Resampler fresh(inRate_, outRate_);
    std::vector<float> const silence(blockLength);
    std::vector<float> out;
    unsigned const produced = fresh.resample(silence, out);
    return out.size() + 1 - std::min<std::size_t>(produced, out.size() + 1);
}

int Resampler::convert(float const* in, int inCount, float* out, int room) {
    int consumed = 0;
    int produced = 0;
    while (true) {
        int used = 0;
        int const got = converter_->process(in + consumed, inCount - consumed, used, out + produced,
                                            room - produced);
        consumed += used;
        if (got > 0) produced += got;
        bool const stuck = got == 0 && (consumed == inCount || used == 0);
        if (got < 0 || stuck) return produced;
    }
}

// One sample is always kept back, so that a later block that yields one sample less than its share
// still comes out whole.
void Resampler::startWithDelay(std::vector<float>& out, int produced) {
    int const expected = static_cast<int>(out.size());
    int const zeros = std::clamp(expected - produced + 1, 0, expected);
    int const delivered = expected - zeros;
    std::fill_n(out.begin(), zeros, 0.0f);
    std::copy_n(buffer_.begin(), delivered, out.begin() + zeros);
    std::copy(buffer_.begin() + delivered, buffer_.begin() + produced, buffer_.begin());
    heldOver_ = produced - delivered;
}

void Resampler::continueStream(std::vector<float>& out, int produced) {
    int const expected = static_cast<int>(out.size());
    int const available = heldOver_ + produced;
    int const delivered = std::min(expected, available);
    std::copy_n(buffer_.begin(), delivered, out.begin());
    std::fill(out.begin() + delivered, out.end(), 0.0f);
    std::copy(buffer_.begin() + delivered, buffer_.begin() + available, buffer_.begin());
    heldOver_ = available - delivered;
}

}  // namespace MORVA::UTILS
