// Memory: frames take none after warm-up, by whatever function; and each allocation of the control
// functions may fail. The linker sends the C allocation functions of everything that is linked
// statically, the math library included, through the wrappers below.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <type_traits>

#include "engine.h"
#include "support/allocation_counter.h"

using namespace sdk_test;
using test_support::NcShape;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::TempDir;

namespace {
thread_local std::size_t cAllocations = 0;
}

extern "C" {
void* __real_malloc(std::size_t);
void* __real_calloc(std::size_t, std::size_t);
void* __real_realloc(void*, std::size_t);
void* __real_aligned_alloc(std::size_t, std::size_t);
int __real_posix_memalign(void**, std::size_t, std::size_t);

void* __wrap_malloc(std::size_t size) {
    ++cAllocations;
    return __real_malloc(size);
}
void* __wrap_calloc(std::size_t count, std::size_t size) {
    ++cAllocations;
    return __real_calloc(count, size);
}
void* __wrap_realloc(void* memory, std::size_t size) {
    ++cAllocations;
    return __real_realloc(memory, size);
}
void* __wrap_aligned_alloc(std::size_t alignment, std::size_t size) {
    ++cAllocations;
    return __real_aligned_alloc(alignment, size);
}
int __wrap_posix_memalign(void** memory, std::size_t alignment, std::size_t size) {
    ++cAllocations;
    return __real_posix_memalign(memory, alignment, size);
}
}

namespace {

// The operators count as well: they are built on malloc.
template <class Work>
std::size_t allocationsOf(Work work) {
    std::size_t const before = cAllocations;
    work();
    return cAllocations - before;
}

// Loud, quiet, silent and voiced frames in turn: lists that grow with active frames do grow.
template <class Sample>
std::vector<std::vector<Sample>> mixedFrames(unsigned size) {
    test_support::RandomValues random(1);
    std::vector<std::vector<Sample>> frames;
    float const scale = std::is_same_v<Sample, float> ? 1.0F : 32767.0F;
    for (float const gain : {0.3F, 0.01F, 1.0F, 0.0F, 0.1F}) {
        auto const sound = random.vector(static_cast<int>(size), -gain * scale, gain * scale);
        frames.emplace_back(sound.begin(), sound.end());
    }
    return frames;
}

// `frame` takes one frame through an open session.
template <class Sample, class Frame>
std::size_t allocationsAfterSilence(unsigned size, int count, Frame frame) {
    std::vector<Sample> const silence(size);
    auto const frames = mixedFrames<Sample>(size);
    for (int i = 0; i < 100; ++i) frame(silence);
    return allocationsOf([&] {
        for (int i = 0; i < count; ++i) frame(frames[static_cast<std::size_t>(i) % frames.size()]);
    });
}

}  // namespace

TEST(FrameMemory, TheCounterSeesEveryWay) {
    std::size_t const seen = allocationsOf([] {
        std::vector<int>(100).swap(*std::make_unique<std::vector<int>>());
        void* volatile memory = std::malloc(10);
        std::free(memory);
    });
    EXPECT_GE(seen, 3U);
    Engine engine;
    Engine::addIdentity("id", 16000, 20);
    // A transform is planned by the math library itself.
    EXPECT_GT(allocationsOf([] { openNc(16000, 16000, 10, "id"); }), 10U);
}

namespace {

// CONTROL_ entries that switch every stage on.
std::string withEveryStage(NcShape const& shape) {
    auto version = shape.version;
    std::ranges::replace(version, '.', '_');
    auto const key = [&](std::string const& name) {
        return "CONTROL_MORVA_" + name + "_v" + version;
    };
    test_support::WeightWriter writer;
    for (char const* name :
         {"SMOOT_RM_MODIFY", "HIGH_FREQ_SMOOT", "SKIP_FRAME", "VOLUME_UP", "ENABLE_THRESH_CUT",
          "ENABLE_RM_THRESHOLD", "ENABLE_BACKGROUND_SPEAKER_FIX"}) {
        writer.add(key(name), "t");
    }
    return randomNcWeight(shape) + writer.add(key("SMOOT_COEF"), 0.5F).bytes();
}

// Frames after warm-up, over all rates and models of the engine that is open.
template <class Sample>
std::size_t allocationsOfAllSessions(std::vector<std::string> const& noiseModels, int count) {
    std::size_t seen = 0;
    for (int hz : kRates) {
        auto const size = samples(hz, 10);
        for (auto const& model : noiseModels) {
            auto* const session = openNc(hz, hz == 44100 ? 48000 : hz, 10, model.c_str());
            unsigned outSize = 0;
            MorvaExt_SessionFrameSizes(session, nullptr, &outSize);
            std::vector<Sample> out(outSize);
            int done = 0;
            seen += allocationsAfterSilence<Sample>(size, count, [&](auto const& in) {
                // Never before the warm-up ends: what is bypassed late finds its memory, too.
                MorvaExt_NC_SetBypass(session, ++done > 100 && done / 5 % 2 == 1);
                EXPECT_EQ(clean(session, in, out), 0);
            });
        }
        auto* const voiceSession = Morva_VAD_CreateSession(rate(hz), duration(10), "vad");
        seen += allocationsAfterSilence<Sample>(
            size, count, [&](auto const& in) { EXPECT_GE(vad(voiceSession, in), 0.0F); });
        auto* const levelSession = Morva_NoiseDB_CreateSession(rate(hz), duration(10), "0.0.5");
        seen += allocationsAfterSilence<Sample>(
            size, count, [&](auto const& in) { EXPECT_GE(level(levelSession, in), -60.0F); });
    }
    return seen;
}

}  // namespace

