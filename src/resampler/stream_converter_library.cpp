#include <libresample.h>

#include "resampler/stream_converter.h"
#include "utils/exception.h"

namespace MORVA::UTILS {
namespace {

class LibraryConverter final : public StreamConverter {
public:
    LibraryConverter(std::size_t inRate, std::size_t outRate)
        : factor_(static_cast<double>(outRate) / static_cast<double>(inRate)), handle_(open()) {}

    int process(float const* in, int inCount, int& used, float* out, int room) override {
        // The library's interface lacks the const; it only reads its input.
        return resample_process(handle_.get(), factor_, const_cast<float*>(in), inCount,
                                kStreamGoesOn, &used, out, room);
    }

    void reset() override { handle_ = open(); }

private:
    struct Close {
        void operator()(void* handle) const { resample_close(handle); }
    };
    using Handle = std::unique_ptr<void, Close>;

    static constexpr int kHighQuality = 1;
    static constexpr int kStreamGoesOn = 0;

    Handle open() const {
        Handle handle(resample_open(kHighQuality, factor_, factor_));
        if (!handle) {
            raise("The resampler's filter could not be opened", "src/resampler/resampler",
                  "Resampler");
        }
        return handle;
    }

    double factor_;
    Handle handle_;
};

}  // namespace

std::unique_ptr<StreamConverter> makeStreamConverter(std::size_t inRate, std::size_t outRate) {
    return std::make_unique<LibraryConverter>(inRate, outRate);
}

}  // namespace MORVA::UTILS
