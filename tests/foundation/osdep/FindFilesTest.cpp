// Wildcard listings: which paths match, in which order, and no match as an
// empty answer.
#include "foundation/osdep/FindFiles.h"

#include <gtest/gtest.h>

#include "foundation/FoundationTestSupport.h"

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>
#include <stdlib.h>

namespace qel::fnd::osdep {
namespace {

using testing::TempDir;


std::vector<std::string> Find(const std::string& pattern) {
    std::vector<std::string> found;
    for (const WString& path : FindFiles(WString(std::wstring(pattern.begin(), pattern.end()).c_str())))
        found.emplace_back(path.begin(), path.end());
    return found;
}

TEST(FindFiles, MatchesComeBackAsFullPathsInSortedOrderOrNotAtAll) {
    TempDir dir;
    for (const char* sub : {"net", "time", "empty"}) std::filesystem::create_directory(dir / sub);
    for (const char* name : {"net/b.binding.xml", "net/a.binding.xml", "net/a.def.xml", "net/.hidden.xml",
                             "net/notes.txt", "time/c.binding.xml", "top.xml"})
        std::ofstream(dir / name) << "x";
    struct { std::string pattern; std::vector<std::string> matches; } cases[] = {
        {"net/*.xml", {"net/a.binding.xml", "net/a.def.xml", "net/b.binding.xml"}},
        {"*/*.binding.xml", {"net/a.binding.xml", "net/b.binding.xml", "time/c.binding.xml"}},
        {"net/?.def.xml", {"net/a.def.xml"}},
        {"net/[b-z].*", {"net/b.binding.xml"}},
        {"net/.*.xml", {"net/.hidden.xml"}},  // hidden files only when named
        {"top.xml", {"top.xml"}},
        {"*", {"empty", "net", "time", "top.xml"}},
        {"empty/*", {}}, {"net/*.json", {}}, {"missing.xml", {}}, {"nowhere/*/x", {}},
    };
    for (const auto& c : cases) {
        std::vector<std::string> expected;
        for (const auto& match : c.matches) expected.push_back(dir / match);
        EXPECT_EQ(Find(dir / c.pattern), expected) << c.pattern;
    }
}

}  // namespace
}  // namespace qel::fnd::osdep
