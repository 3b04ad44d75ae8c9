#include "tests/support/server_world.h"

#include <dlfcn.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <stdexcept>
#include <string>

namespace support {
namespace {

const std::string kFolder = "/var/packages/Corvane/target/etc/";

void writePrivately(const std::string& name, const std::string& text) {
  std::ofstream(kFolder + name, std::ios::binary) << text;
  chmod((kFolder + name).c_str(), 0600);
}

template <typename Function>
Function engineCall(const char* name) {
  static void* const library = dlopen("libkeldoauth-postgresql.so.1", RTLD_NOW | RTLD_LOCAL);
  void* const call = library != nullptr ? dlsym(library, name) : nullptr;
  if (call == nullptr) throw std::runtime_error(dlerror());
  return reinterpret_cast<Function>(call);
}

}  // namespace

bool isOnServer() {
  return std::getenv("KELDOAUTH_TEST_SERVER") != nullptr;
}

StoreCalls storeCalls() {
  if (!isOnServer()) return {sqlite3_open, sqlite3_exec, sqlite3_free, sqlite3_close};
  return {engineCall<decltype(&sqlite3_open)>("sqlite3_open"),
          engineCall<decltype(&sqlite3_exec)>("sqlite3_exec"),
          engineCall<decltype(&sqlite3_free)>("sqlite3_free"),
          engineCall<decltype(&sqlite3_close)>("sqlite3_close")};
}

void chooseServer() {
  writePrivately("oauth.postgresql", std::getenv("KELDOAUTH_TEST_SERVER"));
  writePrivately("keldcore.key", std::string(64, 'k'));
  if (symlink("oauth.postgresql", (kFolder + "oauth.db").c_str()) != 0) {
    throw std::runtime_error("the server cannot be chosen");
  }
  engineCall<void (*)()>("keldoauth_test_empty_server")();
}

}  // namespace support
