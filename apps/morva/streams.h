// The tool's standard streams, kept apart from what the engine prints.
//
// The engine writes diagnostics on the process's standard output and error. So that a CSV or JSON
// on standard output stays clean, the process's descriptor 1 is pointed at a file in memory for the
// whole run and the tool writes to copies of the original descriptors. With `verbose` the engine's
// lines go to standard error instead.
//
// Threads: out and err may be called from any thread; EngineTalk sections exclude each other.
#pragma once

#include <mutex>
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
    friend class EngineTalk;

    bool verbose_;
    Descriptor out_;
    Descriptor err_;
    Descriptor heard_;  // what the engine printed, in memory
    std::mutex talking_;
};

// While alive, the engine's standard error is recorded too. reason() is what it has said, cut down
// to the sentence that explains the failure.
class EngineTalk {
public:
    explicit EngineTalk(Streams& streams);
    ~EngineTalk();
    EngineTalk(EngineTalk const&) = delete;
    EngineTalk& operator=(EngineTalk const&) = delete;

    std::string reason() const;

private:
    Streams& streams_;
    std::unique_lock<std::mutex> lock_;
    long from_ = 0;
};

// The explaining sentence of an engine diagnostic: the message of an exception text, otherwise the
// last line that says something. Public for the tests.
std::string explain(std::string_view diagnostics);

}  // namespace morva::cli
