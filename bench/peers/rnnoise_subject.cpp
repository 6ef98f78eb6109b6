// A native RNNoise library that the user has built or installed, loaded at run time.
#include <dlfcn.h>

#include <array>
#include <cstdio>

#include "subject.h"

namespace morva_bench {
namespace {

class Rnnoise final : public Subject {
public:
    // Null functions, and no state, when the library lacks them.
    explicit Rnnoise(void* library)
        : process_(function<float(void*, float*, float const*)>(library, "rnnoise_process_frame")),
          state_(nullptr, function<void(void*)>(library, "rnnoise_destroy")) {
        auto* const create = function<void*(void*)>(library, "rnnoise_create");
        if (create != nullptr && process_ != nullptr && state_.get_deleter() != nullptr) {
            state_.reset(create(nullptr));
        }
    }
    bool isUsable() const { return state_ != nullptr; }
    void frame(float const* samples) override {
        for (std::size_t i = 0; i < in_.size(); ++i) in_[i] = samples[i] * 32768.0f;
        process_(state_.get(), out_.data(), in_.data());
    }

private:
    template <class Function>
    static Function* function(void* library, char const* name) {
        return reinterpret_cast<Function*>(dlsym(library, name));
    }
    float (*process_)(void*, float*, float const*);
    std::unique_ptr<void, void (*)(void*)> state_;
    std::array<float, 480> in_{};
    std::array<float, 480> out_{};
};

}  // namespace

void addRnnoise(Contestants& all, std::string const& label, std::string const& path) {
    void* const library = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);  // stays for the process
    auto subject = library != nullptr ? std::make_unique<Rnnoise>(library) : nullptr;
    if (subject == nullptr || !subject->isUsable()) {
        std::printf("skipped: %s, no RNNoise library at %s\n", label.c_str(), path.c_str());
        return;
    }
    all.push_back({label, 48000, std::move(subject)});
}

}  // namespace morva_bench
