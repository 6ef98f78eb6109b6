// The one engine of this plugin library, shared by its instances: begins with the first user, ends
// with the last. Threads: users may come and go on any thread; nothing here is for the audio
// thread.
#pragma once

namespace morva::ladspa {

// A share in the engine.
class SharedEngine {
public:
    // Throws std::runtime_error when the engine cannot start or no models are found.
    SharedEngine();
    ~SharedEngine();
    SharedEngine(SharedEngine const&) = delete;
    SharedEngine& operator=(SharedEngine const&) = delete;

    // Registered name of the model for sound of `rateHz`.
    static char const* modelFor(int rateHz);
};

}  // namespace morva::ladspa
