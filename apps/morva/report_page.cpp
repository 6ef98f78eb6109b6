#include "report_page.h"

#include <algorithm>
#include <cstdint>
#include <nlohmann/json.hpp>
#include <string_view>

#include "audio_file.h"
#include "formatted.h"
#include "report_template.h"

namespace morva::cli {
namespace {

std::string base64(std::string_view bytes) {
    constexpr std::string_view digits =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text;
    text.reserve((bytes.size() + 2) / 3 * 4);
    for (std::size_t at = 0; at < bytes.size(); at += 3) {
        auto const group = bytes.substr(at, 3);
        std::uint32_t bits = 0;
        for (std::size_t i = 0; i < 3; ++i) {
            bits = bits << 8 | (i < group.size() ? static_cast<unsigned char>(group[i]) : 0U);
        }
        for (std::size_t i = 0; i < 4; ++i) {
            text += i <= group.size() ? digits[bits >> (18 - 6 * i) & 63U] : '=';
        }
    }
    return text;
}

// JSON that cannot end the script element it stands in.
std::string scriptSafe(nlohmann::ordered_json const& page) {
    auto text = page.dump(-1, ' ', true, nlohmann::json::error_handler_t::replace);
    for (auto at = text.find('<'); at != std::string::npos; at = text.find('<', at)) {
        text.replace(at, 1, "\\u003c");
    }
    return text;
}

double lengthSeconds(Report const& report) {
    return static_cast<double>(report.before.size()) / std::max(report.rateHz, 1);
}

std::vector<std::pair<std::string, std::string>> summary(Report const& report) {
    std::vector<std::pair<std::string, std::string>> items{
        {"Length", formatted("%.2f s", lengthSeconds(report))},
        {"Rate", formatted("%d Hz", report.rateHz)}};
    if (!report.scores.empty()) {
        items.emplace_back(
            "Speech", formatted("%.2f s in %zu segment%s", totalMs(report.segments) / 1000.0,
                                report.segments.size(), report.segments.size() == 1 ? "" : "s"));
    }
    if (!report.levelsDb.empty()) {
        auto levels = report.levelsDb;
        auto const middle = levels.begin() + static_cast<std::ptrdiff_t>(levels.size() / 2);
        std::ranges::nth_element(levels, middle);
        items.emplace_back("Median noise level",
                           formatted("%.1f dBFS", static_cast<double>(*middle)));
    }
    return items;
}

}  // namespace

std::string renderPage(Report const& report) {
    nlohmann::ordered_json data{{"file", report.file},
                                {"seconds", lengthSeconds(report)},
                                {"sampleRate", report.rateHz},
                                {"frameMs", report.frameMs},
                                {"summary", summary(report)},
                                {"notes", report.notes},
                                {"threshold", report.rules.threshold},
                                {"release", report.rules.release},
                                {"segments", nlohmann::json::array()},
                                {"scores", nullptr},
                                {"levels", nullptr},
                                {"before", base64(wavFile(report.before, report.rateHz))},
                                {"after", base64(wavFile(report.after, report.rateHz))}};
    if (!report.scores.empty()) data["scores"] = report.scores;
    if (!report.levelsDb.empty()) data["levels"] = report.levelsDb;
    for (auto const& segment : report.segments) {
        data["segments"].push_back({segment.startMs / 1000.0, segment.endMs / 1000.0});
    }
    std::string page(reportTemplate);
    constexpr std::string_view place = "{{DATA}}";
    return page.replace(page.find(place), place.size(), scriptSafe(data));
}

}  // namespace morva::cli
