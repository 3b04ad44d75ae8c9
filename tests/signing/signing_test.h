// The fixture of the keys: an empty folder for their file.

#ifndef KELDOAUTH_TESTS_SIGNING_SIGNING_TEST_H
#define KELDOAUTH_TESTS_SIGNING_SIGNING_TEST_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <functional>
#include <string>
#include <vector>

#include "service/signing/jws.h"
#include "service/signing/key_fault.h"
#include "service/signing/key_file.h"
#include "service/signing/key_set.h"

namespace signing_test {

using namespace keldoauth::service::signing;

inline constexpr Time kStart = 1700000000;
inline constexpr Time kDay = 86400;

class SigningTest : public ::testing::Test {
 protected:
  static constexpr char kFolder[] = "/tmp/keys";
  static constexpr char kPath[] = "/tmp/keys/signing.json";

  void SetUp() override;
  void TearDown() override;

  /// Made once for all cases: keys take their time. Signs from kStart.
  static const KeySet& anySet();
  /// The key of RFC 7515 A.2 or A.3.
  static Json::Value vector(const std::string& name);

  static std::string readFile(const std::string& path);
  static void writeFile(const std::string& path, const std::string& text, unsigned mode = 0600);
  static unsigned modeOf(const std::string& path);
  /// The names in the folder, sorted.
  static std::vector<std::string> filesIn(const std::string& folder);
  /// Puts anySet() in the file's place.
  static void putAnySet();
};

/// What stands in the way, nothing when nothing does.
std::string failureOf(const std::function<void()>& body);

Json::Value parsed(const std::string& text);
std::string written(const Json::Value& value);

}  // namespace signing_test

#endif  // KELDOAUTH_TESTS_SIGNING_SIGNING_TEST_H
