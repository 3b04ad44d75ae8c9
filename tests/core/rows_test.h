// What the cases of the row operations share.

#ifndef KELDOAUTH_TESTS_CORE_ROWS_TEST_H
#define KELDOAUTH_TESTS_CORE_ROWS_TEST_H

#include <optional>
#include <string>

#include "tests/core/core_test.h"

namespace core_tests {

inline const Json::Value kEmptyArray(Json::arrayValue);

inline Line failed(const std::string& what, const std::string& table) {
  return {kError, what + " failed[%s]", what + " failed[" + table + "]"};
}

/// A new client in clear.
inline Json::Value client(const std::string& id) {
  Json::Value row = json("{'enable': '1', 'redirect_uri': 'https://a', 'scope': 'read'}");
  row["client_id"] = id;
  row["client_secret"] = "secret of " + id;
  row["display_name"] = "app " + id;
  return row;
}

class RowsTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    clients.emplace("oauth_clientInfo");
    logs.emplace("oauth_log");
  }

  void addClient(const std::string& id) {
    Json::Value row = client(id);
    ASSERT_TRUE(clients->DBAdd(row));
  }

  static std::string ids(const Json::Value& rows) {
    std::string all;
    for (const Json::Value& row : rows) all += row["client_id"].asString() + ' ';
    return all;
  }
  static std::string storedIds() {
    return sqlText(
        "SELECT group_concat(client_id) FROM (SELECT * FROM oauth_clientInfo ORDER BY id)");
  }

  std::optional<Table> clients;
  std::optional<Table> logs;
};

/// With three clients there.
class ThreeClientsTest : public RowsTest {
 protected:
  void SetUp() override {
    RowsTest::SetUp();
    for (const char* id : {"b", "a", "c"}) addClient(id);
  }

  Json::Value request;
  Json::Value rows;
};

}  // namespace core_tests

#endif  // KELDOAUTH_TESTS_CORE_ROWS_TEST_H
