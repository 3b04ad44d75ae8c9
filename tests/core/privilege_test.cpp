#include <cerrno>
#include <utility>

#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::FakeIds;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

using Texts = std::vector<std::string>;

constexpr int kRefused = 35;   // LOG_AUTH | LOG_ERR
constexpr int kSwitched = 38;  // LOG_AUTH | LOG_INFO

constexpr int kUser = 1000;
constexpr int kGroup = 100;

const Line kGroupRaised{kSwitched, "WARNING: set%s(%d, %d, %d)", "WARNING: setresgid(-1, 0, -1)"};
const Line kUserRaised{kSwitched, "WARNING: set%s(%d, %d, %d)", "WARNING: setresuid(-1, 0, -1)"};
const Line kNotEntered{kRefused, "ERROR: ENTERCriticalSection", "ERROR: ENTERCriticalSection"};
const Line kNotLeft{kRefused, "ERROR: LEAVECriticalSection", "ERROR: LEAVECriticalSection"};

Line refused(const std::string& call, const std::string& reason) {
  return {kRefused, "ERROR: set%s(%d, %d, %d) [%s]", "ERROR: " + call + " [" + reason + "]"};
}

std::string setGroup(int id) {
  return "setresgid(-1, " + std::to_string(id) + ", -1)";
}
std::string setUser(int id) {
  return "setresuid(-1, " + std::to_string(id) + ", -1)";
}

// Ids that exist only here ----------------------------------------------------

struct Ids {
  int user;
  int group;
};
bool operator==(const Ids& a, const Ids& b) {
  return a.user == b.user && a.group == b.group;
}
std::ostream& operator<<(std::ostream& out, const Ids& ids) {
  return out << ids.user << ':' << ids.group;
}

/// How one switch there and back goes.
struct Scenario {
  explicit Scenario(const char* itsName) : name(itsName) {}

  Scenario& from(Ids ids) {
    start = inside = after = ids;
    return *this;
  }
  /// These switches, counted from 1, fail with `error`.
  Scenario& refuses(std::vector<int> which, int error) {
    refusedCalls = std::move(which);
    refusal = error;
    return *this;
  }
  Scenario& calls(Texts inOrder) {
    expectedCalls = std::move(inOrder);
    return *this;
  }
  Scenario& writes(std::vector<Line> inOrder) {
    expectedLines = std::move(inOrder);
    return *this;
  }
  /// While the file is opened or closed, then at the end.
  Scenario& has(Ids ids, int error) {
    inside = ids;
    errnoInside = error;
    return *this;
  }
  Scenario& ends(Ids ids, int error) {
    after = ids;
    errnoAfter = error;
    return *this;
  }

  std::string name;
  Ids start{};
  std::vector<int> refusedCalls;
  int refusal = 0;
  Texts expectedCalls;
  std::vector<Line> expectedLines;
  Ids inside{};
  int errnoInside = 0;
  Ids after{};
  int errnoAfter = 0;
};

void PrintTo(const Scenario& scenario, std::ostream* out) {
  *out << scenario.name;
}

constexpr Ids kRoot{0, 0};
constexpr Ids kService{kUser, kGroup};

constexpr char kNotPermitted[] = "Operation not permitted";
constexpr char kUnavailable[] = "Resource temporarily unavailable";

