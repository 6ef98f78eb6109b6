// Sessions on several threads give the bits that they give alone, while another thread opens and
// closes sessions, registers models and lists them. Meant for the thread sanitizer as well.
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <thread>

#include "engine.h"
#include "morva-sdk/instance.h"

using namespace sdk_test;
using test_support::randomNcWeight;

namespace {

constexpr std::size_t kSessions = 64;
constexpr std::size_t kThreads = 8;

// Kinds, rates and models in turn.
Stream open(std::size_t i) {
    int const hz = kRates[i % 9];
    if (i % 4 == 1) return {Kind::voice, hz, hz, 10, i % 8 == 1 ? "vad" : "band"};
    if (i % 4 == 2) return {Kind::level, hz, hz, 10, i % 8 == 2 ? "five" : "band"};
    return {Kind::noise, hz, kRates[i % 7], 10, std::array{"six", "five", "c6", "band"}[i % 5 % 4]};
}

std::vector<float> run(Stream const& stream, std::size_t i) {
    return stream.run(voice(kRates[i % 9], 0.2, static_cast<unsigned>(i)));
}

void workOnTheControlThread(std::atomic<bool> const& done) {
    std::array<MorvaExtModelInfo, 4> models;
    for (int turn = 0; !done; ++turn) {
        auto const name = "turn" + std::to_string(turn);
        auto const blob = randomNcWeight({.seed = static_cast<unsigned>(turn), .timeStamp = name});
        auto const size = static_cast<unsigned>(blob.size());
        EXPECT_EQ(Morva_SDK_SetModel_Blob(blob.data(), size, name.c_str()), 0);
        EXPECT_EQ(MorvaExt_ListModels(models.data(), 4), 6 + turn);
        for (char const* model : {name.c_str(), "c6", static_cast<char const*>(nullptr)}) {
            EXPECT_EQ(Morva_NC_CloseSession(openNc(48000, 16000, 20, model)), 0);
        }
    }
}

}  // namespace

TEST(Threads, SessionsGiveTheBitsThatTheyGiveAlone) {
    Engine engine;
    Engine::add("six", randomNcWeight({}));
    Engine::add("five", randomNcWeight({.version = "0.0.5"}));
    Engine::add("band", randomNcWeight({.version = "NC_1.0.0"}));
    Engine::add("vad", test_support::randomVadWeight({}));
    ASSERT_EQ(Engine::addFile(MORVA_TEST_MODELS "c6.xs.f.ca03f4.mvw", "c6").result, 0);

    std::vector<std::vector<float>> alone(kSessions);
    std::vector<std::vector<float>> together(kSessions);
    std::vector<Stream> streams;
    for (std::size_t i = 0; i < kSessions; ++i) {
        alone[i] = run(open(i), i);
        streams.push_back(open(i));
    }
    std::atomic<bool> done = false;
    std::thread control([&] { workOnTheControlThread(done); });
    std::vector<std::thread> threads;
    for (std::size_t t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            for (std::size_t i = t; i < kSessions; i += kThreads) together[i] = run(streams[i], i);
        });
    }
    for (auto& thread : threads) thread.join();
    done = true;
    control.join();
    for (std::size_t i = 0; i < kSessions; ++i) EXPECT_EQ(together[i], alone[i]) << i;
}

// The process ends while an audio thread is inside a frame, and a handler of process exit still
// works with the engine. The handler is registered before the engine exists, so it runs after
// whatever the engine registered: nothing of the engine may be gone by then.
namespace {
std::atomic<void*> endless = nullptr;
std::atomic<int> framesDone = 0;
void cleanEndlessly() {
    for (std::vector<float> frame(441); clean(endless, frame, frame) == 0;) ++framesDone;
    std::_Exit(1);
}
void workAtTheEnd() {
    void* const late = openNc(48000, 44100, 10, "id");
    if (late == nullptr || Morva_NC_CloseSession(late) != 0) std::_Exit(2);
    for (int const from = framesDone; framesDone < from + 100;) std::this_thread::yield();
}
}  // namespace
TEST(ThreadsDeathTest, TheEndOfTheProcessLeavesTheEngineAlone) {
    auto const endInsideAFrame = [] {
        std::atexit(workAtTheEnd);
        Morva_SDK_GlobalInit(nullptr, 1);
        Engine::addIdentity("id", 16000, 20);
        endless = openNc(44100, 44100, 10, "id");
        std::thread(cleanEndlessly).detach();
        while (framesDone < 10) std::this_thread::yield();
        std::exit(0);
    };
    EXPECT_EXIT(endInsideAFrame(), ::testing::ExitedWithCode(0), "");
}

// Both callers are past whatever they look at without the lock when one of them gets it.
TEST(Threads, OneOfTwoClosesASession) {
    Engine engine;
    Engine::addIdentity("id", 16000, 20);
    auto* const session = openNc(16000, 16000, 10, "id");
    std::array<int, 2> codes = {7, 7};
    auto const seen = observe([&] {
        std::unique_lock lock(MORVA::MORVA_SDK::MorvaInstanceT::mutexForInputs_);
        std::thread first([&] { codes[0] = Morva_NC_CloseSession(session); });
        std::thread second([&] { codes[1] = Morva_NC_CloseSession(session); });
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        lock.unlock();
        first.join();
        second.join();
        return codes;
    });
    EXPECT_THAT(seen.result, ::testing::UnorderedElementsAre(0, -3));
    EXPECT_EQ(seen.out, "");
}