// MORVA_TEST_FULL runs 100,000 frames per session.
TEST(FrameMemory, FramesTakeNoneAfterWarmUp) {
    int const count = std::getenv("MORVA_TEST_FULL") != nullptr ? 100000 : 200;
    Engine engine;
    std::vector<std::string> models = {"NC_small_8k", "NC_small_16k", "c6.xs.f.ca03f4"};
    for (auto const& name : models) {
        EXPECT_EQ(Engine::addShipped(MORVA_TEST_MODELS + name + ".mvw", name.c_str()), 0);
    }
    for (std::string const version : {"0.0.1", "0.0.2", "0.0.3", "0.0.4", "0.0.5", "0.0.6"}) {
        NcShape shape{.version = version};
        EXPECT_EQ(Engine::add(version.c_str(), withEveryStage(shape)), 0);
        models.push_back(version);
    }
    EXPECT_EQ(Engine::add("vad", randomVadWeight({})), 0);
    EXPECT_EQ(observe([&] { return allocationsOfAllSessions<float>(models, count); }).result, 0U);
    EXPECT_EQ(observe([&] { return allocationsOfAllSessions<short>(models, count); }).result, 0U);
}

TEST(FrameMemory, VoiceIsReadyForTheNextFrame) {
    Engine engine;
    ASSERT_EQ(Engine::add("nc", randomNcWeight({})), 0);
    // Above some of the rates and below others.
    ASSERT_EQ(Engine::add("vad", randomVadWeight({.sampleRate = 16000, .frameLength = 480})), 0);
    for (int hz : kRates) {
        auto* const session = openNc(hz, hz, 10, "nc");
        std::vector<float> const in(samples(hz, 10), 0.1F);
        std::vector<float> out(in.size());
        for (int i = 0; i < 100; ++i) clean(session, in, out);
        ASSERT_EQ(MorvaExt_NC_EnableVoice(session, "vad"), 0);
        EXPECT_EQ(allocationsOf([&] { clean(session, in, out); }), 0U) << hz;
    }
}

// What a session holds beside the weights and tables that it shares with the first one.
TEST(SessionMemory, IsSmallBesideTheModel) {
    Engine engine;
    ASSERT_EQ(Engine::addShipped(MORVA_TEST_MODELS "c6.xs.f.ca03f4.mvw", "c6"), 0);
    std::vector<void*> sessions = {openNc(48000, 48000, 10, "c6")};
    std::size_t const before = test_support::heldBytes;
    sessions.push_back(openNc(48000, 48000, 10, "c6"));
    std::size_t const held = test_support::heldBytes - before;
    std::printf("[   memory ] one session of the full model at 48 kHz: %zu bytes\n", held);
    EXPECT_LE(held, std::size_t{256} << 10);
    EXPECT_GT(held, std::size_t{16} << 10);
    for (int i = 0; i < 1000; ++i) sessions.push_back(openNc(48000, 48000, 10, "c6"));
    auto const sound = voice(48000, 0.05, 1);
    auto const wanted = cleanAll(sessions.front(), sound);
    EXPECT_EQ(cleanAll(sessions.back(), sound), wanted);
    for (void* session : sessions) EXPECT_EQ(Morva_NC_CloseSession(session), 0);
}

