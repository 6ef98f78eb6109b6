// After warm-up a frame makes no system call and takes no lock. System calls: a child process that
// is forbidden every one of them runs the frames. Locks: the program's own pthread_mutex_lock and
// its relatives count, for every library in the process. (Allocations: see morva-sdk.)
//
// MORVA_TEST_FULL runs 100,000 frames for each model, rate and sample type.
#include <dlfcn.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <pthread.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <cstddef>
#include <cstdlib>
#include <functional>
#include <mutex>
#include <ostream>
#include <shared_mutex>

#include "morva-sdk/engine.h"

using namespace sdk_test;

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kSanitized = true;  // their run-time libraries lock and call as they like
#else
constexpr bool kSanitized = false;
#endif

namespace {

thread_local std::size_t locksTaken = 0;

template <class Function>
Function* next(char const* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {
int pthread_mutex_lock(pthread_mutex_t* mutex) {
    static auto* const real = next<int(pthread_mutex_t*)>("pthread_mutex_lock");
    ++locksTaken;
    return real(mutex);
}
int pthread_mutex_trylock(pthread_mutex_t* mutex) {
    static auto* const real = next<int(pthread_mutex_t*)>("pthread_mutex_trylock");
    ++locksTaken;
    return real(mutex);
}
int pthread_rwlock_rdlock(pthread_rwlock_t* lock) {
    static auto* const real = next<int(pthread_rwlock_t*)>("pthread_rwlock_rdlock");
    ++locksTaken;
    return real(lock);
}
int pthread_rwlock_wrlock(pthread_rwlock_t* lock) {
    static auto* const real = next<int(pthread_rwlock_t*)>("pthread_rwlock_wrlock");
    ++locksTaken;
    return real(lock);
}
int pthread_spin_lock(pthread_spinlock_t* lock) {
    static auto* const real = next<int(pthread_spinlock_t*)>("pthread_spin_lock");
    ++locksTaken;
    return real(lock);
}
}

namespace {

// ---- a process without system calls --------------------------------------------------------

void leaveWithCallNumber(int, siginfo_t* info, void*) {
    _exit(info->si_syscall == 0 ? 255 : info->si_syscall);
}

bool forbidSystemCalls() {
    struct sigaction action {};
    action.sa_sigaction = leaveWithCallNumber;
    action.sa_flags = SA_SIGINFO;
    sigaction(SIGSYS, &action, nullptr);
    std::array<sock_filter, 4> rules{{
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_exit_group, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_TRAP),
    }};
    sock_fprog program{static_cast<unsigned short>(rules.size()), rules.data()};
    return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
           prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

constexpr int kNone = 0;
constexpr int kCannotForbid = 254;

// The number of the first system call that `work` makes, kNone, or kCannotForbid.
int systemCallOf(std::function<void()> const& work) {
    pid_t const child = fork();
    if (child == 0) {
        if (!forbidSystemCalls()) _exit(kCannotForbid);
        work();
        _exit(kNone);
    }
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

// ---- frames --------------------------------------------------------------------------------

enum class Kind { noise, voice, level };

struct Case {
    Kind kind;
    char const* file;
    int rate;
    bool pcm;
};

void PrintTo(Case const& c, std::ostream* out) {
    *out << c.file << " at " << c.rate << (c.pcm ? ", int16" : ", float");
}

// One open session and its frames: loud, quiet, silent, denormal and broken ones in turn.
class Stream {
public:
    explicit Stream(Case const& c) : case_(c), size_(samples(c.rate, 10)), out_(size_) {
        EXPECT_EQ(Engine::addShipped(std::string(MORVA_TEST_MODELS) + c.file, "model"), 0);
        session_ = c.kind == Kind::noise ? openNc(c.rate, c.rate, 10, "model")
                   : c.kind == Kind::voice
                       ? Morva_VAD_CreateSession(rate(c.rate), duration(10), "model")
                       : Morva_NoiseDB_CreateSession(rate(c.rate), duration(10), "model");
        EXPECT_NE(session_, nullptr);
        for (float const gain : {1.0F, 0.01F, 0.0F, 1e-38F, 30.0F}) {
            frames_.push_back(voice(c.rate, 0.01, 1, 0.3F));
            for (float& sample : frames_.back()) sample *= gain;
            pcmFrames_.push_back(toPcm(frames_.back()));
        }
        frames_.push_back(std::vector<float>(size_, NAN));
        pcmFrames_.push_back(std::vector<short>(size_, -32768));
        pcmOut_.resize(size_);
        silence_.resize(size_);
        silentPcm_.resize(size_);
    }

    void warmUp() {
        for (int i = 0; i < 100; ++i) frame(silence_, silentPcm_);
    }
    void run(int count) {
        for (int i = 0; i < count; ++i) {
            std::size_t const which = static_cast<std::size_t>(i) % frames_.size();
            frame(frames_[which], pcmFrames_[which]);
        }
    }

private:
    void frame(std::vector<float> const& in, std::vector<short> const& pcm) {
        switch (case_.kind) {
            case Kind::noise:
                case_.pcm ? clean(session_, pcm, pcmOut_) : clean(session_, in, out_);
                break;
            case Kind::voice:
                case_.pcm ? vad(session_, pcm) : vad(session_, in);
                break;
            case Kind::level:
                if (case_.pcm) {
                    level(session_, pcm);
                } else {
                    float db = 0.0F;
                    MorvaExt_NoiseDB_FrameFloat(session_, in.data(), size_, &db);
                }
                break;
        }
    }

    Case case_;
    unsigned size_;
    void* session_ = nullptr;
    std::vector<std::vector<float>> frames_;
    std::vector<std::vector<short>> pcmFrames_;
    std::vector<float> out_;
    std::vector<short> pcmOut_;
    std::vector<float> silence_;
    std::vector<short> silentPcm_;
};

int frameCount() {
    return std::getenv("MORVA_TEST_FULL") != nullptr ? 100000 : 100;
}

std::vector<Case> allCases() {
    std::vector<Case> cases;
    for (int const hz : kRates) {
        for (bool const pcm : {false, true}) {
            for (char const* file : {"NC_small_8k.mvw", "NC_small_16k.mvw", "c6.xs.f.ca03f4.mvw"}) {
                cases.push_back({Kind::noise, file, hz, pcm});
            }
            cases.push_back({Kind::voice, "VAD_weight.mvw", hz, pcm});
            cases.push_back({Kind::level, "noise_level_16k.mvw", hz, pcm});
        }
    }
    return cases;
}

class FramePurity : public ::testing::TestWithParam<Case> {
protected:
    void SetUp() override {
        if (kSanitized) GTEST_SKIP() << "the sanitizer's library makes system calls itself";
    }
};

}  // namespace

TEST_P(FramePurity, NoLockAndNoSystemCall) {
    Engine engine;
    Stream stream(GetParam());
    stream.warmUp();
    std::size_t locks = 0;
    int const call = systemCallOf([&] {
        std::size_t const before = locksTaken;
        stream.run(frameCount());
        if (locksTaken != before) std::abort();
    });
    if (call == kCannotForbid) GTEST_SKIP() << "this kernel cannot forbid system calls";
    EXPECT_EQ(call, kNone) << "the system call's number; -6: a lock was taken";
    locks = locksTaken;
    stream.run(frameCount() / 10);
    EXPECT_EQ(locksTaken - locks, 0U);
}

INSTANTIATE_TEST_SUITE_P(AllModels, FramePurity, ::testing::ValuesIn(allCases()));

TEST(FramePurityCounters, SeeLocksAndSystemCalls) {
    if (kSanitized) GTEST_SKIP();
    std::size_t const before = locksTaken;
    std::mutex mutex;
    mutex.lock();
    mutex.unlock();
    std::shared_mutex shared;
    shared.lock_shared();
    shared.unlock_shared();
    EXPECT_EQ(locksTaken - before, 2U);
    int const call = systemCallOf([] { getppid(); });
    if (call == kCannotForbid) GTEST_SKIP() << "this kernel cannot forbid system calls";
    EXPECT_EQ(call, SYS_getppid);
    EXPECT_EQ(systemCallOf([] {}), kNone);
    // Control functions do lock: the counter sees the engine's own lock.
    Engine engine;
    std::size_t const locks = locksTaken;
    observe([] { return Morva_NC_CreateSession(rate(8000), rate(8000), duration(10), "none"); });
    EXPECT_GT(locksTaken, locks);
}
