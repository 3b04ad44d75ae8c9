// The floors of the house and the rooms of the command line, as the sources
// include each other: downwards, and never in a circle.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <map>
#include <regex>
#include <set>
#include <string>
#include <vector>

using ::testing::IsEmpty;
using ::testing::IsSupersetOf;

namespace {

using Texts = std::vector<std::string>;
/// What each source includes of the project's own.
using Includes = std::map<std::string, Texts>;

/// A folder, with those in it that are no floor of their own. What stands on the
/// same height does not know of each other.
struct Floor {
  std::string folder;
  int height;
};

const std::vector<Floor>& floors() {
  static const std::vector<Floor> all{{"platform", 0},
                                      {"utils", 1},
                                      {"platform/standin", 2},
                                      {"core", 2},
                                      {"engines/choice", 2},
                                      {"engines/postgresql", 2},
                                      {"stores", 3},
                                      {"grants", 4},
                                      {"examples", 5},
                                      {"service/text", 4},
                                      {"service/http", 5},
                                      {"service/settings", 6},
                                      {"service/store", 7},
                                      {"service/people", 7},
                                      {"service/signing", 7},
                                      {"service", 8},
                                      {"service/program", 9},
                                      {"bench", 5},
                                      {"tools/keldoauth/console", 5},
                                      {"tools/keldoauth/storage", 6},
                                      {"tools/keldoauth/health", 7},
                                      {"tools/keldoauth/commands", 8},
                                      {"tools/keldoauth", 9}};
  return all;
}

/// The floor of a path from the project's root; null for one of none.
const Floor* floorOf(const std::string& path) {
  const Floor* found = nullptr;
  for (const Floor& floor : floors()) {
    const bool isIn = path.rfind(floor.folder + "/", 0) == 0;
    if (isIn && (found == nullptr || floor.folder.size() > found->folder.size())) found = &floor;
  }
  return found;
}

bool mayInclude(const std::string& source, const std::string& included) {
  const Floor* const above = floorOf(source);
  const Floor* const below = floorOf(included);
  if (above == nullptr || below == nullptr) return false;
  return above == below || above->height > below->height;
}

Texts includesOf(const std::filesystem::path& path) {
  static const std::regex kInclude("^#include \"([^\"]+)\".*");
  Texts included;
  std::ifstream file(path);
  std::smatch found;
  for (std::string line; std::getline(file, line);) {
    if (std::regex_match(line, found, kInclude)) included.push_back(found[1]);
  }
  return included;
}

Includes readHouse() {
  Includes house;
  for (const char* root : {"platform", "utils", "core", "engines", "stores", "grants", "examples",
                           "service", "bench", "tools/keldoauth"}) {
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
      const std::string kind = entry.path().extension();
      if (kind == ".h" || kind == ".cpp") house[entry.path()] = includesOf(entry.path());
    }
  }
  return house;
}

/// Looks for a way from a source back to itself.
class CircleFinder {
 public:
  explicit CircleFinder(const Includes& house) : house_(house) {}

  /// The sources on the first circle that is found from `source`.
  Texts from(const std::string& source) {
    const auto on = std::find(way_.begin(), way_.end(), source);
    if (on != way_.end()) return {on, way_.end()};
    if (house_.count(source) == 0 || !seen_.insert(source).second) return {};
    way_.push_back(source);
    for (const std::string& included : house_.at(source)) {
      Texts circle = from(included);
      if (!circle.empty()) return circle;
    }
    way_.pop_back();
    return {};
  }

 private:
  const Includes& house_;
  Texts way_;
  std::set<std::string> seen_;
};

Texts circleIn(const Includes& house) {
  CircleFinder finder(house);
  for (const auto& [source, included] : house) {
    Texts circle = finder.from(source);
    if (!circle.empty()) return circle;
  }
  return {};
}

class FloorsTest : public ::testing::Test {
 protected:
  const Includes house = readHouse();
};

// The rule ------------------------------------------------------------------------

TEST(FloorRuleTest, AllowsOwnAndLowerFloors) {
  EXPECT_TRUE(mayInclude("core/a.cpp", "core/a.h"));
  EXPECT_TRUE(mayInclude("stores/a.cpp", "utils/b.h"));
  EXPECT_TRUE(mayInclude("grants/rows/a.cpp", "grants/b.h"));
  EXPECT_TRUE(mayInclude("tools/keldoauth/health/a.cpp", "tools/keldoauth/console/b.h"));
}

TEST(FloorRuleTest, RefusesHigherFloorsNeighboursAndStrangers) {
  EXPECT_FALSE(mayInclude("utils/a.cpp", "core/b.h"));
  EXPECT_FALSE(mayInclude("stores/a.cpp", "grants/b.h"));
  EXPECT_FALSE(mayInclude("tools/keldoauth/console/a.cpp", "tools/keldoauth/storage/b.h"));
  EXPECT_FALSE(mayInclude("tools/keldoauth/storage/a.cpp", "tools/keldoauth/commands/b.h"));
  EXPECT_FALSE(mayInclude("core/a.cpp", "platform/standin/b.h"));
  EXPECT_FALSE(mayInclude("service/http/a.cpp", "tools/keldoauth/console/b.h"));
  EXPECT_FALSE(mayInclude("service/settings/a.cpp", "service/pages/b.h"));
  EXPECT_FALSE(mayInclude("stores/a.cpp", "tests/support/b.h"));
}

TEST(FloorRuleTest, FindsACircle) {
  const Includes house{{"a", {"b", "x"}}, {"b", {"c"}}, {"c", {"d", "b"}}, {"d", {}}};
  EXPECT_EQ(circleIn(house), (Texts{"b", "c"}));
}

TEST(FloorRuleTest, FindsNoCircleWhereTwoWaysMeet) {
  EXPECT_THAT(circleIn({{"a", {"b", "c"}}, {"b", {"d"}}, {"c", {"d"}}, {"d", {}}}), IsEmpty());
}

// The house -----------------------------------------------------------------------

TEST_F(FloorsTest, AreAllRead) {
  for (const Floor& floor : floors()) {
    const auto isOnIt = [&](const auto& source) { return floorOf(source.first) == &floor; };
    EXPECT_TRUE(std::any_of(house.begin(), house.end(), isOnIt)) << floor.folder;
  }
  EXPECT_THAT(house.at("stores/oauth_log.cpp"),
              IsSupersetOf({"stores/oauth_log.h", "utils/oauth_names.h"}));
}

TEST_F(FloorsTest, IncludeDownwardsOnly) {
  Texts upwards;
  for (const auto& [source, included] : house) {
    for (const std::string& header : included) {
      if (!mayInclude(source, header)) upwards.push_back(source + " includes " + header);
    }
  }
  EXPECT_THAT(upwards, IsEmpty());
}

TEST_F(FloorsTest, HaveNoCircle) {
  EXPECT_THAT(circleIn(house), IsEmpty());
}

}  // namespace
