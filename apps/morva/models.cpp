#include "models.h"

#include <algorithm>
#include <cerrno>
#include <system_error>
#include <utility>
#include <vector>

#include "error.h"
#include "platform.h"
#include "vanishing_file.h"
#include "weights/control_file.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

using Entries = std::vector<std::pair<std::string, std::string>>;

void mustBeFile(fs::path const& file) {
    std::error_code error;
    auto const status = fs::status(file, error);
    if (!fs::exists(status)) throw Error(file.string() + ": no such file");
    if (fs::is_directory(status)) throw Error(file.string() + ": is a folder, not a model");
    if (openForReading(file).get() < 0)
        throw Error(file.string() + ": " + std::generic_category().message(errno));
}

Entries entriesOf(fs::path const& control) {
    Entries entries;
    if (!MORVA::UTILS::readControlFile(entries, MORVA::UTILS::Path(wide(control).c_str())))
        throw Error(control.string() + ": a line is not made of a key and a value");
    return entries;
}

// Beside the control file, wherever one stands; empty: it names none.
fs::path weightNamedIn(fs::path const& control) {
    auto const entries = entriesOf(control);
    auto const named = std::ranges::find(entries, "WEIGHT", &Entries::value_type::first);
    return named == entries.end() ? fs::path()
                                  : (control.parent_path() / named->second).lexically_normal();
}

fs::path programFolder() {
    auto const program = programFile();
    return program.empty() ? fs::current_path() : program.parent_path();
}

}  // namespace

ModelFiles modelFiles(ModelChoice const& choice) {
    auto const absolute = [](fs::path const& path) {
        return path.empty() ? path : fs::absolute(path).lexically_normal();
    };
    ModelFiles files{absolute(choice.model), absolute(choice.control)};
    for (auto const& file : {files.weight, files.control}) {
        if (!file.empty()) mustBeFile(file);
    }
    bool const mustName = files.weight.extension() == ".cfg";
    if (mustName) {
        if (!files.control.empty())
            throw Error("--control goes with a weight file, not with another .cfg");
        files.control = std::exchange(files.weight, {});
    }
    if (!files.weight.empty() && files.weight.extension() != ".mvw")
        throw Error(files.weight.string() + ": a model file ends in .mvw or .cfg");
    if (files.control.empty()) return files;
    if (files.control.extension() != ".cfg")
        throw Error(files.control.string() + ": a control file ends in .cfg");
    auto const own = weightNamedIn(files.control);
    if (own.empty()) {
        if (mustName) throw Error(files.control.string() + ": names no weight");
        return files;
    }
    if (!files.weight.empty())
        throw Error(files.control.string() + ": names a weight of its own; leave out --model");
    mustBeFile(own);
    files.weight = own;
    return files;
}

Models::Models(Engine& engine, fs::path folder) : engine_(engine), folder_(std::move(folder)) {}

std::string Models::name(ShippedKind kind, ModelFiles chosen, int rateHz) {
    if (chosen.weight.empty()) chosen.weight = shipped(kind, rateHz);
    std::lock_guard const lock(registering_);
    if (auto const known = names_.find(chosen); known != names_.end()) return known->second;
    auto const fileName = chosen.weight.filename();
    auto const namesakes = std::ranges::count_if(
        names_, [&](auto const& entry) { return entry.first.weight.filename() == fileName; });
    auto name = fileName.string();
    if (namesakes > 0) name += " (" + std::to_string(namesakes + 1) + ')';
    add(chosen, name);
    return names_.emplace(std::move(chosen), name).first->second;
}

void Models::add(ModelFiles const& files, std::string const& name) {
    if (files.control.empty()) return engine_.addModel(files.weight, name);
    auto text = "WEIGHT " + files.weight.string() + '\n';
    for (auto const& [key, value] : entriesOf(files.control)) {
        if (key != "WEIGHT") text.append(key).append(" ").append(value).append("\n");
    }
    VanishingFile joined(fs::temp_directory_path() / "morva-", ".cfg", "a temporary file");
    joined.write(text);
    engine_.addModel(joined.path(), name);
}

fs::path Models::shipped(ShippedKind kind, int rateHz) const {
    auto const* const model = std::ranges::find_if(shippedModels, [&](ShippedModel const& one) {
        return one.kind == kind && rateHz <= one.maxRateHz;
    });
    if (model == shippedModels.end()) throw Error("no model for " + std::to_string(rateHz) + " Hz");
    if (!folder_.empty()) {
        auto path = fs::absolute(folder_ / model->file);
        mustBeFile(path);
        return path;
    }
    auto const program = programFolder();
    for (auto const* place : {"models", "../share/morva/models", "../../models"}) {
        auto const path = program / place / model->file;
        if (fs::exists(path)) return fs::canonical(path);
    }
    throw Error(std::string("the model ") + model->file +
                " is not installed; name a model with --model or a folder with --models");
}

}  // namespace morva::cli
