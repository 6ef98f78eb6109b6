#include "progress.h"

#include <algorithm>
#include <cmath>

#include "formatted.h"

namespace morva::cli {
namespace {
constexpr int barWidth = 40;
constexpr std::chrono::milliseconds redrawEvery{100};

std::string clockTime(double seconds) {
    auto const whole = static_cast<long>(seconds);
    auto const hours = whole / 3600;
    return (hours > 0 ? formatted("%ld:%02ld", hours, whole / 60 % 60)
                      : std::to_string(whole / 60)) +
           formatted(":%02ld", whole % 60);
}

}  // namespace

Progress::Progress(Streams& streams, double total, bool wanted)
    : streams_(streams), total_(total), shown_(wanted && total > 0 && streams.errIsTerminal()) {}

Progress::~Progress() {
    erase();
}

void Progress::advance(double amount) {
    done_ += amount;
    if (!shown_) return;
    std::unique_lock const lock(drawing_, std::try_to_lock);
    auto const now = Clock::now();
    if (!lock || now - last_ < redrawEvery) return;
    last_ = now;
    draw(now);
}

void Progress::say(std::string const& line) {
    std::lock_guard const lock(drawing_);
    erase();
    streams_.err(line + '\n');
}

void Progress::draw(Clock::time_point now) {
    constexpr double enoughToTell = 0.01;
    double const done = std::min(done_ / total_, 1.0);
    auto const filled = static_cast<std::size_t>(done * barWidth);
    std::chrono::duration<double> const taken = now - start_;
    auto const left = taken.count() * (1.0 / done - 1.0);
    streams_.err("\r[" + std::string(filled, '#') + std::string(barWidth - filled, ' ') +
                 formatted("] %3.0f%%", std::floor(100.0 * done)) +
                 (done < enoughToTell ? "" : "  " + clockTime(left + 0.5) + " left") + "\033[K");
    onScreen_ = true;
}

void Progress::erase() {
    if (onScreen_) streams_.err("\r\033[K");
    onScreen_ = false;
}

}  // namespace morva::cli
