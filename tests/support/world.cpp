#include "tests/support/world.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <system_error>
#include <thread>

#include "tests/support/private_mounts.h"
#include "tests/support/server_world.h"

namespace support {
namespace {

namespace fs = std::filesystem;

/// A checkout below /tmp is mounted there again: what is mounted is busy, and
/// nothing behind it is touched.
void empty(const fs::path& folder) {
  for (const auto& entry : fs::directory_iterator(folder)) {
    std::error_code error;
    fs::remove(entry.path(), error);
    if (error != std::errc::directory_not_empty) continue;
    empty(entry.path());
    fs::remove(entry.path(), error);
  }
}

int collectRow(void* rows, int count, char** values, char** columns) {
  Row row;
  for (int i = 0; i < count; ++i) row[columns[i]] = values[i] != nullptr ? values[i] : "<NULL>";
  static_cast<std::vector<Row>*>(rows)->push_back(row);
  return 0;
}

}  // namespace

void World::SetUp() {
  requirePrivateMounts();
  empty(kStateDir);
  empty("/tmp");
  Clock::release();
  Platform::release();
  FakeIds::release();
  SystemLog::clear();
  ::unsetenv("REMOTE_ADDR");
  if (isOnServer()) chooseServer();
}

void World::TearDown() {
  Clock::release();
  Platform::release();
  FakeIds::release();
}

void World::writeFile(const std::string& path, const std::string& text) {
  std::ofstream(path, std::ios::binary) << text;
}

std::string World::readFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

void World::writeSettings(const std::string& text) {
  writeFile(kSettings, text);
}

void World::inFreshThread(const std::function<void()>& body) {
  std::thread(body).join();
}

void World::withDiagnostics(int level, const std::function<void()>& body,
                            const std::string& otherSettings) {
  writeFile(kFlagFile, "");
  writeSettings("{\"log_level\": " + std::to_string(level) +
                (otherSettings.empty() ? "" : ", " + otherSettings) + "}");
  inFreshThread(body);
}

std::vector<Row> World::sql(const std::string& statement) {
  std::vector<Row> rows;
  sqlite3* db = nullptr;
  char* error = nullptr;
  const StoreCalls store = storeCalls();
  store.open(kDatabase, &db);
  EXPECT_EQ(store.exec(db, statement.c_str(), collectRow, &rows, &error), SQLITE_OK)
      << statement << ": " << (error != nullptr ? error : "");
  store.free(error);
  store.close(db);
  return rows;
}

std::string World::sqlText(const std::string& statement) {
  const std::vector<Row> rows = sql(statement);
  return rows.empty() ? "" : rows.front().begin()->second;
}

}  // namespace support
