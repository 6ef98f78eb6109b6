#include "rate_converter.h"

#include <array>
#include <string>

#include "error.h"

namespace morva::cli {

RateConverter::RateConverter(int fromHz, int toHz)
    : ratio_(static_cast<double>(toHz) / fromHz), state_(nullptr, &src_delete) {
    if (fromHz == toHz) return;
    int error = 0;
    if (src_is_valid_ratio(ratio_) != 0) state_.reset(src_new(SRC_SINC_BEST_QUALITY, 1, &error));
    if (!state_) {
        throw Error("cannot convert " + std::to_string(fromHz) + " Hz to " + std::to_string(toHz) +
                    " Hz");
    }
}

void RateConverter::push(std::span<float const> in, std::vector<float>& out) {
    run(in, false, out);
}

void RateConverter::finish(std::vector<float>& out) {
    run({}, true, out);
}

void RateConverter::run(std::span<float const> in, bool last, std::vector<float>& out) {
    if (!state_) {
        out.insert(out.end(), in.begin(), in.end());
        return;
    }
    std::array<float, 4096> block{};
    float const nothing = 0.0F;
    SRC_DATA data{};
    data.data_in = in.empty() ? &nothing : in.data();
    data.input_frames = static_cast<long>(in.size());
    data.data_out = block.data();
    data.output_frames = static_cast<long>(block.size());
    data.end_of_input = last ? 1 : 0;
    data.src_ratio = ratio_;
    do {
        if (int const error = src_process(state_.get(), &data); error != 0)
            throw Error(src_strerror(error));
        out.insert(out.end(), block.begin(), block.begin() + data.output_frames_gen);
        data.data_in += data.input_frames_used;
        data.input_frames -= data.input_frames_used;
    } while (data.input_frames > 0 || data.output_frames_gen > 0);
}

}  // namespace morva::cli
