#include "tests/faults/scene.h"

#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <set>

#include "tests/faults/faulty_vfs.h"
#include "utils/oauth_names.h"

namespace faults {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;

namespace {

constexpr char kCopy[] = "/tmp/copy.db";
constexpr char kCopyJournal[] = "/tmp/copy.db-journal";

/// Columns that hold what an operation draws for itself.
const std::set<std::string> kDrawn{names::kClientId, names::kClientSecret, names::kCode,
                                   names::kAccessToken, names::kRefreshToken};

// Reading a database ----------------------------------------------------------

/// Leaves apart what is empty, in clear or encrypted.
void hide(std::string& value) {
  if (!value.empty() && value != "<>") value = "drawn";
}

struct Reading {
  bool hideDrawn;
  std::vector<std::string> rows;
};

int collect(void* argument, int count, char** values, char** columns) {
  auto& reading = *static_cast<Reading*>(argument);
  std::string row;
  for (int i = 0; i < count; ++i) {
    std::string value = values[i] != nullptr ? values[i] : "NULL";
    if (reading.hideDrawn && kDrawn.count(columns[i]) > 0) hide(value);
    row += value + '|';
  }
  reading.rows.push_back(row);
  return 0;
}

std::vector<std::string> read(sqlite3* db, const std::string& sql, bool hideDrawn = false) {
  Reading reading{hideDrawn, {}};
  const int result = sqlite3_exec(db, sql.c_str(), collect, &reading, nullptr);
  if (result != SQLITE_OK) reading.rows.push_back(sqlite3_errmsg(db));
  return reading.rows;
}

std::string joined(const std::vector<std::string>& lines) {
  std::string text;
  for (const std::string& line : lines) text += line + '\n';
  return text;
}

Inspection inspectFile(const char* path, bool hideDrawn) {
  sqlite3* db = nullptr;
  sqlite3_open_v2(path, &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, FaultyVfs::kPlain);
  Inspection found;
  for (const std::string& line :
       read(db, "SELECT name FROM sqlite_master WHERE type = 'table' ORDER BY name")) {
    const std::string table = line.substr(0, line.size() - 1);
    found.state[table] = joined(read(db, "SELECT * FROM " + table + " ORDER BY rowid", hideDrawn));
  }
  found.integrity = joined(read(db, "PRAGMA integrity_check"));
  sqlite3_close(db);
  return found;
}

void copyIfThere(const char* from, const char* to) {
  fs::remove(to);
  if (fs::exists(from)) fs::copy_file(from, to);
}

/// Takes a picture of the file each time that a transaction has ended.
class Watcher : public Medium {
 public:
  Watcher(bool hideDrawn, std::vector<State>& states) : hideDrawn_(hideDrawn), states_(states) {}

  int permit(Call /*call*/) override { return SQLITE_OK; }

  int removed(const std::string& /*path*/, bool /*folder*/) override {
    fs::remove(kCopyJournal);
    copyIfThere(names::kDatabaseFile, kCopy);
    const State state = inspectFile(kCopy, hideDrawn_).state;
    if (state != states_.back()) states_.push_back(state);
    return SQLITE_OK;
  }

 private:
  bool hideDrawn_;
  std::vector<State>& states_;
};

mode_t modeOf(const char* path) {
  struct stat status {};
  return stat(path, &status) == 0 ? status.st_mode & 0777U : 0;
}

}  // namespace

void Scene::SetUp() {
  World::SetUp();
  umask_ = umask(0);
}

void Scene::TearDown() {
  umask(umask_);
  World::TearDown();
}

void Scene::study(const Operation& operation) {
  operation_ = operation;
  support::Platform::useReadableCipher();
  furnish(operation.household);
  for (const char* path : {kDatabase, kJournal}) {
    if (fs::exists(path)) files_[path] = readFile(path);
  }
  states_ = {inspect().state};

  Watcher watcher(operation.draws, states_);
  const FaultyVfs vfs(watcher);
  const auto store = operation.open();
  answer_ = operation.isConstruction() ? Answer{isReady(*store), ""} : operation.run(*store);
  ASSERT_TRUE(answer_.success);
  ASSERT_EQ(static_cast<int>(states_.size()) - 1, operation.units);
  ASSERT_EQ(store->GetErrCode(), 255);
}

void Scene::reset() {
  for (const char* path : {kDatabase, kJournal}) fs::remove(path);
  for (const auto& [path, bytes] : files_) {
    writeFile(path, bytes);
    chmod(path.c_str(), S_IRUSR | S_IWUSR);
  }
  support::Platform::release();
  support::Platform::useReadableCipher();
  support::Clock::setTo(kNow);
  support::SystemLog::clear();
}

Inspection Scene::inspect() const {
  copyIfThere(kDatabase, kCopy);
  copyIfThere(kJournal, kCopyJournal);
  return inspectFile(kCopy, operation_.draws);
}

int Scene::indexOf(const State& state) const {
  for (int i = static_cast<int>(states_.size()) - 1; i >= 0; --i) {
    if (states_[static_cast<std::size_t>(i)] == state) return i;
  }
  return -1;
}

void Scene::expectPrivate() {
  for (const char* path : {kDatabase, kJournal}) {
    EXPECT_EQ(modeOf(path) & (S_IRWXG | S_IRWXO), 0U) << path;
  }
}

void Scene::expectNoHotJournal() {
  const std::string journal = readFile(kJournal);
  EXPECT_TRUE(journal.empty() || journal.front() == '\0');
}

}  // namespace faults
