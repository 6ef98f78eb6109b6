// Drives, shares, and names that the system takes literally, as a loader hands them out.
#include <gtest/gtest.h>

#include <array>

#include "utils/path.h"

TEST(Path, KeepsTheRootOfEveryFormAndJoinsBehindIt) {
    using Row = std::array<wchar_t const*, 3>;
    for (auto const& [front, text, wanted] :
         {Row{L"", L"C:/a//./b/../c", L"C:\\a\\c"}, Row{L"D:\\x", L"C:\\..\\f", L"C:\\f"},
          Row{L"D:\\x", L"/a/../f", L"\\f"}, Row{L"D:\\x\\", L"./f", L"D:\\x\\f"},
          Row{L"\\\\host\\share", L"..\\..\\f", L"\\\\host\\share\\f"},
          Row{L"\\\\?\\C:\\x", L"./y/../f.mvw", L"\\\\?\\C:\\x\\f.mvw"}}) {
        MORVA::UTILS::Path path(text);
        path.pushFront(front);
        EXPECT_TRUE(path.normalize());
        EXPECT_EQ(path.str(), wanted);
    }
    for (auto const* const relative : {L"C:f", L"f\\..\\g", L""})
        EXPECT_FALSE(MORVA::UTILS::Path(relative).normalize());
}
