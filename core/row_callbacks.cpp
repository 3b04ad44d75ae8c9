#include "core/row_callbacks.h"

#include <syslog.h>

#include <algorithm>
#include <array>
#include <utility>

#include "core/log_lines.h"
#include "core/rows.h"
#include "core/secrets.h"
#include "core/unexpected.h"
#include "utils/diagnostics.h"
#include "utils/oauth_names.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

using line::kSource;

void dumpRow(int number, int count, char** values, char** columns) {
  if (!isTraced(kRowDump)) return;
  const int readable = readableColumns(count, values, columns);
  for (int i = 0; i < readable; ++i) {
    syslog(LOG_ERR, "%s:%d ##### [%d][%s = %s]", kSource, number, i, textOf(columns[i]),
           textOf(values[i]));
  }
}

int appendCount(void* arg, int count, char** values, char** /*columns*/) {
  traceEntry(kCoreTrace, kSource, line::kTabCountEntry, "TabCountCallback");
  if (count < 1 || values == nullptr) return 0;
  static_cast<Json::Value*>(arg)->append(textOf(values[0]));
  return 0;
}

int noteTable(void* arg, int count, char** values, char** columns) {
  traceEntry(kCoreTrace, kSource, line::kIsTabExistEntry, "IsTabExistCallback");
  dumpRow(line::kIsTabExistDump, count, values, columns);
  (*static_cast<Json::Value*>(arg))[names::kExist] = true;
  return 0;
}

int appendRow(void* arg, int count, char** values, char** columns) {
  traceEntry(kCoreTrace, kSource, line::kTabGetEntry, "TabGetCallback");
  dumpRow(line::kTabGetDump, count, values, columns);

  Json::Value row = rowDocument(count, values, columns);
  if (!decryptSecrets(kSource, row)) {
    syslog(LOG_ERR, "%s:%d Decrypt data failed", kSource, line::kDecryptDataFailed);
  }
  static_cast<Json::Value*>(arg)->append(std::move(row));
  return 0;
}

constexpr std::array<OwnCallback, 3> kOwnCallbacks{{
    {OAUTHDBBasic::TabCountCallback, appendCount, Json::arrayValue, line::kTabCountThrew},
    {OAUTHDBBasic::IsTabExistCallback, noteTable, Json::objectValue, line::kIsTabExistThrew},
    {OAUTHDBBasic::TabGetCallback, appendRow, Json::arrayValue, line::kTabGetThrew},
}};

}  // namespace

bool canFill(const OwnCallback& own, const void* arg) {
  const auto* const doc = static_cast<const Json::Value*>(arg);
  return doc != nullptr && (doc->isNull() || doc->type() == own.fills);
}

const OwnCallback* findOwn(OAUTHDBBasic::RowCallback callback) {
  const auto* const found =
      std::find_if(kOwnCallbacks.begin(), kOwnCallbacks.end(),
                   [callback](const OwnCallback& own) { return own.callback == callback; });
  return found != kOwnCallbacks.end() ? found : nullptr;
}

namespace {

/// A public callback as somebody calls it by himself.
int runAlone(const OwnCallback& own, void* arg, int count, char** values, char** columns) try {
  return canFill(own, arg) ? own.body(arg, count, values, columns) : 0;
} catch (...) {
  return failWithoutObject(own.threwLine);
}

}  // namespace

int OAUTHDBBasic::TabCountCallback(void* arg, int count, char** values, char** columns) {
  return runAlone(kOwnCallbacks[0], arg, count, values, columns);
}

int OAUTHDBBasic::IsTabExistCallback(void* arg, int count, char** values, char** columns) {
  return runAlone(kOwnCallbacks[1], arg, count, values, columns);
}

int OAUTHDBBasic::TabGetCallback(void* arg, int count, char** values, char** columns) {
  return runAlone(kOwnCallbacks[2], arg, count, values, columns);
}

}  // namespace KELDOAUTHSERVER
