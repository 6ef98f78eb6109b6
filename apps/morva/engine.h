// The engine as objects: one Engine per process, sessions that close themselves. Everything goes
// through the C interface.
//
// Frames are mono floats in -1..1, rate * duration / 1000 samples.
// Threads: sessions may be opened and used on different threads; one thread at a time per session.
// The Engine outlives its sessions.
#pragma once

#include <cstddef>
#include <filesystem>
#include <limits>
#include <memory>
#include <span>
#include <string>

namespace morva::cli {

// What a session runs on.
struct SessionSetup {
    int rateHz = 0;
    int frameMs = 10;
    std::string model;                                       // name under which it was registered
    float limitDb = std::numeric_limits<float>::infinity();  // of cleaning: no part lowered by more

    std::size_t frameSize() const;  // samples
};

class Engine {
public:
    // Throws Error when the processor lacks what the engine needs.
    Engine();
    ~Engine();
    Engine(Engine const&) = delete;
    Engine& operator=(Engine const&) = delete;

    // Registers a weight or control file, given by its absolute path, under a name that no model
    // has yet; throws Error with the engine's reason.
    void addModel(std::filesystem::path const& file, std::string const& name);
};

// The engine's form of a path. Throws for a file name that is no UTF-8.
std::wstring wide(std::filesystem::path const& path);

// Closes a session of one kind.
using SessionHandle = std::unique_ptr<void, int (*)(void*)>;

class CleaningSession {
public:
    CleaningSession(Engine& engine, SessionSetup const& setup);

    // Both spans hold one frame.
    void clean(std::span<float const> in, std::span<float> out);
    // Samples by which the output lags the input.
    double latency() const { return latency_; }

private:
    SessionHandle session_;
    double latency_ = 0.0;
};

class VoiceSession {
public:
    VoiceSession(Engine& engine, SessionSetup const& setup);
    // 0..1; throws Error for a model that does not keep to that range.
    float score(std::span<float const> frame);

private:
    SessionHandle session_;
};

class LevelSession {
public:
    LevelSession(Engine& engine, SessionSetup const& setup);
    // Decibels re one squared unit of the 16-bit sample scale.
    float level(std::span<float const> frame);

private:
    SessionHandle session_;
};

}  // namespace morva::cli
