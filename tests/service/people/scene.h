// A folder of a test's own, programs that answer as pwauth does, and a directory
// that is told what to say.

#ifndef KELDOAUTH_TESTS_SERVICE_PEOPLE_SCENE_H
#define KELDOAUTH_TESTS_SERVICE_PEOPLE_SCENE_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "service/people/directory.h"
#include "tests/support/doubles.h"
#include "tests/support/system_log.h"

namespace scene {

class Folder : public ::testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;

  [[nodiscard]] std::string at(const std::string& name) const { return folder_ + "/" + name; }
  void write(const std::string& name, const std::string& text, unsigned int mode = 0600) const;
  [[nodiscard]] std::string read(const std::string& name) const;
  [[nodiscard]] std::vector<std::string> names() const;

  /// A shell script; returns its path.
  [[nodiscard]] std::string program(const std::string& script) const;

 private:
  std::string folder_;
};

/// People with passwords in clear, stamps that a test changes, and no delay.
class TestDirectory : public keldoauth::service::Directory {
 public:
  struct Person {
    std::string password;
    std::string stamp;
  };
  std::map<std::string, Person> people;
  bool isBroken = false;
  mutable int checks = 0;
  std::function<void()> meanwhile = [] {};  // runs in every check

  [[nodiscard]] keldoauth::service::PasswordCheck checkPassword(
      const std::string& user, const std::string& password) const override;
  [[nodiscard]] std::optional<std::string> stampOf(const std::string& user) const override;
  [[nodiscard]] std::string problem() const override { return {}; }
};

}  // namespace scene

#endif  // KELDOAUTH_TESTS_SERVICE_PEOPLE_SCENE_H
