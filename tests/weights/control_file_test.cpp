#include "weights/control_file.h"

#include <gmock/gmock.h>

#include <random>

#include "support/temp_dir.h"

namespace {

using namespace MORVA;
using namespace std::string_literals;
using Entry = std::pair<std::string, std::string>;
using Entries = std::vector<Entry>;

struct Result {
    bool ok;
    Entries entries;
    bool operator==(Result const&) const = default;
};

Result readText(std::string const& text) {
    test_support::TempDir const dir;
    Result result;
    auto const file = dir.write("model.cfg", text).wstring();
    result.ok = UTILS::readControlFile(result.entries, UTILS::Path(file.c_str()));
    return result;
}

TEST(ControlFile, ReadsItsEntriesInOrder) {
    for (auto const& [text, expected] : std::initializer_list<std::pair<std::string, Result>>{
             {"", {true, {}}},
             {"\n\n \t\n#\n# a b\n#word\r\n", {true, {}}},
             {"a 1\r\nb 2", {true, {{"a", "1"}, {"b", "2"}}}},  // Windows lines, no final newline
             {"a 1\na 2\n", {true, {{"a", "1"}, {"a", "2"}}}},
             {"\t k \f\v inner  blanks stay \r", {true, {{"k", "inner  blanks stay"}}}},
             {"\xc3\xa4 \xa0v\xa0", {true, {{"\xc3\xa4", "\xa0v\xa0"}}}},  // no blank above 127
             {" # x\n", {true, {{"#", "x"}}}},
             {" #x\n", {false, {}}},
             {"k=v", {false, {}}},
             {"a 1\nword\nb 2\n", {false, {{"a", "1"}}}},
             {"\0\0\n"s, {false, {}}},
             {"\0 \0\n"s, {true, {{"\0"s, "\0"s}}}},
             {"a 1\rb 2\n", {true, {{"a", "1\rb 2"}}}},
         }) {
        EXPECT_EQ(readText(text), expected) << text;
    }
    EXPECT_EQ(UTILS::getKeyValue("  word \t "), Entry("word", ""));
}

TEST(ControlFile, MustBeAReadableFile) {
    test_support::TempDir const dir;
    for (auto const& path : {dir.path(), dir.path() / "missing.cfg"}) {
        Entries entries;
        EXPECT_FALSE(UTILS::readControlFile(entries, UTILS::Path(path.wstring().c_str()))) << path;
    }
    Entries entries = {{"already", "there"}};
    auto const file = dir.write("a.cfg", "k v").wstring();
    EXPECT_TRUE(UTILS::readControlFile(entries, UTILS::Path(file.c_str())));
    EXPECT_THAT(entries, testing::ElementsAre(Entry("already", "there"), Entry("k", "v")));
}

TEST(ControlFile, LinesMayBeVeryLong) {
    std::string const key(3'000'000, 'k');
    std::string const value(5'000'000, 'v');
    EXPECT_EQ(readText(key + std::string(1'000'000, ' ') + value), (Result{true, {{key, value}}}));
    EXPECT_EQ(readText("#" + std::string(5'000'000, '\0') + "\n" + key), (Result{false, {}}));
}

// Entries written with random whitespace around them, comments and empty lines between.
TEST(ControlFile, RandomFilesComeBack) {
    for (unsigned seed = 1; seed <= 200; ++seed) {
        std::mt19937 engine(seed);
        auto const pick = [&engine](std::string const& set, unsigned low, unsigned spread) {
            std::string text(low + engine() % spread, ' ');
            for (auto& byte : text) byte = set[engine() % set.size()];
            return text;
        };
        std::string const space = " \t\v\f\r";
        std::string const letters = "abC_#=.0\0\xff"s;
        Result expected{true, {}};
        std::string text;
        for (unsigned i = 0; i < 20; ++i) {
            auto const key = "k" + pick(letters, 0, 8);
            auto const value = pick(letters, 1, 4) + pick(space, 0, 3) + pick(letters, 1, 4);
            text += pick(space, 0, 3) + key + pick(space, 1, 3) + value + pick(space, 0, 3) + "\n";
            if (engine() % 3 == 0) text += "#" + pick(letters + space, 0, 9) + "\n";
            if (engine() % 3 == 0) text += pick(space, 0, 4) + "\n";
            expected.entries.emplace_back(key, value);
        }
        ASSERT_EQ(readText(text), expected) << "seed " << seed;
    }
}

}  // namespace