namespace {

using test_support::failingAllocation;

// Calls `call` with its first, second, ... allocation failing until one call meets no failure any
// more. A failed call must leave no memory behind; a successful one is given to `undo`.
template <class Call, class Undo>
void failEachAllocation(char const* what, Call call, Undo undo) {
    std::size_t n = 0;
    for (bool fired = true; fired;) {
        std::ptrdiff_t kept = 0;
        auto const result = observe([&] {
                                auto const live =
                                    test_support::allocations - test_support::releases;
                                failingAllocation = ++n;
                                auto const code = call();
                                fired = failingAllocation == 0;
                                failingAllocation = 0;
                                kept = static_cast<std::ptrdiff_t>(test_support::allocations -
                                                                   test_support::releases - live);
                                return code;
                            }).result;
        bool succeeded = false;
        if constexpr (std::is_pointer_v<decltype(call())>) {
            succeeded = result != nullptr;
        } else {
            succeeded = result == 0;
            // A stream may take a failure for bad data.
            EXPECT_TRUE(succeeded || result == -2 || result == 2)
                << what << " " << n << ": " << result;
        }
        if (succeeded) {
            undo(result);
        } else {
            EXPECT_TRUE(fired) << what << " fails although allocation " << n << " is not reached";
            EXPECT_EQ(kept, 0) << what << " keeps memory when allocation " << n << " fails";
        }
    }
    std::printf("[ failures ] %s: %zu allocations\n", what, n - 1);
    EXPECT_GT(n, 2U) << what;
}

}  // namespace

TEST(AllocationFailure, IsReportedLeaksNothingAndTheEngineGoesOn) {
    TempDir dir;
    dir.write("a.mvw", randomNcWeight({}));
    dir.write("a.cfg", "WEIGHT a.mvw\nMORVA_SMOOT_COEF_v0_0_6 0.5\n");
    auto const folder = dir.path().wstring();
    failEachAllocation(
        "init", [&] { return Morva_SDK_GlobalInit(folder.c_str(), 0); },
        [](int) { EXPECT_EQ(Morva_SDK_GlobalDestroy(), 0); });

    Engine engine(folder.c_str());
    auto const sound = voice(16000, 0.1, 1);
    ASSERT_EQ(Engine::add("nc", randomNcWeight({.timeStamp = "x"})), 0);
    auto const wanted = cleanAll(openNc(16000, 16000, 10, "nc"), sound);
    auto const blob = randomNcWeight({.timeStamp = "x"});
    std::string name;
    int taken = 0;
    auto const nextName = [&] { return (name = "n" + std::to_string(++taken)).c_str(); };
    nextName();
    failEachAllocation(
        // What is registered in spite of a failure must be whole.
        "memory",

        [&] {
            return Morva_SDK_SetModel_Blob(blob.data(), static_cast<unsigned>(blob.size()),
                                           name.c_str());
        },
        [&](int) {
            auto* const session =
                observe([&] { return openNc(16000, 16000, 10, name.c_str()); }).result;
            ASSERT_NE(session, nullptr);
            EXPECT_EQ(cleanAll(session, sound), wanted);
            nextName();
        });
    for (wchar_t const* file : {L"a.mvw", L"a.cfg"}) {
        nextName();
        failEachAllocation(
            file == std::wstring(L"a.mvw") ? "weight file" : "control file",
            [&] { return Morva_SDK_SetModel(file, name.c_str()); },
            [&](int) {
                EXPECT_NE(observe([&] { return openNc(16000, 16000, 10, name.c_str()); }).result,
                          nullptr);
                nextName();
            });
    }

    ASSERT_EQ(Engine::add("vad", randomVadWeight({})), 0);
    ASSERT_EQ(Engine::add("db", randomNcWeight({.version = "0.0.5"})), 0);
    auto const vadOpen = [] { return Morva_VAD_CreateSession(rate(44100), duration(10), "vad"); };
    auto const dbOpen = [] { return Morva_NoiseDB_CreateSession(rate(44100), duration(10), "db"); };
    Morva_VAD_CloseSession(vadOpen());  // makes what the model's sessions share
    Morva_NoiseDB_CloseSession(dbOpen());
    failEachAllocation(
        "noise session", [] { return openNc(44100, 48000, 10, "nc"); },
        [](void* s) { EXPECT_EQ(Morva_NC_CloseSession(s), 0); });
    failEachAllocation("voice session", vadOpen,
                       [](void* s) { EXPECT_EQ(Morva_VAD_CloseSession(s), 0); });
    failEachAllocation("level session", dbOpen,
                       [](void* s) { EXPECT_EQ(Morva_NoiseDB_CloseSession(s), 0); });
    EXPECT_EQ(cleanAll(openNc(16000, 16000, 10, "nc"), sound), wanted);
}

// The first session of a model makes the objects that all of them share.
TEST(AllocationFailure, OfAFirstSessionIsMadeUpForByTheNext) {
    auto const sound = voice(16000, 0.1, 1);
    std::vector<float> wanted;
    for (std::size_t n = 0;; ++n) {
        Engine engine;
        ASSERT_EQ(Engine::add("nc", randomNcWeight({})), 0);
        bool fired = false;
        observe([&] {
            failingAllocation = n;
            openNc(48000, 44100, 10, "nc");
            fired = failingAllocation == 0;
            failingAllocation = 0;
            return 0;
        });
        auto const got = cleanAll(openNc(16000, 16000, 10, "nc"), sound);
        if (n == 0) wanted = got;
        ASSERT_EQ(got, wanted) << n;
        if (!fired) break;
    }
}
