// A progress bar on standard error, drawn only when that is a terminal. Thread rule: any thread.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <mutex>
#include <string>

#include "streams.h"

namespace morva::cli {

class Progress {
public:
    // `total` in any unit that advance() uses too.
    Progress(Streams& streams, std::int64_t total, bool wanted);
    ~Progress();
    Progress(Progress const&) = delete;
    Progress& operator=(Progress const&) = delete;

    void advance(std::int64_t amount);
    // A line above the bar.
    void say(std::string const& line);

private:
    void draw();
    void erase();

    Streams& streams_;
    std::int64_t total_;
    bool shown_;
    std::atomic<std::int64_t> done_ = 0;
    std::mutex drawing_;
    std::chrono::steady_clock::time_point last_{};
    bool onScreen_ = false;
};

}  // namespace morva::cli
