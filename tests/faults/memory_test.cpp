// Memory runs out at every allocation of every operation, once and for good.

#include <optional>

#include "stores/oauth_token.h"
#include "tests/faults/failing_memory.h"
#include "tests/faults/trials.h"
#include "utils/oauth_names.h"

namespace faults {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBToken;
using support::id64;

struct Source {
  const char* name;
  Memory memory;
};

void PrintTo(const Source& source, std::ostream* out) {
  *out << source.name;
}

const Source kSources[] = {
    {"Sqlite", Memory::kSqlite},
    {"New", Memory::kNew},
    {"Malloc", Memory::kMalloc},
};

using Case = std::tuple<Operation, Source>;

class MemoryTest : public Trials, public ::testing::WithParamInterface<Case> {
 protected:
  static void SetUpTestSuite() { FailingMemory::install(); }

  [[nodiscard]] long blocks() const override { return FailingMemory::blocks(); }
};

TEST_P(MemoryTest, ThatRunsOutIsReportedAndLeavesNothingHalfDone) {
  const auto& [operation, source] = GetParam();
  FailingMemory memory(source.memory);
  study(operation);
  throwEverywhere(memory);
}

INSTANTIATE_TEST_SUITE_P(EveryOperation, MemoryTest,
                         ::testing::Combine(::testing::ValuesIn(everyOperation()),
                                            ::testing::ValuesIn(kSources)),
                         [](const ::testing::TestParamInfo<Case>& row) {
                           return std::get<0>(row.param).name + std::get<1>(row.param).name;
                         });

// SQLite's formatter ----------------------------------------------------------
//
// Where it has no memory, an empty text takes the place of the quoted value. The
// line in the log is all that tells it from a value that was empty.

class LostTextTest : public Scene {
 protected:
  static void SetUpTestSuite() { FailingMemory::install(); }

  void SetUp() override {
    Scene::SetUp();
    support::Platform::useReadableCipher();
    furnish(Household::kComplete);
    tokens_.emplace(names::kTokenTable);
  }

  /// Runs `body` again and again with a later allocation of SQLite's failing,
  /// until that is one for a text.
  template <typename Body>
  static void loseFirstText(Body body) {
    FailingMemory memory(Memory::kSqlite);
    const auto lost = [] { return support::SystemLog::count("Can't transfer to SQL format") > 0; };
    for (int nth = 1; !lost() && nth < 1000; ++nth) {
      memory.arm(nth, false);
      body();
      memory.disarm();
    }
    EXPECT_TRUE(lost());
  }

  static std::string stored(const std::string& column) {
    return sqlText("SELECT " + column + " FROM oauth_token WHERE access_token = '" + id64('9') +
                   "'");
  }

  std::optional<OAUTHDBToken> tokens_;
};

TEST_F(LostTextTest, IsStoredAsAnEmptyValue) {
  Json::Value out;
  bool success = false;
  loseFirstText([&] {
    success = tokens_->Add("user", id64('a'), "read", id64('8'), id64('9'), "1700000600", "code",
                           "state", "", out);
  });
  EXPECT_TRUE(success);
  EXPECT_EQ(stored("username"), "");
  EXPECT_EQ(stored("scope"), "read");
}

TEST_F(LostTextTest, FindsNoRow) {
  Json::Value rows;
  bool success = false;
  loseFirstText([&] { success = tokens_->GetWithAccessToken(id64('2'), &rows); });
  EXPECT_TRUE(success);
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(LostTextTest, MakesAValidTokenReadAsExpired) {
  Json::Value result;
  bool valid = true;
  loseFirstText([&] { valid = tokens_->Verify(id64('2'), result); });
  EXPECT_FALSE(valid);
  EXPECT_EQ(result["err_code"], -3);
  EXPECT_EQ(tokens_->GetErrCode(), 255);
}

}  // namespace
}  // namespace faults
