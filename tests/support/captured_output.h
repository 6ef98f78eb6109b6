// Captures what the process writes to standard output or standard error while in scope, whichever
// way it is written (iostreams, stdio, file descriptor).
#pragma once

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>

namespace test_support {

#ifdef __EMSCRIPTEN__  // whose descriptors are not to be turned round: of iostreams only

class CapturedOutput {
public:
    explicit CapturedOutput(int descriptor)
        : stream_(descriptor == 1 ? std::cout : std::cerr), saved_(stream_.rdbuf(all_.rdbuf())) {}
    CapturedOutput(CapturedOutput const&) = delete;
    CapturedOutput& operator=(CapturedOutput const&) = delete;
    ~CapturedOutput() { stream_.rdbuf(saved_); }

    std::string text() {
        stream_.rdbuf(saved_);
        return all_.str();
    }

private:
    std::ostringstream all_;
    std::ostream& stream_;
    std::streambuf* saved_;
};

#else

class CapturedOutput {
public:
    // 1: standard output, 2: standard error.
    explicit CapturedOutput(int descriptor) : descriptor_(descriptor), saved_(dup(descriptor)) {
        direct(fileno(file_.get()));
    }
    CapturedOutput(CapturedOutput const&) = delete;
    CapturedOutput& operator=(CapturedOutput const&) = delete;
    ~CapturedOutput() {
        direct(saved_);
        close(saved_);
    }

    // Ends the capture and returns the text.
    std::string text() {
        direct(saved_);
        std::string all(static_cast<std::size_t>(std::ftell(file_.get())), '\0');
        std::rewind(file_.get());
        all.resize(std::fread(all.data(), 1, all.size(), file_.get()));
        return all;
    }

private:
    void direct(int target) const {
        std::cout.flush();
        std::cerr.flush();
        std::fflush(nullptr);
        dup2(target, descriptor_);
#ifdef _WIN32  // lines end as they are written
        _setmode(descriptor_, _O_BINARY);
#endif
    }

    int descriptor_;
    int saved_;
    std::unique_ptr<std::FILE, int (*)(std::FILE*)> file_{std::tmpfile(), &std::fclose};
};

#endif

}  // namespace test_support
