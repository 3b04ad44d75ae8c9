// What is asked of the core without a statement, while memory runs out.

#include <array>

#include "tests/core/core_test.h"
#include "tests/support/allocations.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class MemoryAloneTest : public CoreTest {};

TEST_F(MemoryAloneTest, NameOfTheTableIsEmpty) {
  const Table store("a table with a name of more than fifteen bytes");
  std::string name = "untouched";
  EXPECT_EQ(support::failEachAllocation([&] { name = store.GetTabName(); },
                                        [&](int /*nth*/) { EXPECT_EQ(name, ""); }),
            1);
  EXPECT_EQ(name, "a table with a name of more than fifteen bytes");
}

TEST_F(MemoryAloneTest, CallbackThatSomebodyCallsByHimselfSaysSo) {
  char value[] = "a value of more than fifteen bytes";
  char column[] = "a column of more than fifteen bytes";
  std::array<char*, 1> values{value};
  std::array<char*, 1> columns{column};
  Json::Value rows;
  int refused = -1;
  const int failed = support::failEachAllocation(
      [&] { refused = OAUTHDBBasic::TabGetCallback(&rows, 1, values.data(), columns.data()); },
      [&](int nth) {
        EXPECT_EQ(refused, 0) << "allocation " << nth;
        EXPECT_THAT(messages(), ElementsAre("Unexpected failure[std::bad_alloc]"))
            << "allocation " << nth;
        SystemLog::clear();
        rows = Json::Value();
      });
  EXPECT_GT(failed, 1);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
  EXPECT_EQ(rows.size(), 1U);
}

}  // namespace
