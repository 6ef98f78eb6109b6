// Any sequence of calls of the C interface, in any order, with right and wrong handles, sizes and
// names: every answer is one of those that the header lists.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <initializer_list>

#include "harness.h"
#include "support/weight_writer.h"

namespace {

constexpr int rates[] = {8000,  12000, 16000, 24000, 32000, 44100,
                         48000, 88200, 96000, 22050, 0,     -1};
constexpr int durations[] = {10, 20, 30, 40, 15, 32, 0, 25};
constexpr char const* names[] = {"nc6", "nc5", "vad", "", "other", nullptr};

struct Weights {
    std::string nc6;
    std::string nc5;
    std::string vad;
};

Weights const& weights() {
    static auto const all = [] {
        test_support::NcShape nc;
        nc.sampleRate = 8000;
        nc.frameLength = 160;
        nc.filtrEnd = 64;
        nc.previewFrames = 1;
        nc.hidden = 4;
        nc.gates = 4;
        Weights made;
        made.nc6 = test_support::randomNcWeight(nc);
        nc.version = "0.0.5";
        nc.gates = 1;
        made.nc5 = test_support::randomNcWeight(nc);
        test_support::VadShape vad;
        vad.hidden = 2;
        vad.gates = 1;
        made.vad = test_support::randomVadWeight(vad);
        return made;
    }();
    return all;
}

bool isOneOf(int value, std::initializer_list<int> legal) {
    return std::find(legal.begin(), legal.end(), value) != legal.end();
}

class Caller {
public:
    explicit Caller(FuzzedDataProvider& choices) : choices_(choices) {}
    ~Caller() { Morva_SDK_GlobalDestroy(); }
    Caller(Caller const&) = delete;
    Caller& operator=(Caller const&) = delete;

    void step() {
        switch (choices_.ConsumeIntegralInRange(0, 15)) {
            case 0:
                answer(Morva_SDK_GlobalDestroy(), {0, -3});
                break;
            case 1:
            case 2:
                start();
                break;
            case 3:
                setModel();
                break;
            case 4:
            case 5:
            case 6:
                open();
                break;
            case 7:
                close();
                break;
            case 8:
                answer(Morva_NoiseDB_ResetSession(handle()), {1, -3});
                break;
            case 9:
                sizes();
                break;
            case 10:
                adjust();
                break;
            default:
                frame();
                break;
        }
    }

private:
    void answer(int value, std::initializer_list<int> legal) {
        fuzz::require(isOneOf(value, legal), "the answer is one that the header lists");
    }
    template <class T, std::size_t n>
    T pick(T const (&values)[n]) {
        return values[choices_.ConsumeIntegralInRange<std::size_t>(0, n - 1)];
    }
    // Mostly legal, so that sequences get somewhere.
    MorvaSamplingRate rate() {
        auto const wild = choices_.ConsumeIntegralInRange(0, 15) == 0;
        return static_cast<MorvaSamplingRate>(wild ? pick(rates)
                                                   : rates[choices_.ConsumeIntegralInRange(0, 8)]);
    }
    MorvaFrameDuration duration() {
        auto const wild = choices_.ConsumeIntegralInRange(0, 15) == 0;
        return static_cast<MorvaFrameDuration>(
            wild ? pick(durations) : durations[choices_.ConsumeIntegralInRange(0, 3)]);
    }
    // A live, a closed, a null or an invented handle; the last ones are never looked into.
    void* handle() {
        auto const which = choices_.ConsumeIntegralInRange<std::size_t>(0, handles_.size() + 1);
        if (which < handles_.size()) return handles_[which];
        return which == handles_.size() ? nullptr : &choices_;
    }

