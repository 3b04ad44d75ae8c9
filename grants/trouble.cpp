#include "grants/trouble.h"

#include <utility>

#include "core/oauth_errors.h"

namespace KELDOAUTHSERVER::grants {
namespace {

/// SQLite's result codes, as they arrive from the stores.
enum Sqlite : int {
  kReadOnly = 8,
  kIoError = 10,
  kCorrupt = 11,
  kDiskFull = 13,
  kCannotOpen = 14,
  kNoMemory = 7,
  kLockedTable = 6,
  kNoDatabase = 26,
};

}  // namespace

Trouble::Trouble(int code, std::string text) : code_(code), text_(std::move(text)) {}

Trouble::Kind Trouble::kind() const noexcept {
  switch (code_) {
    case errors::kBusy:
    case kLockedTable:
      return Kind::kLocked;
    case errors::kTokenFull.code:
      return Kind::kFull;
    case kReadOnly:
    case kIoError:
    case kCorrupt:
    case kDiskFull:
    case kNoDatabase:
      return Kind::kMedium;
    case errors::kNone.code:
    case errors::kCreateTableFailed.code:
    case kCannotOpen:
      return Kind::kNotReady;
    case errors::kEncryptFailed.code:
      return Kind::kCipher;
    case kNoMemory:
      return Kind::kMemory;
    default:
      return Kind::kOther;
  }
}

bool Trouble::canTryAgain() const noexcept {
  return kind() == Kind::kLocked || kind() == Kind::kMemory;
}

}  // namespace KELDOAUTHSERVER::grants
