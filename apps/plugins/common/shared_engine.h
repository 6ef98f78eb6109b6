// The one engine of this plugin library, shared by its instances: begins with the first user, ends
// with the last. Threads: users may come and go on any thread; nothing here is for the audio
// thread.
#pragma once

#include <string>

namespace morva::plugins {

// A share in the engine.
class SharedEngine {
public:
    // Throws std::runtime_error when the engine cannot start.
    SharedEngine();
    ~SharedEngine();
    SharedEngine(SharedEngine const&) = delete;
    SharedEngine& operator=(SharedEngine const&) = delete;

    // Registers a model, once, under the name that it is given by: a path with a slash, or the file
    // name of a shipped model. Throws std::runtime_error when there is none or it is not usable.
    void use(std::string const& model);

    // The shipped model that cleans sound of `rateHz`, and the one that scores voices.
    static char const* cleanerFor(int rateHz);
    static char const* voiceModel();
    // `what` failed on this thread, with the engine's reason.
    static std::string reason(std::string const& what);
};

}  // namespace morva::plugins
