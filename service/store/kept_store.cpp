#include "service/store/kept_store.h"

#include <sys/stat.h>

#include "utils/oauth_names.h"

namespace keldoauth::service {
namespace {

/// Who replaces the file faster than this is somebody else's affair.
constexpr int kTries = 5;

}  // namespace

KeptStore::FileId KeptStore::FileId::current() {
  struct stat status {};
  if (stat(KELDOAUTHSERVER::names::kDatabaseFile, &status) != 0) return {};
  return {status.st_dev, status.st_ino};
}

grants::Grants& KeptStore::open() {
  if (isOpen_) return *store_;
  if (store_ && !(file_ == FileId::current())) drop();
  if (!store_) construct();
  isOpen_ = true;
  return *store_;
}

/// What was opened is the file that had the name before and has it after that;
/// the first store makes the file.
void KeptStore::construct() {
  for (int i = 0; i < kTries; ++i) {
    store_.reset();
    const FileId before = FileId::current();
    store_.emplace();
    file_ = FileId::current();
    if (file_ == before) return;
  }
}

bool KeptStore::wasReplaced() const {
  return isOpen_ && store_ && !(file_ == FileId::current());
}

void KeptStore::drop() {
  store_.reset();
  isOpen_ = false;
}

}  // namespace keldoauth::service