const Scenario kScenarios[] = {
    Scenario("RootAlready").from(kRoot),

    Scenario("BothDiffer")
        .from(kService)
        .calls({setGroup(0), setUser(0), setUser(0), setGroup(kGroup), setUser(kUser)})
        .writes({kGroupRaised, kUserRaised, kUserRaised})
        .has(kRoot, 0)
        .ends(kService, 0),

    Scenario("GroupDiffers")
        .from({0, kGroup})
        .calls({setGroup(0), setGroup(kGroup)})
        .writes({kGroupRaised})
        .has(kRoot, 0)
        .ends({0, kGroup}, 0),

    Scenario("UserDiffers")
        .from({kUser, 0})
        .calls({setUser(0), setUser(0), setUser(kUser)})
        .writes({kUserRaised, kUserRaised})
        .has(kRoot, 0)
        .ends({kUser, 0}, 0),

    Scenario("GroupRefused")
        .from(kService)
        .refuses({1}, EPERM)
        .calls({setGroup(0)})
        .writes({refused(setGroup(0), kNotPermitted), kNotEntered})
        .has(kService, 1)
        .ends(kService, 0),

    Scenario("GroupAloneRefused")
        .from({0, kGroup})
        .refuses({1}, EINVAL)
        .calls({setGroup(0)})
        .writes({refused(setGroup(0), "Invalid argument"), kNotEntered})
        .has({0, kGroup}, 1)
        .ends({0, kGroup}, 0),

    Scenario("UserRefused")
        .from(kService)
        .refuses({2}, EAGAIN)
        .calls({setGroup(0), setUser(0), setGroup(kGroup)})
        .writes({kGroupRaised, refused(setUser(0), kUnavailable), kNotEntered})
        .has({kUser, 0}, 1)
        .ends(kService, 0),

    Scenario("UserAloneRefused")
        .from({kUser, 0})
        .refuses({1}, EPERM)
        .calls({setUser(0)})
        .writes({refused(setUser(0), kNotPermitted), kNotEntered})
        .has({kUser, 0}, 1)
        .ends({kUser, 0}, 0),

    Scenario("RestoreRefusedAtOnce")
        .from(kService)
        .refuses({3}, EPERM)
        .calls({setGroup(0), setUser(0), setUser(0)})
        .writes({kGroupRaised, kUserRaised, refused(setUser(0), kNotPermitted), kNotLeft})
        .has(kRoot, 0)
        .ends(kRoot, 1),

    Scenario("RestoreOfTheGroupRefused")
        .from(kService)
        .refuses({4}, EPERM)
        .calls({setGroup(0), setUser(0), setUser(0), setGroup(kGroup)})
        .writes({kGroupRaised, kUserRaised, kUserRaised, refused(setGroup(kGroup), kNotPermitted),
                 kNotLeft})
        .has(kRoot, 0)
        .ends(kRoot, 1),

    Scenario("RestoreOfTheUserRefused")
        .from(kService)
        .refuses({5}, EAGAIN)
        .calls({setGroup(0), setUser(0), setUser(0), setGroup(kGroup), setUser(kUser)})
        .writes({kGroupRaised, kUserRaised, kUserRaised, refused(setUser(kUser), kUnavailable),
                 kNotLeft})
        .has(kRoot, 0)
        .ends({0, kGroup}, 1),

    Scenario("RestoreOfTheGroupAloneRefused")
        .from({0, kGroup})
        .refuses({2}, EPERM)
        .calls({setGroup(0), setGroup(kGroup)})
        .writes({kGroupRaised, refused(setGroup(kGroup), kNotPermitted), kNotLeft})
        .has(kRoot, 0)
        .ends(kRoot, 1),

    Scenario("RestoreOfTheUserAloneRefused")
        .from({kUser, 0})
        .refuses({3}, EPERM)
        .calls({setUser(0), setUser(0), setUser(kUser)})
        .writes({kUserRaised, kUserRaised, refused(setUser(kUser), kNotPermitted), kNotLeft})
        .has(kRoot, 0)
        .ends(kRoot, 1),

    Scenario("RefusedThereAndBack")
        .from(kService)
        .refuses({2, 3}, EPERM)
        .calls({setGroup(0), setUser(0), setGroup(kGroup)})
        .writes({kGroupRaised, refused(setUser(0), kNotPermitted), kNotEntered,
                 refused(setGroup(kGroup), kNotPermitted), kNotLeft})
        .has({kUser, 0}, 1)
        .ends({kUser, 0}, 1),
};

Ids fakeIds() {
  return {FakeIds::euid(), FakeIds::egid()};
}

class PrivilegeTest : public CoreTest, public ::testing::WithParamInterface<Scenario> {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    { const OAUTHDBBasic store; }  // the file is there
    SystemLog::clear();
  }

  static void play() {
    FakeIds::use(GetParam().start.user, GetParam().start.group);
    for (const int call : GetParam().refusedCalls) FakeIds::refuseCall(call, GetParam().refusal);
  }

  /// To be called where the file is opened or closed.
  void lookInside(int error) {
    errnoInside = error;
    idsInside = fakeIds();
  }

  void expectScenario() const {
    EXPECT_EQ(FakeIds::calls(), GetParam().expectedCalls);
    EXPECT_EQ(lines(), GetParam().expectedLines);
    EXPECT_EQ(errnoInside, GetParam().errnoInside);
    EXPECT_EQ(idsInside, GetParam().inside);
    EXPECT_EQ(fakeIds(), GetParam().after);
    for (const support::LogLine& line : SystemLog::lines()) {
      if (line.message() != kNotEntered.message && line.message() != kNotLeft.message) continue;
      EXPECT_EQ(line.error, 1) << line.text;
    }
  }

  int errnoInside = -1;
  Ids idsInside{};
};

