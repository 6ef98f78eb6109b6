// The engine as a subject of the comparison.
#include "bench_engine.h"
#include "subject.h"

namespace morva_bench {
namespace {

class Ours final : public Subject {
public:
    Ours(char const* model, int rate) : session_(model, rate), frame_(frameSize(rate)) {}
    void frame(float const* samples) override {
        frame_.assign(samples, samples + frame_.size());
        std::size_t position = 0;
        session_.clean(frame_, position);
    }

private:
    static std::size_t frameSize(int rate) { return static_cast<std::size_t>(rate / 100); }
    Session session_;
    std::vector<float> frame_;
};

}  // namespace

void addOurs(Contestants& all) {
    startEngine();
    struct Place {
        char const* model;
        int rate;
    };
    for (auto const [model, rate] :
         {Place{"full_NC-ca03f4", 48000}, Place{"full_NC-ca03f4", 32000}, Place{"small_NC", 48000},
          Place{"small_NC", 16000}, Place{"small_NC_8k", 8000}}) {
        all.push_back(
            {std::string("this engine, ") + model, rate, std::make_unique<Ours>(model, rate)});
    }
}

}  // namespace morva_bench
