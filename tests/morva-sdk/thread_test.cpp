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

// One stream of any kind; kinds, rates and models in turn.
class Stream {
public:
    explicit Stream(std::size_t index)
        : index_(index),
          hz_(kRates[index % 9]),
          sound_(voice(hz_, 0.2, static_cast<unsigned>(index))) {
        if (kind() == 1) {
            session_ = Morva_VAD_CreateSession(rate(hz_), duration(10), "vad");
        } else if (kind() == 2) {
            session_ = Morva_NoiseDB_CreateSession(rate(hz_), duration(10), "five");
        } else {
            session_ = openNc(hz_, kRates[index % 7], 10, kModels[index % 3]);
        }
        EXPECT_NE(session_, nullptr);
    }
    Stream(Stream const&) = delete;
    Stream& operator=(Stream const&) = delete;
    ~Stream() {
        auto* const close = kind() == 1   ? Morva_VAD_CloseSession
                            : kind() == 2 ? Morva_NoiseDB_CloseSession
                                          : Morva_NC_CloseSession;
        EXPECT_EQ(close(session_), 0);
    }

    std::vector<float> run() {
        if (kind() == 0 || kind() == 3) return cleanAll(session_, sound_);
        return valuesOf(sound_, samples(hz_, 10), [&](std::vector<float> const& frame) {
            return kind() == 1 ? vad(session_, frame) : level(session_, frame);
        });
    }

private:
    static constexpr char const* kModels[] = {"six", "five", "c6"};
    std::size_t kind() const { return index_ % 4; }

    std::size_t index_;
    int hz_;
    std::vector<float> sound_;
    void* session_ = nullptr;
};

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
        auto* const fresh = openNc(48000, 16000, 20, shape.modelName.c_str());
        auto* const shared = openNc(48000, 48000, 10, "c6");
        auto* const chosen = openNc(16000, 16000, 10, nullptr);
        auto* const level = Morva_NoiseDB_CreateSession(rate(8000 * 2), duration(40), "five");
        EXPECT_EQ(Morva_NoiseDB_ResetSession(level), 1);
        for (void* session : {fresh, shared, chosen}) EXPECT_EQ(Morva_NC_CloseSession(session), 0);
        EXPECT_EQ(Morva_NoiseDB_CloseSession(level), 0);
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
    for (std::size_t i = 0; i < kSessions; ++i) alone[i] = Stream(i).run();

    std::vector<std::unique_ptr<Stream>> streams;
    for (std::size_t i = 0; i < kSessions; ++i) streams.push_back(std::make_unique<Stream>(i));
    std::atomic<bool> done = false;
    std::thread control([&] { workOnTheControlThread(done); });
    std::vector<std::vector<float>> together(kSessions);
    std::vector<std::thread> threads;
    for (std::size_t t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            for (std::size_t i = t; i < kSessions; i += kThreads) together[i] = streams[i]->run();
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
