// One program that takes sound in frames of 10 ms: ours or a peer. What the comparison times.
#pragma once

#include <memory>
#include <string>
#include <vector>

namespace morva_bench {

class Subject {
public:
    virtual ~Subject() = default;
    // One frame of rate / 100 samples in -1..1; what comes out is dropped.
    virtual void frame(float const* samples) = 0;
};

struct Contestant {
    std::string name;
    int rate;  // hertz
    std::unique_ptr<Subject> subject;
};

using Contestants = std::vector<Contestant>;

// The shipped noise models and those of the given weight files, each at its own rate and at 48000
// Hz, and the voice-activity model.
void addOurs(Contestants& all, std::vector<std::string> const& files);
// These print a line and add nothing when the peer was not there at build time.
void addSpeexDsp(Contestants& all);
void addWebRtc(Contestants& all);
// A shared library with the functions rnnoise_create, rnnoise_destroy and rnnoise_process_frame,
// from `path`; `label` is printed. Prints a line and adds nothing when it cannot be loaded.
void addRnnoise(Contestants& all, std::string const& label, std::string const& path);

}  // namespace morva_bench
