// Documents outlive the plug-in that had the library make them.

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <json/value.h>
#include <unistd.h>

#include <fstream>
#include <string>

#include "tests/support/private_mounts.h"
#include "utils/oauth_names.h"

namespace {

namespace names = KELDOAUTHSERVER::names;

bool isMapped(const std::string& file) {
  std::ifstream maps("/proc/self/maps");
  for (std::string line; std::getline(maps, line);) {
    if (line.find(file) != std::string::npos) return true;
  }
  return false;
}

TEST(UnloadingTest, DocumentsOutliveThePlugInThatAskedForThem) {
  support::requirePrivateMounts();
  Json::Value issued;
  Json::Value verified;
  Json::Value rows(Json::arrayValue);
  void* plugin = dlopen(UNLOADING_PLUGIN, RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(plugin, nullptr) << dlerror();
  using IssueAndVerify = void (*)(Json::Value*, Json::Value*, Json::Value*);
  const auto run = reinterpret_cast<IssueAndVerify>(dlsym(plugin, "issueAndVerify"));
  ASSERT_NE(run, nullptr);
  run(&issued, &verified, &rows);
  ASSERT_EQ(dlclose(plugin), 0);

  EXPECT_FALSE(isMapped("unloading_plugin"));
  EXPECT_TRUE(isMapped("libkeldoauth.so"));
  EXPECT_EQ(issued["access_token"].asString().size(), 64U);
  EXPECT_EQ(verified["username"], "alice");
  const Json::Value copy = rows;
  ASSERT_EQ(copy.size(), 1U);
  EXPECT_EQ(copy[0]["access_token"], issued["access_token"]);
  EXPECT_EQ(copy[0].getMemberNames().size(), 10U);
}

}  // namespace
