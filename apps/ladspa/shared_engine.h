// The one engine of this plugin library, shared by its instances: created with the first, destroyed
// with the last. Threads: instances may come and go on any thread; nothing here is for the audio
// thread.
#pragma once

#include <memory>

namespace morva::ladspa {

class SharedEngine {
public:
    // Throws std::runtime_error when the engine cannot start or no models are found.
    static std::shared_ptr<SharedEngine> acquire();

    SharedEngine();
    ~SharedEngine();
    SharedEngine(SharedEngine const&) = delete;
    SharedEngine& operator=(SharedEngine const&) = delete;

    // Registered name of the model for sound of `rateHz`.
    static char const* modelFor(int rateHz);
};

}  // namespace morva::ladspa
