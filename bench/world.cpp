#include "bench/world.h"

#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "bench/bare_store.h"
#include "core/oauth_db_basic.h"
#include "utils/oauth_names.h"

namespace bench {
namespace {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;

void fillApplications(BareStore& store) {
  store.run(
      "INSERT INTO oauth_clientInfo VALUES('1', '" + applicationIdCipher() + "', '" +
      clientIdCipher() +
      "', 'https://photos.example.org/callback', 'profile photos.read', 'Photo Frame', NULL);");
}

void fillTokens(BareStore& store, const Contents& contents) {
  for (int row = 1; row <= contents.tokens; ++row) {
    const std::string token = tokenText(row);
    store.run("INSERT INTO oauth_token VALUES('alice', '" + clientIdCipher() +
              "', 'photos.read', '" + token + "', '" + token + "', '" +
              (row <= contents.expired ? "1000" : "4102444800") +
              "', 'authorization_code', 'af0ifjsldkj', '192.0.2.7', NULL);");
  }
}

void fillLog(BareStore& store, int rows) {
  for (int row = 1; row <= rows; ++row) {
    store.run("INSERT INTO oauth_log VALUES(" + std::to_string(1000 + row) +
              ", 'Application registed[Photo Frame]', NULL);");
  }
}

void build(const Contents& contents) {
  const KELDOAUTHSERVER::OAUTHDBBasic schema;  // creates the tables
  BareStore store;
  store.run("BEGIN;");
  fillApplications(store);
  fillTokens(store, contents);
  fillLog(store, contents.logRows);
  store.run("COMMIT;");
}

}  // namespace

void install(const Contents& contents, int logMax) {
  const fs::path state = fs::path(names::kDatabaseFile).parent_path();
  const fs::path copy =
      state / ("template-" + std::to_string(contents.tokens) + "-" +
               std::to_string(contents.expired) + "-" + std::to_string(contents.logRows));
  fs::remove(names::kDatabaseFile);
  if (!fs::exists(copy)) {
    build(contents);
    fs::copy_file(names::kDatabaseFile, copy);
  } else {
    fs::copy_file(copy, names::kDatabaseFile);
  }
  std::ofstream(names::kSettingsFile)
      << R"({"client_info_max": 10000, "grantcode_max": 10000, "token_max": 10000, "log_max": )"
      << logMax << "}\n";
  sync();
}

}  // namespace bench
