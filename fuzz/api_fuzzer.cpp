// Any sequence of calls of the C interface, in any order, with right and wrong handles, sizes and
// names: every answer is one of those that the header lists.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <array>
#include <functional>
#include <initializer_list>

#include "harness.h"
#include "morva-sdk/vocabulary.h"

namespace {

constexpr std::array<char const*, 6> names = {"nc6", "nc5", "vad", "", "other", nullptr};

class Caller {
public:
    explicit Caller(FuzzedDataProvider& choices) : choices_(choices) {}
    ~Caller() { Morva_SDK_GlobalDestroy(); }
    Caller(Caller const&) = delete;
    Caller& operator=(Caller const&) = delete;

    // Starting, opening and frames more often than the rest, so that sequences get somewhere.
    void step() {
        auto const choice = below(16);
        if (choice == 0) return answer(Morva_SDK_GlobalDestroy(), {0, -3});
        if (choice < 3) return start();
        if (choice < 4) return setModel();
        if (choice < 7) return open();
        if (choice < 8) return closeOrReset();
        if (choice < 10) return askOrAdjust();
        return below(2) == 0 ? frame<short>() : frame<float>();
    }

private:
    static void answer(int value, std::initializer_list<int> legal) {
        fuzz::require(std::ranges::find(legal, value) != legal.end(),
                      "the answer is one that the header lists");
    }
    static void finite(float value) { fuzz::require(std::isfinite(value), "values are finite"); }

    std::size_t below(std::size_t n) {
        return choices_.ConsumeIntegralInRange<std::size_t>(0, n - 1);
    }
    template <class Values>
    auto oneOf(Values const& values) {
        return values[below(values.size())];
    }
    MorvaSamplingRate rate() {
        return static_cast<MorvaSamplingRate>(
            below(16) == 0 ? 22050 : oneOf(MORVA::MORVA_SDK::kSamplingRatesHz));
    }
    MorvaFrameDuration duration() {
        return static_cast<MorvaFrameDuration>(
            below(16) == 0 ? 32 : oneOf(MORVA::MORVA_SDK::kFrameDurationsMs));
    }
    // A live, a closed, a null or an invented handle; the last ones are never looked into.
    void* handle() {
        auto const which = below(handles_.size() + 2);
        if (which < handles_.size()) return handles_[which];
        return which == handles_.size() ? nullptr : &choices_;
    }

    void start() {
        int const result = Morva_SDK_GlobalInit(choices_.ConsumeBool() ? L"/nowhere" : nullptr,
                                                choices_.ConsumeIntegral<unsigned>());
        answer(result, {0, -3});
        if (result != 0) return;
        static auto const nc6 = test_support::randomNcWeight(fuzz::smallShape());
        static auto const nc5 = test_support::randomNcWeight(fuzz::smallShape("0.0.5"));
        static auto const vad = test_support::randomVadWeight({.hidden = 2, .gates = 1});
        fuzz::Engine::setModel(nc6, "nc6");
        fuzz::Engine::setModel(nc5, "nc5");
        fuzz::Engine::setModel(vad, "vad");
    }
    void setModel() {
        auto const choice = below(4);
        if (choice == 0) return answer(Morva_SDK_SetModel(nullptr, oneOf(names)), {2});
        if (choice == 2) return answer(Morva_SDK_SetModel_Blob(nullptr, 5, oneOf(names)), {2});
        auto const bytes = choices_.ConsumeRandomLengthString(64);
        auto const name = choices_.ConsumeRandomLengthString(8);
        if (choice > 2) return answer(fuzz::Engine::setModel(bytes, name.c_str()), {0, 2, -3});
        answer(Morva_SDK_SetModel(L"missing.mvw", name.c_str()), {2, -3});
    }
    void open() {
        auto const in = rate();
        auto const out = rate();
        auto const ms = duration();
        auto const* const name = oneOf(names);
        auto const kind = below(3);
        void* const opened = kind == 0   ? Morva_NC_CreateSession(in, out, ms, name)
                             : kind == 1 ? Morva_VAD_CreateSession(in, ms, name)
                                         : Morva_NoiseDB_CreateSession(in, ms, name);
        if (opened != nullptr) handles_.push_back(opened);
    }
    void closeOrReset() {
        constexpr std::array calls = {Morva_NC_CloseSession, Morva_VAD_CloseSession,
                                      Morva_NoiseDB_CloseSession, Morva_NoiseDB_ResetSession};
        auto const which = below(calls.size());
        answer(calls[which](handle()), {which == 3 ? 1 : 0, -3});
    }
    void askOrAdjust() {
        auto* const session = handle();
        int const on = static_cast<int>(below(3));
        unsigned in = 0;
        float voice = 0.0F;
        float level = 0.0F;
        float const limit = choices_.ConsumeFloatingPoint<float>();
        std::function<int()> const calls[] = {
            [&] { return MorvaExt_SessionFrameSizes(session, &in, nullptr); },
            [&] { return std::min(0, MorvaExt_SessionLatencySamples(session) + 2); },
            [&] { return MorvaExt_NC_SetAttenuationLimit(session, limit); },
            [&] { return MorvaExt_NC_SetBypass(session, on); },
            [&] { return MorvaExt_NC_SetBackgroundSpeaker(session, on); },
            [&] { return MorvaExt_NC_EnableVoice(session, oneOf(names)); },
            [&] { return MorvaExt_NC_FrameMeters(session, &voice, &level); },
        };
        answer(calls[below(std::size(calls))](), {0, 1, 2, -1, -3});
        finite(level);
    }

    // The session's own sizes most of the time, else any; buffers are exactly as long as they are
    // said to be, so that a read past them is seen.
    template <class Sample>
    void frame() {
        auto* const session = handle();
        unsigned in = 0;
        unsigned out = 0;
        MorvaExt_SessionFrameSizes(session, &in, &out);
        if (below(8) == 0) in = static_cast<unsigned>(below(4001));
        if (below(8) == 0) out = static_cast<unsigned>(below(4001));
        auto const value =
            static_cast<Sample>(choices_.ConsumeFloatingPointInRange(-32768.0F, 32767.0F));
        std::vector<Sample> const input(in, value);
        std::vector<Sample> output(out);
        auto const* const source = input.empty() ? nullptr : input.data();
        call(session, source, in, output.data(), out);
        for (Sample const sample : output) finite(static_cast<float>(sample));
    }
    void call(void* session, short const* in, unsigned inSize, short* out, unsigned outSize) {
        auto const kind = below(3);
        if (kind == 1) return finite(Morva_VAD_FrameInt16(session, in, inSize));
        if (kind == 2) return finite(Morva_NoiseDB_FrameInt16(session, in, inSize));
        answer(Morva_NC_CleanAmbientNoiseInt16(session, in, inSize, out, outSize), {0, 1, 2, -3});
    }
    void call(void* session, float const* in, unsigned inSize, float* out, unsigned outSize) {
        float level = 0.0F;
        auto const kind = below(4);
        if (kind == 1) return finite(Morva_VAD_FrameFloat(session, in, inSize));
        if (kind == 2) return finite(Morva_NoiseDB_FrameFloat(session, in, inSize));
        answer(kind == 3 ? MorvaExt_NoiseDB_FrameFloat(session, in, inSize, &level)
                         : Morva_NC_CleanAmbientNoiseFloat(session, in, inSize, out, outSize),
               {0, 1, 2, -3});
        finite(level);
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