TEST_P(PrivilegeTest, AroundOpening) {
  play();
  Engine::onOpen([this](int error) { lookInside(error); });
  const OAUTHDBBasic store;
  expectScenario();
  FakeIds::use(0, 0);
}

TEST_P(PrivilegeTest, AroundClosing) {
  std::optional<OAUTHDBBasic> store(std::in_place);
  play();
  Engine::onClose([this](int error) { lookInside(error); });
  errno = 77;
  store.reset();
  EXPECT_EQ(errno, GetParam().errnoAfter);
  expectScenario();
}

TEST_P(PrivilegeTest, OpenIsAttemptedAllTheSame) {
  play();
  OAUTHDBBasic store;
  FakeIds::use(0, 0);
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  expectNoError(store);
}

INSTANTIATE_TEST_SUITE_P(Core, PrivilegeTest, ::testing::ValuesIn(kScenarios), support::CaseName());

class PrivilegeScopeTest : public CoreTest {};

TEST_F(PrivilegeScopeTest, OnlyOpeningAndClosingRunRaised) {
  FakeIds::use(kUser, kGroup);
  Ids idsInStatements{};
  Engine::onExec([&](const std::string& /*sql*/) { idsInStatements = fakeIds(); });
  Table store("oauth_log");
  EXPECT_EQ(idsInStatements, kService);

  const std::size_t calls = FakeIds::calls().size();
  Json::Value row = json("{'msg': 'a', 'timestamp': null}");
  store.DBAdd(row);
  Json::Value request;
  store.DBGet(request, &row);
  store.DBInit();
  store.DBDel(request);
  store.DBCheckRowMax(1);
  store.DBDrop();
  EXPECT_EQ(FakeIds::calls().size(), calls);
}

TEST_F(PrivilegeScopeTest, LinesDoNotDependOnTheSwitches) {
  FakeIds::use(kUser, kGroup);
  { const OAUTHDBBasic store; }
  const std::vector<Line> silent = lines();
  FakeIds::use(kUser, kGroup);
  const std::vector<Line> gated = tracedLines(4, [] { const OAUTHDBBasic store; });
  EXPECT_THAT(silent, ElementsAre(kGroupRaised, kUserRaised, kUserRaised, kGroupRaised, kUserRaised,
                                  kUserRaised));
  EXPECT_EQ(gated, silent);
}

TEST_F(PrivilegeScopeTest, IdsThatChangedInsideArePutBackToRoot) {
  FakeIds::use(0, 0);
  Engine::onOpen([](int /*error*/) { FakeIds::use(kUser, kGroup); });
  const OAUTHDBBasic store;
  EXPECT_EQ(FakeIds::calls(), (Texts{setUser(0), setGroup(0), setUser(0)}));
  EXPECT_EQ(fakeIds(), kRoot);
  EXPECT_THAT(lines(), ElementsAre(kUserRaised, kGroupRaised, kUserRaised));
}

TEST_F(PrivilegeScopeTest, FailedOpenIsLoggedAfterTheSwitchBack) {
  hideFolder();
  FakeIds::use(kUser, kGroup);
  const OAUTHDBBasic store;
  EXPECT_EQ(fakeIds(), kService);
  EXPECT_THAT(lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised,
                                   Line{kError, "Open DB failed!![%d]", "Open DB failed!![14]"}));
}

TEST_F(PrivilegeScopeTest, ObjectWithoutConnectionIsDestroyedWithoutASwitch) {
  hideFolder();
  std::optional<OAUTHDBBasic> store(std::in_place);
  SystemLog::clear();
  FakeIds::use(kUser, kGroup);
  store.reset();
  EXPECT_THAT(FakeIds::calls(), IsEmpty());
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(PrivilegeScopeTest, FailedCloseIsLoggedAfterTheSwitchBack) {
  std::optional<OAUTHDBBasic> store(std::in_place);
  FakeIds::use(kUser, 0);
  Engine::answerClose(5);
  store.reset();
  EXPECT_THAT(lines(), ElementsAre(kUserRaised, kUserRaised,
                                   Line{kError, "Close DB failed!![%d]", "Close DB failed!![5]"}));
}

}  // namespace
