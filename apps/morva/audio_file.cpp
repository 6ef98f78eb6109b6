#include "audio_file.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cmath>
#include <initializer_list>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "cut_container.h"
#include "descriptor.h"
#include "error.h"
#include "formatted.h"
#include "platform.h"
#include "wav_header.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

std::string lowerEnding(fs::path const& path) {
    auto ending = path.extension().string();
    std::ranges::transform(ending, ending.begin(),
                           [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return ending;
}

int container(fs::path const& path) {
    if (path == standardStream) return SF_FORMAT_WAV;
    auto const ending = lowerEnding(path);
    if (ending == ".wav") return SF_FORMAT_WAV;
    if (ending == ".flac") return SF_FORMAT_FLAC;
    if (ending == ".ogg" || ending == ".oga") return SF_FORMAT_OGG;
    return 0;
}

// Sample types that lose nothing of `type`, the tightest first.
std::initializer_list<int> typesHolding(int type) {
    static constexpr std::initializer_list<int> eight{SF_FORMAT_PCM_U8, SF_FORMAT_PCM_S8,
                                                      SF_FORMAT_PCM_16};
    static constexpr std::initializer_list<int> wide{SF_FORMAT_FLOAT, SF_FORMAT_PCM_24};
    static constexpr std::initializer_list<int> usual{SF_FORMAT_PCM_16, SF_FORMAT_VORBIS};
    switch (type) {
        case SF_FORMAT_PCM_U8:
        case SF_FORMAT_PCM_S8:
            return eight;
        case SF_FORMAT_PCM_32:
        case SF_FORMAT_FLOAT:
        case SF_FORMAT_DOUBLE:
            return wide;
        default:
            return usual;
    }
}

// WAV cannot hold more than 4 GiB; its 64-bit sister can.
int wavFor(std::int64_t frames, int channels) {
    constexpr std::int64_t limit = (std::int64_t{1} << 32) - (std::int64_t{1} << 20);
    bool const fits = frames > 0 && frames <= limit / 8 / std::max(channels, 1);
    return fits ? SF_FORMAT_WAV : SF_FORMAT_RF64;
}

// Bits of an integer sample type; 0 for every other.
int integerBits(int format) {
    int const type = format & SF_FORMAT_SUBMASK;
    bool const integer = type >= SF_FORMAT_PCM_S8 && type <= SF_FORMAT_PCM_U8;
    return integer ? 8 * sampleBytes(format) : 0;
}

// The sample, rounded to `bits`, in the top bits of an integer. The library would cut the rest off.
int toInteger(float sample, int bits) {
    double const scale = std::ldexp(1.0, bits - 1);
    double const value = std::isnan(sample) ? 0.0 : std::rint(static_cast<double>(sample) * scale);
    auto const whole = static_cast<std::int64_t>(std::clamp(value, -scale, scale - 1.0));
    return static_cast<int>(whole * (std::int64_t{1} << (32 - bits)));
}

// False when not all were taken.
bool writeSamples(SNDFILE* file, int format, std::span<float const> samples) {
    auto const count = static_cast<sf_count_t>(samples.size());
    int const bits = integerBits(format);
    if (bits == 0) return sf_write_float(file, samples.data(), count) == count;
    std::vector<int> integers(samples.size());
    std::ranges::transform(samples, integers.begin(),
                           [bits](float sample) { return toInteger(sample, bits); });
    return sf_write_int(file, integers.data(), count) == count;
}

// Why the last call failed, as part of a sentence.
std::string reasonOf(SNDFILE* file) {
    std::string text = sf_strerror(file);
    constexpr std::string_view opening = "Error : ";
    if (text.starts_with(opening)) text.erase(0, opening.size());
    if (text.ends_with('.')) text.pop_back();
    return text;
}

void copyTags(SNDFILE* from, SNDFILE* to) {
    for (int const tag :
         {SF_STR_TITLE, SF_STR_COPYRIGHT, SF_STR_ARTIST, SF_STR_COMMENT, SF_STR_DATE, SF_STR_ALBUM,
          SF_STR_LICENSE, SF_STR_TRACKNUMBER, SF_STR_GENRE}) {
        if (char const* text = sf_get_string(from, tag)) sf_set_string(to, tag, text);
    }
}

// What the library writes instead of a file.
struct MemoryFile {
    std::string bytes;
    sf_count_t at = 0;

    static MemoryFile& of(void* file) { return *static_cast<MemoryFile*>(file); }
    static sf_count_t length(void* file) { return static_cast<sf_count_t>(of(file).bytes.size()); }
    static sf_count_t tell(void* file) { return of(file).at; }
    static sf_count_t seek(sf_count_t offset, int whence, void* file) {
        sf_count_t const from = whence == SEEK_SET   ? 0
                                : whence == SEEK_CUR ? tell(file)
                                                     : length(file);
        return of(file).at = from + offset;
    }
    static sf_count_t write(void const* data, sf_count_t count, void* file) {
        auto& [bytes, at] = of(file);
        bytes.resize(static_cast<std::size_t>(std::max(length(file), at + count)));
        std::copy_n(static_cast<char const*>(data), count, bytes.begin() + at);
        at += count;
        return count;
    }
    static sf_count_t read(void*, sf_count_t, void*) { return 0; }
    static SF_VIRTUAL_IO calls() {
        return {.get_filelen = length, .seek = seek, .read = read, .write = write, .tell = tell};
    }
};

}  // namespace

std::string spokenInput(fs::path const& path) {
    return path == standardStream ? "standard input" : path.string();
}

SoundReader::SoundReader(fs::path const& path) : path_(path), file_(nullptr, &sf_close) {
    bool const stream = path == standardStream;
    if (stream) {
        file_.reset(sf_open_fd(STDIN_FILENO, SFM_READ, &info_, SF_FALSE));
    } else {
        std::error_code error;
        auto const status = fs::status(path, error);
        if (!fs::exists(status)) throw Error(path.string() + ": no such file");
        if (fs::is_directory(status)) throw Error(path.string() + ": is a folder");
        file_.reset(sf_open(path.string().c_str(), SFM_READ, &info_));
    }
    if (!file_) {
        throw Error(spokenInput(path) + ": cannot be read: " + reasonOf(nullptr) +
                    (stream ? " (through a pipe: WAV, AIFF, AU or Ogg)" : ""));
    }
}

std::int64_t SoundReader::frames() const {
    constexpr std::int64_t absurd = std::int64_t{1} << 48;
    if (info_.frames >= absurd) return 0;
    auto const bytes = info_.frames * info_.channels * sampleBytes(info_.format);
    bool const told = info_.seekable != 0 || !isPlaceholder(static_cast<std::uint64_t>(bytes));
    return told ? info_.frames : 0;
}

std::size_t SoundReader::read(std::span<float> interleaved) {
    if (ended_) return 0;
    auto const wanted = static_cast<sf_count_t>(interleaved.size()) / info_.channels;
    auto const got = sf_readf_float(file_.get(), interleaved.data(), wanted);
    framesRead_ += got;
    if (got < wanted) {
        ended_ = true;
        noteDamage();
    }
    return static_cast<std::size_t>(got);
}

void SoundReader::noteDamage() {
    std::string reason;
    if (sf_error(file_.get()) != SF_ERR_NO_ERROR) reason = reasonOf(file_.get());
    if (reason.empty() && framesRead_ >= frames() && !isCut()) return;
    if (reason.empty()) reason = "it ends early";
    auto const name = spokenInput(path_);
    if (framesRead_ == 0) throw Error(name + ": nothing of it can be read: " + reason);
    double const seconds = static_cast<double>(framesRead_) / rateHz();
    damage_ = name + formatted(": only its first %.2f s can be read: ", seconds) + reason;
}

bool SoundReader::isCut() const {
    if ((info_.format & SF_FORMAT_TYPEMASK) == SF_FORMAT_OGG) {
        if (info_.seekable != 0) return info_.frames == SF_COUNT_MAX;  // no last page
        char log[8192] = {};
        sf_command(file_.get(), SFC_GET_LOG_INFO, log, sizeof log);
        return std::string_view(log).find("End-Of-Stream") != std::string_view::npos;
    }
    if (path_ == standardStream) return endsInsideSound(STDIN_FILENO);
    return endsInsideSound(openForReading(path_).get());
}

bool isWritableEnding(fs::path const& path) {
    return container(path) != 0;
}

bool isSoundEnding(fs::path const& path) {
    static constexpr std::array<std::string_view, 9> others{
        ".opus", ".mp3", ".aiff", ".aif", ".aifc", ".au", ".caf", ".w64", ".rf64"};
    return isWritableEnding(path) || std::ranges::find(others, lowerEnding(path)) != others.end();
}

int outputFormat(fs::path const& path, int sourceFormat, int channels, int rateHz) {
    int const major = container(path);
    if (major == 0) throw Error(path.string() + ": the output ends in .wav, .flac or .ogg");
    SF_INFO info{};
    info.channels = channels;
    info.samplerate = rateHz;
    auto const fits = [&](int type) {
        info.format = major | type;
        return sf_format_check(&info) != 0;
    };
    int const type = sourceFormat & SF_FORMAT_SUBMASK;
    bool const lossy = type == SF_FORMAT_VORBIS || type == SF_FORMAT_OPUS;
    bool const plain = type <= SF_FORMAT_ALAW;
    if ((plain || (lossy && major == SF_FORMAT_OGG)) && fits(type)) return info.format;
    for (int const candidate : typesHolding(type)) {
        if (fits(candidate)) return info.format;
    }
    if (fits(SF_FORMAT_VORBIS)) return info.format;
    throw Error(path.string() + ": this format cannot hold " + std::to_string(channels) +
                " channels of " + std::to_string(rateHz) + " Hz");
}

SoundWriter::SoundWriter(fs::path const& path, SoundReader const& source, int format,
                         Streams const& streams)
    : path_(path), standardOutput_(streams.outDescriptor()), file_(nullptr, &sf_close) {
    info_.channels = source.channels();
    info_.samplerate = source.rateHz();
    info_.format = format;
    path == standardStream ? openStream(source) : openFile(source);
    sf_command(file_.get(), SFC_SET_CLIPPING, nullptr, SF_TRUE);
}

void SoundWriter::openFile(SoundReader const& source) {
    target_.emplace(path_);
    if ((info_.format & SF_FORMAT_TYPEMASK) == SF_FORMAT_WAV) {
        info_.format &= ~SF_FORMAT_TYPEMASK;
        info_.format |= wavFor(source.frames(), info_.channels);
    }
    file_.reset(sf_open_fd(target_->unfinished().descriptor().get(), SFM_WRITE, &info_, SF_FALSE));
    if (!file_) fail();
    sf_command(file_.get(), SFC_RF64_AUTO_DOWNGRADE, nullptr, SF_TRUE);
    double quality = 0.7;
    sf_command(file_.get(), SFC_SET_VBR_ENCODING_QUALITY, &quality, sizeof quality);
    copyTags(source.file_.get(), file_.get());
}

// The library cannot write WAV to a pipe, but bare samples.
void SoundWriter::openStream(SoundReader const& source) {
    if (::isatty(standardOutput_) == 1)
        throw Error("standard output is a terminal: send the sound to a file or a program");
    announced_ = source.frames();
    if (!writeAll(standardOutput_, wavHeader(info_, announced_))) fail();
    info_.format = SF_FORMAT_RAW | SF_ENDIAN_LITTLE | (info_.format & SF_FORMAT_SUBMASK);
    // Not by its descriptor: the library refuses one that stands behind a header.
    SF_VIRTUAL_IO onlyWrites{
        .get_filelen = [](void*) -> sf_count_t { return 0; },
        .seek = [](sf_count_t, int, void*) -> sf_count_t { return 0; },
        .read = [](void*, sf_count_t, void*) -> sf_count_t { return 0; },
        .write = [](void const* bytes, sf_count_t count, void* output) -> sf_count_t {
            std::string_view const text(static_cast<char const*>(bytes),
                                        static_cast<std::size_t>(count));
            return writeAll(*static_cast<int*>(output), text) ? count : 0;
        },
        .tell = [](void*) -> sf_count_t { return 0; }};
    file_.reset(sf_open_virtual(&onlyWrites, SFM_WRITE, &info_, &standardOutput_));
    if (!file_) fail();
}

void SoundWriter::write(std::span<float const> interleaved) {
    if (!writeSamples(file_.get(), info_.format, interleaved)) fail();
    written_ += static_cast<std::int64_t>(interleaved.size()) / info_.channels;
}

void SoundWriter::finish() {
    if (sf_close(file_.release()) != 0) fail();
    target_ ? target_->finish() : correctHeader();
}

// Where standard output is a file, its header can say what came in the end.
void SoundWriter::correctHeader() {
    auto const length = written_ * info_.channels * sampleBytes(info_.format);
    if (written_ == announced_) return;
    auto const header = wavHeader(info_, written_);
    auto const back = static_cast<std::uint64_t>(length) + header.size();
    if (!rewriteHeader(standardOutput_, back, header)) fail();
}

void SoundWriter::fail() {
    throw Error((path_ == standardStream ? "standard output" : path_.string()) +
                ": cannot be written: " + reasonOf(file_.get()));
}

std::string wavFile(std::span<float const> samples, int rateHz) {
    SF_INFO info{};
    info.channels = 1;
    info.samplerate = rateHz;
    info.format = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
    MemoryFile memory;
    auto calls = MemoryFile::calls();
    SoundHandle file(sf_open_virtual(&calls, SFM_WRITE, &info, &memory), &sf_close);
    if (!file || !writeSamples(file.get(), info.format, samples) || sf_close(file.release()) != 0) {
        throw Error("a sound cannot be held in memory: " + reasonOf(file.get()));
    }
    return std::move(memory.bytes);
}

}  // namespace morva::cli
