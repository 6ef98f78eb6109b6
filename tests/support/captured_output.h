// Captures what the process writes to standard output or standard error while in scope, whichever
// way it is written (iostreams, stdio, file descriptor).
#pragma once

#include <unistd.h>

#include <cstdio>
#include <iostream>
#include <memory>
#include <string>

namespace test_support {

class CapturedOutput {
public:
    // 1: standard output, 2: standard error.
    explicit CapturedOutput(int descriptor) : descriptor_(descriptor), saved_(dup(descriptor)) {
        flush();
        dup2(fileno(file_.get()), descriptor_);
    }
    CapturedOutput(CapturedOutput const&) = delete;
    CapturedOutput& operator=(CapturedOutput const&) = delete;
    ~CapturedOutput() { stop(); }

    // Ends the capture and returns the text.
    std::string text() {
        stop();
        std::string all;
        std::rewind(file_.get());
        for (int c = std::fgetc(file_.get()); c != EOF; c = std::fgetc(file_.get())) {
            all.push_back(static_cast<char>(c));
        }
        return all;
    }

private:
    static void flush() {
        std::cout.flush();
        std::cerr.flush();
        std::fflush(nullptr);
    }

    void stop() {
        if (saved_ < 0) return;
        flush();
        dup2(saved_, descriptor_);
        close(saved_);
        saved_ = -1;
    }

    struct Close {
        void operator()(std::FILE* file) const { std::fclose(file); }
    };

    int descriptor_;
    int saved_;
    std::unique_ptr<std::FILE, Close> file_{std::tmpfile()};
};

}  // namespace test_support
