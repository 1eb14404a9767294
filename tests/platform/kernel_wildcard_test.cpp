// The FindFirstFileA name matcher against one set of names, pattern by pattern.
#include <gtest/gtest.h>

#include <set>
#include <string>
#include <vector>

#include "kernel/wildcard.h"

namespace {

const std::vector<std::string> kNames = {"a.icc", "B.ICM", "h.iCc", "e.icx", "c.ic",  ".icc",
                                         "x.y.icm", "d.ic.bak", "icc", "f.txt", "g",  "x.pf"};

struct Case {
  const char* pattern;
  std::set<std::string> matches;
};

TEST(FileWildcard, MatchesExactlyTheExpectedNames) {
  const std::set<std::string> all(kNames.begin(), kNames.end());
  const std::set<std::string> icc = {"a.icc", "B.ICM", "h.iCc", "e.icx", "c.ic", ".icc", "x.y.icm"};
  const Case cases[] = {
      {"*.ic*", icc},
      {"*.IC*", icc},
      {"*.*", all},
      {"*", all},
      // "?" may match nothing at a dot or at the end.
      {"?.ic?", {"a.icc", "B.ICM", "h.iCc", "e.icx", "c.ic", ".icc"}},
      {"??", {"g"}},
      // "*." keeps the names without a dot.
      {"*.", {"icc", "g"}},
      {"a*.*", {"a.icc"}},
      {"A*.*", {"a.icc"}},
      // The "*" before a dot stops at the last dot only.
      {"*.ic", {"c.ic"}},
      {"*.bak", {"d.ic.bak"}},
      {"*.icm", {"B.ICM", "x.y.icm"}},
      {"*.icc", {"a.icc", "h.iCc", ".icc"}},
      // A plain "*" runs over dots.
      {"*c", {"a.icc", "h.iCc", "c.ic", ".icc", "icc"}},
      // ".*" also matches the end of a name without a dot.
      {"g.*", {"g"}},
      {"x.*", {"x.y.icm", "x.pf"}},
      {"g.", {"g"}},
      {"D.IC.BAK", {"d.ic.bak"}},
      {"", {}},
  };
  for (const Case& c : cases) {
    for (const std::string& name : kNames) {
      EXPECT_EQ(win32::MatchesFileWildcard(c.pattern, name), c.matches.count(name) == 1)
          << "pattern \"" << c.pattern << "\", name \"" << name << "\"";
    }
  }
}

}  // namespace
