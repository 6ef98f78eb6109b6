#include "command_peer.h"

#include <sndfile.h>
#include <sys/resource.h>

#include <cstdlib>
#include <filesystem>

#include "bench_sound.h"

namespace morva_bench {
namespace {

constexpr int kRate = 48000;

bool writeSound(std::filesystem::path const& path, double seconds) {
    SF_INFO info{};
    info.samplerate = kRate;
    info.channels = 1;
    info.format = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
    SNDFILE* const file = sf_open(path.c_str(), SFM_WRITE, &info);
    if (file == nullptr) return false;
    auto const sound = makeSound(Sound::speech, kRate, seconds);
    sf_write_float(file, sound.data(), static_cast<sf_count_t>(sound.size()));
    return sf_close(file) == 0;
}

double childSeconds() {
    rusage usage{};
    getrusage(RUSAGE_CHILDREN, &usage);
    auto const seconds = [](timeval const& t) {
        return static_cast<double>(t.tv_sec) + 1e-6 * static_cast<double>(t.tv_usec);
    };
    return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

double run(std::string const& command, std::filesystem::path const& folder, double seconds) {
    auto const in = folder / "in.wav";
    if (!writeSound(in, seconds)) return -1.0;
    auto const line =
        command + " " + in.string() + " " + (folder / "out.wav").string() + " > /dev/null";
    double const before = childSeconds();
    return std::system(line.c_str()) == 0 ? childSeconds() - before : -1.0;
}

}  // namespace

double commandCost(std::string const& command) {
    constexpr double kShort = 2.0;
    constexpr double kLong = 32.0;
    std::string folder = (std::filesystem::temp_directory_path() / "morva-peer-XXXXXX").string();
    if (mkdtemp(folder.data()) == nullptr) return -1.0;
    double const little = run(command, folder, kShort);
    double const much = run(command, folder, kLong);
    std::filesystem::remove_all(folder);
    return little < 0.0 || much < 0.0 ? -1.0 : (much - little) / (kLong - kShort);
}

}  // namespace morva_bench
