#include "models.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <sstream>
#include <system_error>
#include <utility>

#include "error.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

struct Shipped {
    char const* file;
    int maxRateHz;
};
constexpr std::array shippedByRate{Shipped{"NC_small_8k.mvw", 8000},
                                   Shipped{"NC_small_16k.mvw", 16000},
                                   Shipped{"c6.xs.f.ca03f4.mvw", 96000}};

// A file that vanishes with its holder.
class TemporaryFile {
public:
    TemporaryFile(std::string const& ending, std::string const& content) {
        auto name = (fs::temp_directory_path() / ("morva-XXXXXX" + ending)).string();
        int const number = ::mkstemps(name.data(), static_cast<int>(ending.size()));
        if (number < 0)
            throw Error("cannot write a temporary file: " + std::generic_category().message(errno));
        Descriptor const descriptor(number);
        path_ = name;
        std::ofstream stream(path_, std::ios::binary);
        stream << content << std::flush;
        if (!stream) throw Error("cannot write " + name);
    }
    ~TemporaryFile() {
        std::error_code ignored;
        fs::remove(path_, ignored);
    }
    TemporaryFile(TemporaryFile const&) = delete;
    TemporaryFile& operator=(TemporaryFile const&) = delete;
    fs::path const& path() const { return path_; }

private:
    fs::path path_;
};

std::string textOf(fs::path const& file) {
    std::ifstream stream(file, std::ios::binary);
    std::string text{std::istreambuf_iterator<char>(stream), {}};
    if (!stream.eof() && !stream) throw Error("cannot read " + file.string());
    return text;
}

bool namesWeight(std::string const& controlText) {
    std::istringstream lines(controlText);
    std::string line;
    while (std::getline(lines, line)) {
        std::istringstream words(line);
        std::string key;
        if (words >> key && key == "WEIGHT") return true;
    }
    return false;
}

void mustBeFile(fs::path const& file) {
    std::error_code error;
    auto const status = fs::status(file, error);
    if (!fs::exists(status)) throw Error(file.string() + ": no such file");
    if (fs::is_directory(status)) throw Error(file.string() + ": is a folder, not a model");
    if (::access(file.c_str(), R_OK) != 0)
        throw Error(file.string() + ": " + std::generic_category().message(errno));
}

bool isControl(fs::path const& file) {
    return file.extension() == ".cfg";
}

fs::path programFolder() {
    std::error_code error;
    auto const program = fs::read_symlink("/proc/self/exe", error);
    return error ? fs::current_path() : program.parent_path();
}

}  // namespace

std::optional<std::string> shippedCleaningModel(int rateHz) {
    for (auto const& [file, maxRateHz] : shippedByRate) {
        if (rateHz <= maxRateHz) return file;
    }
    return std::nullopt;
}

fs::path controlFolder(ModelChoice const& choice) {
    auto const& file = choice.control.empty() ? choice.model : choice.control;
    return file.empty() ? fs::current_path() : fs::absolute(file).parent_path();
}

Models::Models(Engine& engine, ModelChoice choice) : engine_(engine), choice_(std::move(choice)) {
    if (!choice_.model.empty()) {
        mustBeFile(choice_.model);
        if (choice_.model.extension() != ".mvw" && !isControl(choice_.model)) {
            throw Error(choice_.model.string() + ": a model file ends in .mvw or .cfg");
        }
    }
    if (choice_.control.empty()) return;
    mustBeFile(choice_.control);
    if (!isControl(choice_.control))
        throw Error(choice_.control.string() + ": a control file ends in .cfg");
    if (isControl(choice_.model))
        throw Error("--control goes with a weight file, not with another .cfg");
    if (namesWeight(textOf(choice_.control))) {
        if (!choice_.model.empty()) {
            throw Error(choice_.control.string() +
                        ": names a weight of its own; leave out --model");
        }
        choice_.model = std::exchange(choice_.control, {});
    }
}

std::string Models::cleaning(int rateHz) {
    auto const file = shippedCleaningModel(rateHz);
    if (!file) throw Error("no model for " + std::to_string(rateHz) + " Hz");
    return chosenOr(*file);
}

std::string Models::voice() {
    return chosenOr("VAD_weight.mvw");
}

std::string Models::level() {
    return chosenOr("noise_level_16k.mvw");
}

std::string Models::chosenOr(std::string const& shippedFile) {
    return registered(choice_.model.empty() ? shipped(shippedFile) : choice_.model);
}

std::string Models::registered(fs::path const& file) {
    std::lock_guard const lock(registering_);
    auto const path = fs::absolute(file);
    if (auto const known = names_.find(path); known != names_.end()) return known->second;
    auto const name = path.filename().string();
    if (choice_.control.empty()) {
        engine_.addModel(path, name);
    } else {
        TemporaryFile const joined(".cfg",
                                   "WEIGHT " + path.string() + '\n' + textOf(choice_.control));
        engine_.addModel(joined.path(), name);
    }
    return names_.emplace(path, name).first->second;
}

fs::path Models::shipped(std::string const& file) const {
    if (!choice_.folder.empty()) {
        auto path = choice_.folder / file;
        mustBeFile(path);
        return path;
    }
    auto const program = programFolder();
    for (auto const* place : {"models", "../share/morva/models", "../../models"}) {
        auto const path = program / place / file;
        if (fs::exists(path)) return fs::canonical(path);
    }
    throw Error("the model " + file +
                " is not installed; name a model with --model or a folder with --models");
}

}  // namespace morva::cli
