// A medium that holds writes back until they are synced, and whose power can be
// cut: what was not synced by then is on it, missing or torn.

#ifndef KELDOAUTH_TESTS_FAULTS_WRITE_BACK_DISK_H
#define KELDOAUTH_TESTS_FAULTS_WRITE_BACK_DISK_H

#include <sys/types.h>

#include <cstdint>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "tests/faults/faulty_vfs.h"

namespace faults {

/// Watches a database and its journal. A change is one creation, write,
/// truncation, sync or removal. The name of a file that was created may be
/// missing, and one that was removed may be back, until the folder is synced.
class WriteBackDisk : public Medium {
 public:
  WriteBackDisk(const std::string& database, unsigned seed);

  /// Power goes while the `change`-th change from now on (1 is the next) is
  /// under way: that one may still reach the medium, in part or not at all.
  /// Every call from then on fails.
  void cutAt(int change);

  /// Power goes now.
  void cut();

  [[nodiscard]] bool isOut() const { return isOut_; }

  /// Puts what the medium holds in place of the files. For when the power is
  /// out and no connection is open.
  void restoreFiles() const;

  int permit(Call call) override;
  int created(const std::string& path) override;
  int wrote(const std::string& path, std::int64_t offset, const std::string& bytes) override;
  int truncated(const std::string& path, std::int64_t size) override;
  int synced(const std::string& path, bool folder) override;
  int removed(const std::string& path, bool folder) override;

 private:
  struct Change {
    bool truncates;
    std::size_t offset;
    std::string bytes;
  };
  struct Content {
    std::string onMedium;
    std::vector<Change> cached;
    mode_t mode;
  };
  using Entry = std::pair<std::string, std::shared_ptr<Content>>;  // null: no such file
  using Entries = std::map<std::string, std::shared_ptr<Content>>;

  enum class Fate { kKept, kDropped, kTorn, kTrashed };

  void load(const std::string& path);
  void cache(const std::string& path, Change change);
  void enter(const Entry& entry);
  void writeFolder(std::size_t entries);
  bool isCutNow();
  void settle(Content& content);
  void settleWrite(std::string& bytes, const Change& change);
  Fate drawFate();
  unsigned draw(unsigned below);

  std::vector<std::string> paths_;
  Entries seen_;      // by SQLite
  Entries onMedium_;  // after the power is back
  std::vector<Entry> cachedEntries_;
  std::mt19937 random_;
  unsigned mood_ = 0;
  int changesLeft_ = -1;  // below 0: never cut
  bool isOut_ = false;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_WRITE_BACK_DISK_H
