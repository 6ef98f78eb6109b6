// No object of this module is destroyed when the process ends: the host's audio threads may still
// open sessions and push frames then, while the exit handlers run.
//
// The module is linked with --wrap=__cxa_atexit, which leads every registration of a destructor
// made inside it (lists of models, the engine's caches) to this function, which forgets it. The
// name is the linker's. Thread rule: any thread.
extern "C" int __wrap___cxa_atexit(void (*destroy)(void*), void* object, void* library);

int __wrap___cxa_atexit(void (* /*destroy*/)(void*), void* /*object*/, void* /*library*/) {
    return 0;
}
