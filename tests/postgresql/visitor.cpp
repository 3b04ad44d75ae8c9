// One process of a box, for the scripts: writes entries and says what became of
// each, or verifies a token as fast as it can.
//
//   postgresql_visitor write NAME SECONDS [cold]   "ok|unknown|failed TEXT TIME CODE"
//   postgresql_visitor verify SECONDS [cold]       verifications a second
//
// A process that is resident keeps its store, as under FastCGI; a cold one makes
// it for each request. TIME is seconds since the epoch, with a fraction.

#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <thread>

#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using Clock = std::chrono::steady_clock;

namespace {

/// A file in the box's folder that ends it early.
constexpr char kStop[] = "/var/packages/Corvane/target/etc/stop";

double now() {
  const auto time = std::chrono::system_clock::now().time_since_epoch();
  return std::chrono::duration<double>(time).count();
}

const char* outcomeOf(const OAUTHDBBasic& store, bool done) {
  if (done) return "ok";
  return store.GetErrMsg().rfind("outcome unknown", 0) == 0 ? "unknown" : "failed";
}

int write(const std::string& name, Clock::time_point end, bool isCold) {
  auto log = std::make_unique<OAUTHDBLog>(names::kLogTable);
  for (int i = 0; Clock::now() < end && access(kStop, F_OK) != 0; ++i) {
    const std::string text = name + "-" + std::to_string(i);
    if (isCold || log->GetErrCode() == 14) log = std::make_unique<OAUTHDBLog>(names::kLogTable);
    log->SetErrCode(0);
    Json::Value row;
    row[names::kMsg] = text;
    row[names::kTimestamp] = Json::Value();
    const bool done = log->DBAdd(row);
    std::printf("%s %s %.3f %d\n", outcomeOf(*log, done), text.c_str(), now(), log->GetErrCode());
    std::fflush(stdout);
    if (!done) std::this_thread::sleep_for(std::chrono::milliseconds(20));
  }
  return 0;
}

int verify(long seconds, bool isCold) {
  Json::Value token;
  auto tokens = std::make_unique<OAUTHDBToken>(names::kTokenTable);
  if (!tokens->Add("alice", std::string(64, 'c'), "read", "code", "x", "", token)) return 1;
  const std::string access = token[names::kAccessToken].asString();
  long count = 0;
  const Clock::time_point end = Clock::now() + std::chrono::seconds(seconds);
  for (; Clock::now() < end; ++count) {
    if (isCold) tokens = std::make_unique<OAUTHDBToken>(names::kTokenTable);
    Json::Value result;
    if (!tokens->Verify(access, result)) return 1;
  }
  std::printf("%ld verifications a second\n", count / seconds);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  const bool isCold = argc > 1 && std::strcmp(argv[argc - 1], "cold") == 0;
  if (argc > 3 && std::strcmp(argv[1], "write") == 0) {
    return write(argv[2], Clock::now() + std::chrono::seconds(std::atol(argv[3])), isCold);
  }
  if (argc > 2 && std::strcmp(argv[1], "verify") == 0) return verify(std::atol(argv[2]), isCold);
  return 2;
}