    void start() {
        int const result = Morva_SDK_GlobalInit(choices_.ConsumeBool() ? L"/nowhere" : nullptr,
                                                choices_.ConsumeIntegral<unsigned>());
        answer(result, {0, -3});
        if (result != 0) return;
        auto const& all = weights();
        add(all.nc6, "nc6");
        add(all.nc5, "nc5");
        add(all.vad, "vad");
    }
    int add(std::string const& weight, char const* name) {
        return Morva_SDK_SetModel_Blob(weight.data(), static_cast<unsigned>(weight.size()), name);
    }
    void setModel() {
        switch (choices_.ConsumeIntegralInRange(0, 3)) {
            case 0:
                answer(Morva_SDK_SetModel(nullptr, pick(names)), {2});
                break;
            case 1:
                answer(Morva_SDK_SetModel(L"missing.mvw", pick(names)), {2, -3});
                break;
            case 2:
                answer(Morva_SDK_SetModel_Blob(nullptr, 5, pick(names)), {2});
                break;
            default: {
                auto const bytes = choices_.ConsumeRandomLengthString(64);
                answer(add(bytes, choices_.ConsumeRandomLengthString(8).c_str()), {0, 2, -3});
            }
        }
    }
    void open() {
        auto const in = rate();
        auto const out = rate();
        auto const ms = duration();
        auto const* const name = pick(names);
        void* opened = nullptr;
        switch (choices_.ConsumeIntegralInRange(0, 2)) {
            case 0:
                opened = Morva_NC_CreateSession(in, out, ms, name);
                break;
            case 1:
                opened = Morva_VAD_CreateSession(in, ms, name);
                break;
            default:
                opened = Morva_NoiseDB_CreateSession(in, ms, name);
                break;
        }
        if (opened != nullptr) handles_.push_back(opened);
    }
    void close() {
        auto* const victim = handle();
        switch (choices_.ConsumeIntegralInRange(0, 2)) {
            case 0:
                answer(Morva_NC_CloseSession(victim), {0, -3});
                break;
            case 1:
                answer(Morva_VAD_CloseSession(victim), {0, -3});
                break;
            default:
                answer(Morva_NoiseDB_CloseSession(victim), {0, -3});
                break;
        }
    }
    void sizes() {
        unsigned in = 0;
        unsigned out = 0;
        answer(MorvaExt_SessionFrameSizes(handle(), &in, &out), {0, 2, -3});
        auto const latency = MorvaExt_SessionLatencySamples(handle());
        fuzz::require(latency >= -3, "a latency is a count or a code");
    }
    // What can be changed while a noise-cancellation session runs.
    void adjust() {
        auto* const session = handle();
        int const on = choices_.ConsumeIntegralInRange(0, 2);
        switch (choices_.ConsumeIntegralInRange(0, 4)) {
            case 0: {
                auto const limit = choices_.ConsumeFloatingPoint<float>();
                answer(MorvaExt_NC_SetAttenuationLimit(session, limit), {0, 1, 2, -3});
                break;
            }
            case 1:
                answer(MorvaExt_NC_SetBypass(session, on), {0, 2, -3});
                break;
            case 2:
                answer(MorvaExt_NC_SetBackgroundSpeaker(session, on), {0, 1, 2, -3});
                break;
            case 3:
                answer(MorvaExt_NC_EnableVoice(session, pick(names)), {0, 2, -3});
                break;
            default: {
                float voice = 0.0F;
                float level = 0.0F;
                answer(MorvaExt_NC_FrameMeters(session, &voice, &level), {0, 1, 2, -3});
                fuzz::require(std::isfinite(level), "the removed level is finite");
            }
        }
    }

    // The session's own sizes most of the time, else any; buffers are exactly as long as they are
    // said to be, so that a read past them is seen.
    void frame() {
        auto* const session = handle();
        unsigned in = 0;
        unsigned out = 0;
        MorvaExt_SessionFrameSizes(session, &in, &out);
        if (choices_.ConsumeIntegralInRange(0, 7) == 0) {
            in = choices_.ConsumeIntegralInRange(0U, 4000U);
        }
        if (choices_.ConsumeIntegralInRange(0, 7) == 0) {
            out = choices_.ConsumeIntegralInRange(0U, 4000U);
        }
        if (choices_.ConsumeBool()) {
            frameInt16(session, in, out);
        } else {
            frameFloat(session, in, out);
        }
    }
    void frameInt16(void* session, unsigned in, unsigned out) {
        std::vector<short> input(in, choices_.ConsumeIntegral<short>());
        std::vector<short> output(out);
        auto const* const source = input.empty() ? nullptr : input.data();
        switch (choices_.ConsumeIntegralInRange(0, 2)) {
            case 0:
                answer(Morva_NC_CleanAmbientNoiseInt16(session, source, in, output.data(), out),
                       {0, 1, 2, -3});
                break;
            case 1:
                value(Morva_VAD_FrameInt16(session, source, in));
                break;
            default:
                value(Morva_NoiseDB_FrameInt16(session, source, in));
                break;
        }
    }
    void frameFloat(void* session, unsigned in, unsigned out) {
        std::vector<float> input(in, choices_.ConsumeFloatingPoint<float>());
        std::vector<float> output(out);
        auto const* const source = input.empty() ? nullptr : input.data();
        switch (choices_.ConsumeIntegralInRange(0, 3)) {
            case 0:
                answer(Morva_NC_CleanAmbientNoiseFloat(session, source, in, output.data(), out),
                       {0, 1, 2, -3});
                for (float const sample : output) value(sample);
                break;
            case 1:
                unitValue(Morva_VAD_FrameFloat(session, source, in));
                break;
            case 2:
                unitValue(Morva_NoiseDB_FrameFloat(session, source, in));
                break;
            default: {
                float level = 0.0F;
                answer(MorvaExt_NoiseDB_FrameFloat(session, source, in, &level), {0, 1, 2, -3});
                value(level);
            }
        }
    }
    void value(float result) { fuzz::require(std::isfinite(result), "values are finite"); }
    void unitValue(float result) {
        bool const unit = result >= 0.0F && result <= 1.0F;
        fuzz::require(unit || result == -3.0F || result == -4.0F,
                      "a float value is 0..1 or a code");
    }

    FuzzedDataProvider& choices_;
    std::vector<void*> handles_;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    FuzzedDataProvider choices(data, size);
    Caller caller(choices);
    for (int i = 0; i < 100 && choices.remaining_bytes() > 0; ++i) caller.step();
    return 0;
}
