// After warm-up a frame allocates nothing, takes no lock and makes no system call. The linker sends
// the C allocation functions of everything that is linked statically, the math library included,
// through wrappers that count; the program's own lock functions count for every library in the
// process; and the frames run in a child process that its first system call ends.
//
// MORVA_TEST_FULL runs 100,000 frames for each model, rate and sample type.
#include <dlfcn.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <pthread.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstddef>
#include <cstdlib>
#include <functional>
#include <memory>
#include <optional>
#include <shared_mutex>

#include "morva-sdk/engine.h"
#include "support/allocation_counter.h"  // operators that are built on malloc

using namespace sdk_test;

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kSanitized = true;  // their run-time libraries lock and call as they like
#else
constexpr bool kSanitized = false;
#endif

namespace {

thread_local std::size_t locksTaken = 0;
thread_local std::size_t allocations = 0;

template <class Function>
Function* next(char const* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// A function that counts and then does what it did.
#define COUNT_LOCK(function, Lock)                             \
    int function(Lock* lock) {                                 \
        static auto* const real = next<int(Lock*)>(#function); \
        ++locksTaken;                                          \
        return real(lock);                                     \
    }
#define COUNT_ALLOCATION(Result, function, parameters, arguments) \
    Result __real_##function parameters;                          \
    Result __wrap_##function parameters {                         \
        ++allocations;                                            \
        return __real_##function arguments;                       \
    }
extern "C" {
COUNT_LOCK(pthread_mutex_lock, pthread_mutex_t)
COUNT_LOCK(pthread_mutex_trylock, pthread_mutex_t)
COUNT_LOCK(pthread_rwlock_rdlock, pthread_rwlock_t)
COUNT_LOCK(pthread_rwlock_wrlock, pthread_rwlock_t)
COUNT_LOCK(pthread_spin_lock, pthread_spinlock_t)
COUNT_ALLOCATION(void*, malloc, (std::size_t size), (size))
COUNT_ALLOCATION(void*, calloc, (std::size_t count, std::size_t size), (count, size))
COUNT_ALLOCATION(void*, realloc, (void* memory, std::size_t size), (memory, size))
COUNT_ALLOCATION(void*, aligned_alloc, (std::size_t alignment, std::size_t size), (alignment, size))
COUNT_ALLOCATION(int, posix_memalign, (void** memory, std::size_t alignment, std::size_t size),
                 (memory, alignment, size))
}

namespace {

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

// A warm stream and its frames: loud, quiet, silent, denormal and broken ones in turn.
template <class Sample>
class Watched {
public:
    Watched(Kind kind, std::string const& model, int hz)
        : stream_(kind, model, hz, hz == 44100 ? 48000 : hz), out_(stream_.outSize()) {
        bool const isFloat = std::is_same_v<Sample, float>;
        for (float const gain : {1.0F, 0.01F, 0.0F, 1e-38F, 30.0F, NAN}) {
            auto sound = voice(hz, 0.01, 1, 0.3F);
            for (float& s : sound) {
                s = isFloat ? s * gain
                            : 32767.0F * std::clamp(s * std::min(gain, 30.0F), -1.0F, 1.0F);
            }
            frames_.emplace_back(sound.begin(), sound.end());
        }
        std::vector<Sample> const silence(stream_.inSize());
        for (int i = 0; i < 100; ++i) stream_.frame(silence, out_);
        hears_ = MorvaExt_NC_EnableVoice(stream_.handle(), "VAD_weight.mvw") == 0;
        EXPECT_EQ(hears_, kind == Kind::noise);
    }

    // With the bypass on for a while, never before the warm-up ends.
    void run(int count) {
        for (int i = 0; i < count; ++i) {
            if (hears_) MorvaExt_NC_SetBypass(stream_.handle(), i / 5 % 2);
            stream_.frame(frames_[static_cast<std::size_t>(i) % frames_.size()], out_);
        }
    }

private:
    Stream stream_;
    std::vector<Sample> out_;
    std::vector<std::vector<Sample>> frames_;
    bool hears_ = false;
};

// CONTROL_ entries that switch every stage of a version on.
std::string withEveryStage(std::string version) {
    auto const weight = test_support::randomNcWeight({.version = version, .timeStamp = version});
    std::ranges::replace(version, '.', '_');
    test_support::WeightWriter writer;
    for (std::string const name :
         {"SMOOT_RM_MODIFY", "HIGH_FREQ_SMOOT", "SKIP_FRAME", "VOLUME_UP", "ENABLE_THRESH_CUT",
          "ENABLE_RM_THRESHOLD", "ENABLE_BACKGROUND_SPEAKER_FIX"}) {
        writer.add("CONTROL_MORVA_" + name + "_v" + version, "t");
    }
    return weight + writer.add("CONTROL_MORVA_SMOOT_COEF_v" + version, 0.5F).bytes();
}

// What the child reports: where it is, and what it counted.
struct Report {
    std::size_t stream;
    std::size_t locks;
    std::size_t allocations;
};

}  // namespace

TEST(FramePurity, NoAllocationNoLockNoSystemCall) {
    Engine engine;
    std::optional<test_support::CapturedOutput> quiet(1);
    std::optional<test_support::CapturedOutput> silent(2);
    std::vector<std::pair<Kind, std::string>> models;
    for (std::string const file : {"NC_small_8k.mvw", "NC_small_16k.mvw", "c6.xs.f.ca03f4.mvw",
                                   "VAD_weight.mvw", "noise_level_16k.mvw"}) {
        ASSERT_EQ(Engine::addShipped(MORVA_TEST_MODELS + file, file.c_str()), 0);
        models.emplace_back(file[0] == 'V'   ? Kind::voice
                            : file[0] == 'n' ? Kind::level
                                             : Kind::noise,
                            file);
    }
    for (std::string const version : {"0.0.1", "0.0.2", "0.0.3", "0.0.4", "0.0.5", "0.0.6"}) {
        ASSERT_EQ(Engine::add(version.c_str(), withEveryStage(version)), 0);
        models.emplace_back(Kind::noise, version);
    }
    int const count = std::getenv("MORVA_TEST_FULL") != nullptr ? 100000 : 100;
    std::vector<std::string> names;
    std::vector<std::function<void()>> streams;
    for (int const hz : kRates) {
        for (auto const& [kind, model] : models) {
            names.push_back(model + " at " + std::to_string(hz));
            auto const floats = std::make_shared<Watched<float>>(kind, model, hz);
            auto const whole = std::make_shared<Watched<short>>(kind, model, hz);
            streams.emplace_back([=] {
                floats->run(count);
                whole->run(count);
            });
        }
    }
    quiet.reset();
    silent.reset();
    auto* const report = static_cast<Report*>(
        mmap(nullptr, sizeof(Report), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
    auto const work = [&] {
        Report const before = {0, locksTaken, allocations};
        for (std::size_t i = 0; i < streams.size(); ++i) {
            streams[i]();
            *report = {i, locksTaken - before.locks, allocations - before.allocations};
            if (allocations != before.allocations || locksTaken != before.locks) break;
        }
    };
    int call = kNone;
    if (kSanitized) {
        work();
        report->locks = 0;
    } else {
        call = systemCallOf(work);
    }
    if (call == kCannotForbid) GTEST_SKIP() << "this kernel cannot forbid system calls";
    EXPECT_EQ(call, kNone) << "the number of a system call made after " << names[report->stream];
    EXPECT_EQ(report->locks, 0U) << names[report->stream];
    EXPECT_EQ(report->allocations, 0U) << names[report->stream];
    EXPECT_TRUE(call != kNone || report->stream + 1 == streams.size());
    munmap(report, sizeof(Report));
}

TEST(FramePurity, TheCountersSeeEveryWay) {
    std::size_t const before = allocations;
    std::vector<int>(100).swap(*std::make_unique<std::vector<int>>());
    void* volatile memory = std::malloc(10);
    std::free(memory);
    EXPECT_GE(allocations - before, 3U);
    Engine engine;
    Engine::addIdentity("id", 16000, 20);
    std::size_t const locks = locksTaken;
    std::size_t const planned = allocations;
    openNc(16000, 16000, 10, "id");  // the math library plans a transform, under the engine's lock
    EXPECT_GT(allocations - planned, 10U);
    if (kSanitized) GTEST_SKIP();
    std::shared_mutex().lock_shared();
    EXPECT_GE(locksTaken - locks, 2U);
    int const call = systemCallOf([] { getppid(); });
    if (call == kCannotForbid) GTEST_SKIP() << "this kernel cannot forbid system calls";
    EXPECT_EQ(call, SYS_getppid);
    EXPECT_EQ(systemCallOf([] {}), kNone);
}
