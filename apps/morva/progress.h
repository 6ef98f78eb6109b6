// A progress bar with the time left on standard error, drawn only when that is a terminal. Thread
// rule: any thread.
#pragma once

#include <atomic>
#include <chrono>
#include <mutex>
#include <string>

#include "streams.h"

namespace morva::cli {

class Progress {
public:
    // `total` in any unit that advance() uses too; 0: not known, nothing is drawn.
    Progress(Streams& streams, double total, bool wanted);
    ~Progress();
    Progress(Progress const&) = delete;
    Progress& operator=(Progress const&) = delete;

    void advance(double amount);
    // A line above the bar.
    void say(std::string const& line);

private:
    using Clock = std::chrono::steady_clock;

    void draw(Clock::time_point now);
    void erase();

    Streams& streams_;
    double total_;
    bool shown_;
    std::atomic<double> done_ = 0.0;
    std::mutex drawing_;
    Clock::time_point start_ = Clock::now();
    Clock::time_point last_{};
    bool onScreen_ = false;
};

}  // namespace morva::cli
