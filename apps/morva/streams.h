// The tool's standard streams, and what the engine says beside its results: nothing of that reaches
// standard output, so that a CSV or JSON there stays clean. With `verbose` it goes to standard
// error, otherwise only to the EngineTalk of the thread whose call it was.
//
// Threads: out and err may be called from any thread. One Streams at a time.
#pragma once

#include <string>
#include <string_view>

#include "descriptor.h"

namespace morva::cli {

class Streams {
public:
    explicit Streams(bool verbose);
    ~Streams();
    Streams(Streams const&) = delete;
    Streams& operator=(Streams const&) = delete;

    // Writes all of it to the caller's standard output; throws Error when that fails (a full disk).
    void out(std::string_view text);
    // Writes to the caller's standard error; a failure is ignored, there is nobody to tell.
    void err(std::string_view text) noexcept;
    bool errIsTerminal() const;
    // Of the caller's standard output.
    int outDescriptor() const { return out_.get(); }
    bool verbose() const { return verbose_; }

private:
    bool verbose_;
    Descriptor out_;
    Descriptor err_;
};

// While alive, keeps what the engine says to this thread; one at a time per thread. reason() is
// that, cut down to the sentence that explains the failure.
class EngineTalk {
public:
    EngineTalk();
    ~EngineTalk();
    EngineTalk(EngineTalk const&) = delete;
    EngineTalk& operator=(EngineTalk const&) = delete;

    std::string reason() const;

private:
    std::string heard_;
};

}  // namespace morva::cli
