#include "tests/faults/write_back_disk.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iterator>

namespace faults {
namespace {

constexpr std::size_t kSector = 512;

mode_t modeOf(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 ? status.st_mode & 0777U : 0;
}

void apply(std::string& bytes, std::size_t offset, const std::string& piece) {
  if (bytes.size() < offset + piece.size()) bytes.resize(offset + piece.size(), '\0');
  bytes.replace(offset, piece.size(), piece);
}

}  // namespace

WriteBackDisk::WriteBackDisk(const std::string& database, unsigned seed)
    : paths_{database, database + "-journal"}, random_(seed) {
  for (const std::string& path : paths_) load(path);
  onMedium_ = seen_;
}

void WriteBackDisk::load(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) return;
  const std::string bytes{std::istreambuf_iterator<char>(file), {}};
  seen_[path] = std::make_shared<Content>(Content{bytes, {}, modeOf(path)});
}

void WriteBackDisk::cutAt(int change) {
  changesLeft_ = change;
}

/// Names reach a medium in the order in which they changed: file systems keep
/// a journal of them.
void WriteBackDisk::cut() {
  mood_ = draw(5);
  writeFolder(draw(static_cast<unsigned>(cachedEntries_.size()) + 1));
  for (auto& [path, content] : onMedium_) settle(*content);
  isOut_ = true;
}

void WriteBackDisk::restoreFiles() const {
  for (const std::string& path : paths_) unlink(path.c_str());
  for (const auto& [path, content] : onMedium_) {
    std::ofstream(path, std::ios::binary) << content->onMedium;
    chmod(path.c_str(), content->mode);
  }
}

// What SQLite does ------------------------------------------------------------

int WriteBackDisk::permit(Call call) {
  return isOut_ ? errorOf(call) : SQLITE_OK;
}

int WriteBackDisk::created(const std::string& path) {
  if (path.empty()) return SQLITE_OK;
  enter({path, std::make_shared<Content>(Content{{}, {}, modeOf(path)})});
  return isCutNow() ? SQLITE_CANTOPEN : SQLITE_OK;
}

int WriteBackDisk::wrote(const std::string& path, std::int64_t offset, const std::string& bytes) {
  cache(path, {false, static_cast<std::size_t>(offset), bytes});
  return isCutNow() ? SQLITE_IOERR_WRITE : SQLITE_OK;
}

int WriteBackDisk::truncated(const std::string& path, std::int64_t size) {
  cache(path, {true, static_cast<std::size_t>(size), {}});
  return isCutNow() ? SQLITE_IOERR_TRUNCATE : SQLITE_OK;
}

int WriteBackDisk::synced(const std::string& path, bool folder) {
  if (isCutNow()) return SQLITE_IOERR_FSYNC;
  const auto file = seen_.find(path);
  if (file != seen_.end()) {
    mood_ = 0;
    settle(*file->second);
  }
  if (folder) writeFolder(cachedEntries_.size());
  return SQLITE_OK;
}

int WriteBackDisk::removed(const std::string& path, bool folder) {
  if (path.empty()) return SQLITE_OK;
  enter({path, nullptr});
  if (isCutNow()) return SQLITE_IOERR_DELETE;
  if (folder) writeFolder(cachedEntries_.size());
  return SQLITE_OK;
}

// The cache -------------------------------------------------------------------

void WriteBackDisk::cache(const std::string& path, Change change) {
  const auto file = seen_.find(path);
  if (file != seen_.end()) file->second->cached.push_back(std::move(change));
}

void WriteBackDisk::enter(const Entry& entry) {
  if (entry.second != nullptr) {
    seen_[entry.first] = entry.second;
  } else {
    seen_.erase(entry.first);
  }
  cachedEntries_.push_back(entry);
}

/// The first `entries` of the cached ones reach the medium.
void WriteBackDisk::writeFolder(std::size_t entries) {
  const auto end = cachedEntries_.begin() + static_cast<std::ptrdiff_t>(entries);
  for (auto entry = cachedEntries_.begin(); entry != end; ++entry) {
    if (entry->second != nullptr) {
      onMedium_[entry->first] = entry->second;
    } else {
      onMedium_.erase(entry->first);
    }
  }
  cachedEntries_.erase(cachedEntries_.begin(), end);
}

bool WriteBackDisk::isCutNow() {
  if (changesLeft_ > 0 && --changesLeft_ == 0) cut();
  return isOut_;
}

/// Decides what becomes of the cached changes of a file.
void WriteBackDisk::settle(Content& content) {
  for (const Change& change : content.cached) {
    if (!change.truncates) {
      settleWrite(content.onMedium, change);
    } else if (drawFate() == Fate::kKept) {
      content.onMedium.resize(change.offset, '\0');
    }
  }
  content.cached.clear();
}

void WriteBackDisk::settleWrite(std::string& bytes, const Change& change) {
  std::size_t done = 0;
  while (done < change.bytes.size()) {
    const std::size_t offset = change.offset + done;
    const std::size_t room = kSector - offset % kSector;
    std::string piece = change.bytes.substr(done, room);
    done += piece.size();

    const Fate fate = drawFate();
    if (fate == Fate::kDropped) continue;
    if (fate == Fate::kTorn) piece.resize(draw(static_cast<unsigned>(piece.size()) + 1));
    if (fate == Fate::kTrashed) {
      std::generate(piece.begin(), piece.end(), [this] { return static_cast<char>(draw(256)); });
    }
    apply(bytes, offset, piece);
  }
}

/// Two moods in five settle everything alike; the others sector by sector.
WriteBackDisk::Fate WriteBackDisk::drawFate() {
  if (mood_ == 0) return Fate::kKept;
  if (mood_ == 1) return Fate::kDropped;
  return static_cast<Fate>(draw(4));
}

unsigned WriteBackDisk::draw(unsigned below) {
  return static_cast<unsigned>(random_() % below);
}

}  // namespace faults
