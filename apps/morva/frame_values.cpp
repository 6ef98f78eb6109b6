#include "frame_values.h"

#include "rates.h"

namespace morva::cli {

std::vector<float> voiceScores(Engine& engine, Models& models, std::string const& name,
                               MonoSound const& sound, int frameMs) {
    int const rateHz = requireEngineRate(name, sound.rateHz);
    VoiceSession session(engine, {rateHz, frameMs, models.voice()});
    std::vector<float> scores;
    forEachFrame(sound, rateHz, frameMs,
                 [&](std::span<float const> frame) { scores.push_back(session.score(frame)); });
    return scores;
}

std::vector<float> noiseLevels(Engine& engine, Models& models, std::string const& name,
                               MonoSound const& sound, int frameMs) {
    int const rateHz = requireEngineRate(name, sound.rateHz);
    LevelSession session(engine, {rateHz, frameMs, models.level()});
    std::vector<float> levels;
    forEachFrame(sound, rateHz, frameMs,
                 [&](std::span<float const> frame) { levels.push_back(session.level(frame)); });
    return levels;
}

}  // namespace morva::cli
