#include "progress.h"

#include <algorithm>

namespace morva::cli {
namespace {
constexpr int barWidth = 40;
constexpr std::chrono::milliseconds redrawEvery{100};
}  // namespace

Progress::Progress(Streams& streams, std::int64_t total, bool wanted)
    : streams_(streams),
      total_(std::max<std::int64_t>(total, 1)),
      shown_(wanted && streams.errIsTerminal()) {}

Progress::~Progress() {
    erase();
}

void Progress::advance(std::int64_t amount) {
    done_ += amount;
    if (!shown_) return;
    std::unique_lock const lock(drawing_, std::try_to_lock);
    auto const now = std::chrono::steady_clock::now();
    if (!lock || now - last_ < redrawEvery) return;
    last_ = now;
    draw();
}

void Progress::say(std::string const& line) {
    std::lock_guard const lock(drawing_);
    erase();
    streams_.err(line + '\n');
}

void Progress::draw() {
    auto const done = std::min<std::int64_t>(done_, total_);
    auto const filled = static_cast<std::size_t>(done * barWidth / total_);
    auto const percent = std::to_string(done * 100 / total_);
    streams_.err("\r[" + std::string(filled, '#') + std::string(barWidth - filled, ' ') + "] " +
                 std::string(3 - std::min<std::size_t>(percent.size(), 3), ' ') + percent + '%');
    onScreen_ = true;
}

void Progress::erase() {
    if (onScreen_) streams_.err("\r\033[K");
    onScreen_ = false;
}

}  // namespace morva::cli
