// Sends two seconds of hiss through the engine and tells how much quieter it became.
#include <cmath>
#include <cstdio>
#include <memory>
#include <random>
#include <vector>

#include "morva-ext.h"
#include "morva-sdk.h"

namespace {

constexpr auto kRate = MORVA_RATE_48000;
constexpr std::size_t kFrame = 480;

struct CloseSession {
    void operator()(void* session) const { Morva_NC_CloseSession(session); }
};

double power(std::vector<float> const& frame) {
    double sum = 0.0;
    for (float const sample : frame) sum += static_cast<double>(sample) * sample;
    return sum;
}

int run() {
    std::unique_ptr<void, CloseSession> const session(
        Morva_NC_CreateSession(kRate, kRate, MORVA_FRAME_10_MS, "full"));
    if (!session) return 1;
    MorvaExt_NC_SetAttenuationLimit(session.get(), 20.0f);

    std::mt19937 engine(1);
    std::normal_distribution<float> hiss(0.0f, 0.05f);
    std::vector<float> in(kFrame);
    std::vector<float> out(kFrame);
    double before = 0.0;
    double after = 0.0;
    for (int k = 0; k < 200; ++k) {
        for (float& sample : in) sample = hiss(engine);
        if (Morva_NC_CleanAmbientNoiseFloat(session.get(), in.data(), kFrame, out.data(), kFrame)) {
            return 1;
        }
        if (k < 100) continue;  // the model listens first
        before += power(in);
        after += power(out);
    }
    std::printf("morva %s: hiss lowered by %.1f dB, latency %d samples\n", MorvaExt_Version(),
                10.0 * std::log10(before / after), MorvaExt_SessionLatencySamples(session.get()));
    return 0;
}

}  // namespace

int main() {
    if (Morva_SDK_GlobalInit(MORVA_MODELS, 1) != 0) return 1;
    int const status = Morva_SDK_SetModel(L"c6.xs.f.ca03f4.mvw", "full") == 0 ? run() : 1;
    Morva_SDK_GlobalDestroy();
    return status;
}
