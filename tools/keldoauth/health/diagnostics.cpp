// The switches of the diagnostics, and the list of what is wrong.

#include "tools/keldoauth/health/health.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

struct LogClass {
  int bit;
  const char* name;
};
constexpr LogClass kLogClasses[] = {
    {1, "store operations"}, {2, "rows read"}, {4, "checked arguments"}, {8, "SQL statements"}};
constexpr int kNoClass = ~15;
constexpr int kClassesWithSecrets = 2 | 4 | 8;

}  // namespace

void Problems::add(const std::string& subject, const std::string& message,
                   const std::string& hint) {
  Json::Value problem;
  problem["subject"] = subject;
  problem["message"] = message;
  problem["hint"] = hint;
  list_.append(problem);
}

Json::Value inspectDiagnostics(Problems& problems) {
  const int level = getLogLevel();
  Json::Value document;
  document["debug_flag"] = isDebugEnabled();
  document["log_level"] = level;
  document["log_classes"] = Json::arrayValue;
  for (const LogClass& logClass : kLogClasses) {
    if ((level & logClass.bit) != 0) document["log_classes"].append(logClass.name);
  }
  if (level > 0 && (level & kNoClass) != 0) {
    problems.add("settings", "log_level: " + std::to_string(level) + " has bits without a meaning",
                 "1, 2, 4 and 8 are the classes");
  }
  if (isDebugEnabled() && (level & kClassesWithSecrets) != 0) {
    problems.add("diagnostics", "secrets and tokens are written to the system log",
                 "remove " + std::string(names::kDebugFlagFile) + " and restart the programs");
  }
  return document;
}

}  // namespace tool
