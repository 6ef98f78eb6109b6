// Sessions on several threads give the bits that they give alone, while another thread opens and
// closes sessions, registers models and lists them. Meant for the thread sanitizer as well.
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <memory>
#include <thread>

#include "engine.h"
#include "morva-sdk/instance.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;

namespace {

constexpr std::size_t kSessions = 64;
constexpr std::size_t kThreads = 8;

// Kinds, rates and models in turn.
std::unique_ptr<Stream> open(std::size_t i) {
    int const hz = kRates[i % 9];
    if (i % 4 == 1) return std::make_unique<Stream>(Kind::voice, "vad", hz, hz);
    if (i % 4 == 2) return std::make_unique<Stream>(Kind::level, "five", hz, hz);
    return std::make_unique<Stream>(Kind::noise, std::array{"six", "five", "c6"}[i % 3], hz,
                                    kRates[i % 7]);
}

std::vector<float> run(Stream const& stream, std::size_t i) {
    std::vector<float> all;
    std::vector<float> out(stream.outSize());
    forEachFrame(voice(kRates[i % 9], 0.2, static_cast<unsigned>(i)), stream.inSize(),
                 [&](std::size_t, std::vector<float> const& frame) {
                     stream.frame(frame, out);
                     all.insert(all.end(), out.begin(), out.end());
                 });
    return all;
}

void workOnTheControlThread(std::atomic<bool> const& done) {
    test_support::NcShape shape;
    std::array<MorvaExtModelInfo, 4> models;
    for (int turn = 0; !done; ++turn) {
        shape.seed = static_cast<unsigned>(turn);
        shape.timeStamp = shape.modelName = "turn" + std::to_string(turn);
        auto const blob = randomNcWeight(shape);
        EXPECT_EQ(Morva_SDK_SetModel_Blob(blob.data(), static_cast<unsigned>(blob.size()),
                                          shape.modelName.c_str()),
                  0);
        EXPECT_EQ(MorvaExt_ListModels(models.data(), 4), 5 + turn);
        for (char const* model :
             {shape.modelName.c_str(), "c6", static_cast<char const*>(nullptr)}) {
            EXPECT_EQ(Morva_NC_CloseSession(openNc(48000, 16000, 20, model)), 0);
        }
    }
}

}  // namespace

TEST(Threads, SessionsGiveTheBitsThatTheyGiveAlone) {
    Engine engine;
    ASSERT_EQ(Engine::add("six", randomNcWeight({})), 0);
    ASSERT_EQ(Engine::add("five", randomNcWeight({.version = "0.0.5"})), 0);
    ASSERT_EQ(Engine::add("vad", randomVadWeight({})), 0);
    ASSERT_EQ(Engine::addShipped(MORVA_TEST_MODELS "c6.xs.f.ca03f4.mvw", "c6"), 0);

    std::vector<std::vector<float>> alone(kSessions);
    std::vector<std::unique_ptr<Stream>> streams;
    for (std::size_t i = 0; i < kSessions; ++i) {
        alone[i] = run(*open(i), i);
        streams.push_back(open(i));
    }
    std::atomic<bool> done = false;
    std::thread control([&] { workOnTheControlThread(done); });
    std::vector<std::vector<float>> together(kSessions);
    std::vector<std::thread> threads;
    for (std::size_t t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            for (std::size_t i = t; i < kSessions; i += kThreads) together[i] = run(*streams[i], i);
        });
    }
    for (auto& thread : threads) thread.join();
    done = true;
    control.join();
    for (std::size_t i = 0; i < kSessions; ++i) EXPECT_EQ(together[i], alone[i]) << i;
}

// Both callers are past whatever they look at without the lock when one of them gets it.
TEST(Threads, OneOfTwoClosesASession) {
    using MORVA::MORVA_SDK::MorvaInstanceT;
    Engine engine;
    Engine::addIdentity("id", 16000, 20);
    auto* const session = openNc(16000, 16000, 10, "id");
    std::array<int, 2> codes = {7, 7};
    auto const seen = observe([&] {
        std::unique_lock lock(MorvaInstanceT::mutexForInputs_);
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
