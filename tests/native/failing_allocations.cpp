// Part of a copy of the host module in which the n-th allocation of a thread can be made to fail.
//
// The copy carries the C++ library inside and is linked with --wrap of the allocation operators, so
// that every allocation of the module, engine included, comes through here; the script runtime and
// the math library keep their own. A test finds the functions below by name.
#include <atomic>
#include <cstddef>
#include <new>

#include "morva-sdk/morva-sdk.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"

namespace {

thread_local unsigned tFailing = 0;  // counts down to the allocation that fails; 0: none
std::atomic<long> gHeld{0};

void Count() {
    if (tFailing != 0 && --tFailing == 0) throw std::bad_alloc();
    ++gHeld;
}

}  // namespace

// The linker's names of the operators.
extern "C" {
void* __real__Znwm(std::size_t size);
void* __real__ZnwmSt11align_val_t(std::size_t size, std::align_val_t alignment);
void __real__ZdlPv(void* memory);
void __real__ZdlPvSt11align_val_t(void* memory, std::align_val_t alignment);

void* __wrap__Znwm(std::size_t size) {
    Count();
    return __real__Znwm(size);
}
void* __wrap__ZnwmSt11align_val_t(std::size_t size, std::align_val_t alignment) {
    Count();
    return __real__ZnwmSt11align_val_t(size, alignment);
}
void __wrap__ZdlPv(void* memory) {
    if (memory != nullptr) --gHeld;
    __real__ZdlPv(memory);
}
void __wrap__ZdlPvSt11align_val_t(void* memory, std::align_val_t alignment) {
    if (memory != nullptr) --gHeld;
    __real__ZdlPvSt11align_val_t(memory, alignment);
}

#define TEST_EXPORT __attribute__((visibility("default")))

// Arms the n-th allocation of this thread from now on. 0 disarms.
TEST_EXPORT void FailAllocation(unsigned n) {
    tFailing = n;
}
// Whether the armed allocation is still to come.
TEST_EXPORT int IsFailurePending() {
    return tFailing != 0 ? 1 : 0;
}
// Allocated and not released.
TEST_EXPORT long HeldAllocations() {
    return gHeld.load();
}
// The module as it was before its start-up.
TEST_EXPORT void ForgetEngine() {
    Morva_SDK_GlobalDestroy();
    quorral::gNcModels = {};
    quorral::gNcModel = {};
    quorral::gVadModels = {};
    quorral::gVadModel = {};
}
}
