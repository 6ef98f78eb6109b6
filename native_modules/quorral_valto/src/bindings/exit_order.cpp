// Closes the gate before any object of this module is destroyed at the end of the process.
//
// Exit handlers run in the reverse order of their registration, and function-local objects register
// theirs whenever they are first used: a handler of one's own could never be sure to be the first.
// The module is therefore linked with --wrap=__cxa_atexit, which leads every registration made
// inside the module (the engine and the math library included) through here, where the destructor
// is put behind the closing of the gate. Thread rule: any thread. The names are the linker's.
#include <memory>
#include <new>

#include "native_modules/quorral_valto/src/valto_wrapper/process_gate.h"

extern "C" {
int __real___cxa_atexit(void (*destroy)(void*), void* object, void* library);
int __wrap___cxa_atexit(void (*destroy)(void*), void* object, void* library);
}

namespace {

struct Destruction {
    void (*destroy)(void*);
    void* object;
};

void DestroyBehindGate(void* data) {
    const std::unique_ptr<Destruction> destruction(static_cast<Destruction*>(data));
    quorral::ProcessGate::Close();
    destruction->destroy(destruction->object);
}

}  // namespace

int __wrap___cxa_atexit(void (*destroy)(void*), void* object, void* library) {
    constexpr int kNotRegistered = -1;
    try {
        auto destruction = std::make_unique<Destruction>(Destruction{destroy, object});
        const int result = __real___cxa_atexit(DestroyBehindGate, destruction.get(), library);
        if (result == 0) static_cast<void>(destruction.release());
        return result;
    } catch (const std::bad_alloc&) {
        return kNotRegistered;
    }
}
