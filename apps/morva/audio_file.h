// Sound files: reading whatever the sound-file library knows, writing WAV, FLAC and Ogg.
//
// Samples are interleaved floats, full scale -1..1, in frames of one sample per channel.
// Threads: a file is used by one thread at a time.
#pragma once

#include <sndfile.h>

#include <cstdint>
#include <filesystem>
#include <memory>
#include <span>
#include <string>

#include "vanishing_file.h"

namespace morva::cli {

using SoundHandle = std::unique_ptr<SNDFILE, int (*)(SNDFILE*)>;

class SoundReader {
public:
    // Throws Error with the reason when it is no readable sound file.
    explicit SoundReader(std::filesystem::path const& path);

    int rateHz() const { return info_.samplerate; }
    int channels() const { return info_.channels; }
    std::int64_t frames() const { return info_.frames; }
    int format() const { return info_.format; }

    // Fills `interleaved` (a whole number of frames) and returns the frames read; 0 at the end.
    // Throws Error when the data is damaged or ends before the length that the file announces.
    std::size_t read(std::span<float> interleaved);

private:
    friend class SoundWriter;

    std::filesystem::path path_;
    SF_INFO info_{};
    SoundHandle file_;
    std::int64_t framesRead_ = 0;
};

// True when the ending of `path` is one that SoundWriter knows.
bool isWritableEnding(std::filesystem::path const& path);

// Format for writing `path`: the container of its ending with the sample type of `sourceFormat`, or
// the nearest the container has that holds it.
int outputFormat(std::filesystem::path const& path, int sourceFormat, int channels, int rateHz);

// Writes beside the target and takes its place in finish(), so that a run that fails leaves no half
// file and does not touch an older one.
class SoundWriter {
public:
    // Rate, channels and text tags are those of `source`.
    SoundWriter(std::filesystem::path const& path, SoundReader const& source, int format);

    void write(std::span<float const> interleaved);
    void finish();

private:
    std::filesystem::path path_;
    VanishingFile part_;
    SF_INFO info_{};
    SoundHandle file_;
};

// A mono WAV file with 16-bit samples, held in memory. Throws Error.
std::string wavFile(std::span<float const> samples, int rateHz);

}  // namespace morva::cli
