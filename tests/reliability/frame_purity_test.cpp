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
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdlib>
#include <functional>
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

// What a frame may not do, other than a system call, which is its number.
enum Impurity : int { kPure = 0, kAllocates = 252, kLocks = 253, kCannotForbid = 254 };

int countedIn(std::function<void()> const& work) {
    auto const before = std::pair(allocations, locksTaken);
    work();
    if (allocations != before.first) return kAllocates;
    return locksTaken != before.second && !kSanitized ? kLocks : kPure;
}

// The first thing that `work` does of these, in a child process that may make no system call.
int impurityOf(std::function<void()> const& work) {
    if (kSanitized) return countedIn(work);
    pid_t const child = fork();
    if (child == 0) _exit(forbidSystemCalls() ? countedIn(work) : kCannotForbid);
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

// A warm stream that runs frames: loud, quiet, silent, denormal and broken ones in turn, with the
// bypass on for a while, never before the warm-up ends.
template <class Sample>
std::function<void()> framesOf(Kind kind, std::string const& model, int hz, int count) {
    Stream const stream(kind, hz, hz == 44100 ? 48000 : hz, 10, model);
    std::vector<Sample> out(stream.outSize);
    std::vector<std::vector<Sample>> frames;
    for (float const gain : {1.0F, 0.01F, 0.0F, 1e-38F, 30.0F, NAN}) {
        auto sound = voice(hz, 0.01, 1, 0.3F);
        for (float& s : sound) {
            s *= gain;
            if (std::is_same_v<Sample, float>) continue;
            s = 32767.0F * (std::isnan(s) ? 1.0F : std::clamp(s, -1.0F, 1.0F));
        }
        frames.emplace_back(sound.begin(), sound.end());
    }
    for (int i = 0; i < 100; ++i) stream.frame(frames[2], out);
    bool const hears = MorvaExt_NC_EnableVoice(stream.handle, "VAD_weight.mvw") == 0;
    EXPECT_EQ(hears, kind == Kind::noise);
    return [=]() mutable {
        for (int i = 0; i < count; ++i) {
            if (hears) MorvaExt_NC_SetBypass(stream.handle, i / 5 % 2);
            stream.frame(frames[static_cast<std::size_t>(i) % frames.size()], out);
        }
    };
}

// CONTROL_ entries that switch every stage of a version on.
std::string withEveryStage(std::string const& version) {
    test_support::NcShape const shape{.version = version, .timeStamp = version};
    auto const weight = test_support::randomNcWeight(shape);
    test_support::WeightWriter writer;
    for (std::string const name :
         {"SMOOT_RM_MODIFY", "HIGH_FREQ_SMOOT", "SKIP_FRAME", "VOLUME_UP", "ENABLE_THRESH_CUT",
          "ENABLE_RM_THRESHOLD", "ENABLE_BACKGROUND_SPEAKER_FIX"}) {
        writer.add("CONTROL_MORVA_" + name + shape.suffix(), "t");
    }
    return weight + writer.add("CONTROL_MORVA_SMOOT_COEF" + shape.suffix(), 0.5F).bytes();
}

}  // namespace

TEST(FramePurity, NoAllocationNoLockNoSystemCall) {
    Engine engine;
    std::vector<std::pair<Kind, std::string>> models;
    for (std::string const file : {"NC_small_8k.mvw", "NC_small_16k.mvw", "c6.xs.f.ca03f4.mvw",
                                   "VAD_weight.mvw", "noise_level_16k.mvw"}) {
        ASSERT_EQ(Engine::addFile(MORVA_TEST_MODELS + file, file.c_str()).result, 0);
        auto const valued = file[0] == 'V' ? Kind::voice : Kind::level;
        models.emplace_back(file[0] == 'V' || file[0] == 'n' ? valued : Kind::noise, file);
    }
    for (std::string const version :
         {"0.0.1", "0.0.2", "0.0.3", "0.0.4", "0.0.5", "0.0.6", "NC_1.0.0"}) {
        Engine::add(version.c_str(), withEveryStage(version));
        models.emplace_back(Kind::noise, version);
    }
    models.emplace_back(Kind::voice, "NC_1.0.0");
    models.emplace_back(Kind::level, "NC_1.0.0");
    int const count = std::getenv("MORVA_TEST_FULL") != nullptr ? 100000 : 100;
    for (int const hz : kRates) {
        for (auto const& [kind, model] : models) {
            std::function<void()> floats;
            std::function<void()> whole;
            observe([&, kind = kind, model = model] {
                floats = framesOf<float>(kind, model, hz, count);
                whole = framesOf<short>(kind, model, hz, count);
                return 0;
            });
            for (auto const& run : {floats, whole}) {
                int const found = impurityOf(run);
                if (found == kCannotForbid) GTEST_SKIP() << "this kernel forbids no system calls";
                EXPECT_EQ(found, kPure) << model << " at " << hz;
            }
        }
    }
}

TEST(FramePurity, EveryImpurityIsSeen) {
    EXPECT_EQ(countedIn([] { std::vector<int>(100).swap(*std::make_unique<std::vector<int>>()); }),
              kAllocates);
    void* (*volatile const allocate)(std::size_t) = std::malloc;  // no longer a known function
    EXPECT_EQ(countedIn([&] { std::free(allocate(10)); }), kAllocates);
    if (kSanitized) GTEST_SKIP();
    EXPECT_EQ(countedIn([] { std::shared_mutex().lock_shared(); }), kLocks);
    EXPECT_EQ(countedIn([] { std::mutex().lock(); }), kLocks);
    int const found = impurityOf([] { getppid(); });
    if (found == kCannotForbid) GTEST_SKIP() << "this kernel forbids no system calls";
    EXPECT_EQ(found, SYS_getppid);
    EXPECT_EQ(impurityOf([] {}), kPure);
}
