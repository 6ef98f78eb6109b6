// Sound files: reading whatever the sound-file library knows, writing WAV, FLAC and Ogg; and WAV on
// standard input and output.
//
// Samples are interleaved floats, full scale -1..1, in frames of one sample per channel.
// Threads: a file is used by one thread at a time.
#pragma once

#include <sndfile.h>

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <span>
#include <string>

#include "output_file.h"
#include "streams.h"

namespace morva::cli {

using SoundHandle = std::unique_ptr<SNDFILE, int (*)(SNDFILE*)>;

// Name for messages.
std::string spokenInput(std::filesystem::path const& path);

class SoundReader {
public:
    // Throws Error with the reason when it is no readable sound file.
    explicit SoundReader(std::filesystem::path const& path);

    int rateHz() const { return info_.samplerate; }
    int channels() const { return info_.channels; }
    int format() const { return info_.format; }
    // 0 when it is not known.
    std::int64_t frames() const;
    double seconds() const { return static_cast<double>(frames()) / rateHz(); }

    // Fills `interleaved` (a whole number of frames) and returns the frames read; 0 at the end.
    // Throws Error when the file is damaged from its start on.
    std::size_t read(std::span<float> interleaved);
    // Once all is read: a line for the user when the file is cut off or damaged and its rest is
    // missing, else nothing.
    std::string const& damage() const { return damage_; }

private:
    friend class SoundWriter;

    void noteDamage();
    bool isCut() const;

    std::filesystem::path path_;
    SF_INFO info_{};
    SoundHandle file_;
    std::int64_t framesRead_ = 0;
    bool ended_ = false;
    std::string damage_;
};

// True when the ending of `path` is one that SoundWriter knows.
bool isWritableEnding(std::filesystem::path const& path);
// True when it is one of a sound file that SoundReader knows.
bool isSoundEnding(std::filesystem::path const& path);

// Format for writing `path`: the container of its ending (WAV on standard output) with the sample
// type of `sourceFormat`, or the nearest the container has that holds it.
int outputFormat(std::filesystem::path const& path, int sourceFormat, int channels, int rateHz);

// A file appears under its name in finish(). On standard output the samples are written as they
// come.
class SoundWriter {
public:
    // Rate, channels and text tags are those of `source`.
    SoundWriter(std::filesystem::path const& path, SoundReader const& source, int format,
                Streams const& streams);

    void write(std::span<float const> interleaved);
    void finish();

private:
    void openFile(SoundReader const& source);
    void openStream(SoundReader const& source);
    void correctHeader();
    [[noreturn]] void fail();

    std::filesystem::path path_;
    int standardOutput_;
    std::optional<OutputFile> target_;  // none: standard output
    SF_INFO info_{};
    SoundHandle file_;
    std::int64_t announced_ = 0;  // frames, on standard output
    std::int64_t written_ = 0;
};

// A mono WAV file with 16-bit samples, held in memory. Throws Error.
std::string wavFile(std::span<float const> samples, int rateHz);

}  // namespace morva::cli
