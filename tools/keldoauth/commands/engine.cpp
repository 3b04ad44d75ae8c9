// keldoauth engine: whether the store is a file of SQLite's or on a PostgreSQL
// server, for the whole installation. The rows do not move with it.

#include <ostream>
#include <string>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/encrypted_values.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/files.h"
#include "tools/keldoauth/storage/key_files.h"
#include "tools/keldoauth/storage/presence.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr char kServer[] = "postgresql";
constexpr char kFile[] = "sqlite";

Answer described(bool changed) {
  Answer answer;
  answer.document["engine"] = isOnServer() ? kServer : kFile;
  answer.document["store"] = isOnServer() ? connectionFile() : names::kDatabaseFile;
  answer.document["changed"] = changed;
  return answer;
}

// To a server -----------------------------------------------------------------------

/// Whether the store has a key already, another box's or this one's.
bool hasKey(OAUTHDBBasic& store) {
  Json::Value count(Json::arrayValue);
  if (store.DBCmdRun("SELECT COUNT(*) FROM oauth_key", OAUTHDBBasic::TabCountCallback, &count) ==
      0) {
    throw libraryFailure(store);
  }
  return count[0U].asString() != "0";
}

/// The stand-in cipher makes no key beside a store that it cannot look into: the
/// first box makes it here, and every other one has to be given it.
void provideKey() {
  if (canEncrypt()) return;
  OAUTHDBBasic store;
  if (store.GetErrMsg() == errors::kOpenFailed) throw libraryFailure(store);
  if (absenceOfKey().empty()) throw Failure(kUnavailable, "the cipher fails", adviceOnCipher());
  if (hasKey(store)) {
    throw Failure(kRefused, "the store has a key, and this box has none",
                  "bring the key file of another box as " + keyFiles().current +
                      ", with its owner and mode 0600");
  }
  drawKey(keyFiles().current);
  syncFolderOf(keyFiles().current);
}

/// The store must open, with the key of this box, before anything depends on it.
void tryServer() try {
  provideKey();
  OAUTHDBBasic store;
  requireReady(store);
} catch (const Failure& failure) {
  chooseFile();
  throw Failure(failure.exit, failure.what(),
                failure.hintAnd("the engine is as it was; the system log says more"), failure.code);
}

void requireConnectionFile() {
  try {
    requireReadableFile(connectionFile());
  } catch (const Failure& failure) {
    throw Failure(kRefused, failure.what(),
                  "it has to hold libpq's connection text, with mode 0600, as in "
                  "\"host=db1,db2 dbname=keldoauth user=keldoauth sslmode=verify-full\"");
  }
}

void setServer(const Arguments& arguments) {
  requireConnectionFile();
  if (databasePresence() == Presence::kThere) {
    confirm(arguments, "The rows of " + std::string(names::kDatabaseFile) +
                           " do not move to the server; the file waits as " + fileSetAside() +
                           ". Is the service stopped, and is that meant?");
  }
  chooseServer();
  tryServer();
}

// Back to a file --------------------------------------------------------------------

void setFile(const Arguments& arguments) {
  confirm(arguments,
          "The rows on the server do not move to a file, and this box no longer sees what the "
          "others do. Is the service stopped, and is that meant?");
  chooseFile();
}

// The commands ----------------------------------------------------------------------

Answer show(const Arguments& /*arguments*/) {
  return described(false);
}

Answer set(const Arguments& arguments) {
  const std::string& wanted = *arguments.engine;
  if (wanted != kServer && wanted != kFile) {
    throw Failure(kUsage, "no such engine: " + wanted, "there are sqlite and postgresql");
  }
  const MaintenanceLock lock;
  if ((wanted == kServer) == isOnServer()) return described(false);
  (wanted == kServer ? setServer : setFile)(arguments);
  return described(true);
}

void print(const Json::Value& document, std::ostream& out) {
  out << "Engine  " << cellText(document["engine"]) << "\nStore   " << cellText(document["store"])
      << "\n";
}

}  // namespace

const std::vector<Command>& engineCommands() {
  static const std::vector<Command> commands{
      {"show", "Show where the store is", {option::kJson}, show, print, Needs::kNothing},
      {"set",
       "Put the store into a file (sqlite) or on a server (postgresql)",
       {required(option::kEngine), option::kYes, option::kJson},
       set,
       print,
       Needs::kNothing,
       NewKey::kAllowed},
  };
  return commands;
}

}  // namespace tool
