// What the registry reads beside weights: the identifier of a weight, and control files. (What
// registration says and does: see the tests of the C interface.)
#include <gmock/gmock.h>

#include <sstream>
#include <tuple>

#include "support/temp_dir.h"
#include "weights/control_file.h"
#include "weights/model_registry.h"

namespace {

using namespace MORVA;
using namespace std::string_literals;
using test_support::WeightWriter;
using Entry = std::pair<std::string, std::string>;
using Entries = std::vector<Entry>;

std::string identify(WeightWriter const& writer, std::string const& expectedOutput) {
    auto const weight = std::make_shared<WEIGHTS::Weight>();
    weight->read(writer.bytes().data(), writer.bytes().size());
    testing::internal::CaptureStdout();
    auto identifier = WEIGHTS::ModelRegistry::mvwUniqueIdGenerator(weight);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), expectedOutput);
    return identifier;
}

TEST(Identifier, JoinsItsFiveParts) {
    std::istringstream rows(
        "16000 175 0.0.61016nc210301  44100 441 0.0.61044nc210301  1000 -5 0.0.6-51nc210301 "
        "8000 -7 0.0.608nc210301  1999 -2147483648 0.0.6-21474836481nc210301  999 160 none "
        "2147483647 2147483647 0.0.610002147483nc210301  -2147483648 -2147483648 none");
    std::string expected;
    for (int rate = 0, length = 0; rows >> rate >> length >> expected;) {
        WeightWriter writer;
        writer.add("Version", "0.0.6").add("SampleRate", rate).add("FrameLength", length);
        writer.add("ModelName", "nc").add("TimeStamp", "210301");
        bool const none = expected == "none";
        EXPECT_EQ(identify(writer, none ? "ERROR INVALID WEIGHT\n" : ""), none ? "" : expected);
    }
    WeightWriter writer;  // texts may be empty or hold any byte
    writer.add("Version", "").add("SampleRate", 8000).add("FrameLength", 80);
    writer.add("ModelName", std::string_view("a\0b", 3)).add("TimeStamp", "");
    EXPECT_EQ(identify(writer, ""), std::string("108a\0b", 6));
}

// One of the five missing, then one of another type.
TEST(Identifier, NeedsAllFiveValues) {
    for (int dropped = 0; dropped < 5; ++dropped) {
        for (bool const mistyped : {false, true}) {
            WeightWriter writer;
            auto add = [&, index = 0](char const* name, auto value, auto wrong) mutable {
                if (index != dropped) writer.add(name, value);
                if (index++ == dropped && mistyped) writer.add(name, wrong);
            };
            for (auto const* name : {"Version", "ModelName", "TimeStamp"}) add(name, "text", 1);
            for (auto const* name : {"SampleRate", "FrameLength"}) add(name, 16000, 16000.0F);
            EXPECT_EQ(identify(writer, "ERROR INVALID WEIGHT\n"), "") << dropped << mistyped;
        }
    }
}

TEST(ControlFile, ReadsItsEntriesInOrder) {
    test_support::TempDir const dir;
    std::string const longKey(3'000'000, 'k');
    std::string const longValue(5'000'000, 'v');
    for (auto const& [text, good, expected] :
         std::initializer_list<std::tuple<std::string, bool, Entries>>{
             {"", true, {}},
             {"\n\n \t\n#\n# a b\n#word\r\n", true, {}},
             {"a 1\r\nb 2", true, {{"a", "1"}, {"b", "2"}}},  // Windows lines, no final newline
             {"a 1\na 2\n", true, {{"a", "1"}, {"a", "2"}}},
             {"\t k \f\v inner  blanks stay \r", true, {{"k", "inner  blanks stay"}}},
             {"\xc3\xa4 \xa0v\xa0", true, {{"\xc3\xa4", "\xa0v\xa0"}}},  // no blank above 127
             {" # x\n", true, {{"#", "x"}}},
             {" #x\n", false, {}},
             {"a 1\nword\nb 2\n", false, {{"a", "1"}}},
             {"\0\0\n"s, false, {}},
             {"\0 \0\n"s, true, {{"\0"s, "\0"s}}},
             {"a 1\rb 2\n", true, {{"a", "1\rb 2"}}},
             {longKey + std::string(1'000'000, ' ') + longValue, true, {{longKey, longValue}}},
         }) {
        Entries entries;
        auto const file = dir.write("model.cfg", text).wstring();
        EXPECT_EQ(UTILS::readControlFile(entries, UTILS::Path(file.c_str())), good);
        EXPECT_EQ(entries, expected);
    }
    EXPECT_EQ(UTILS::getKeyValue("  word \t "), Entry("word", ""));
    for (auto const& path : {dir.path(), dir.path() / "missing.cfg"}) {
        Entries entries = {{"already", "there"}};
        EXPECT_FALSE(UTILS::readControlFile(entries, UTILS::Path(path.wstring().c_str()))) << path;
        EXPECT_EQ(entries.size(), 1U);
    }
}

}  // namespace
