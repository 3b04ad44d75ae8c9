#include "tests/service/people/scene.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace scene {

using keldoauth::service::DirectoryTrouble;
using keldoauth::service::PasswordCheck;
using keldoauth::service::Verdict;

void Folder::SetUp() {
  std::string name = "/tmp/people.XXXXXX";
  ASSERT_NE(mkdtemp(name.data()), nullptr);
  folder_ = name;
  support::SystemLog::clear();
}

void Folder::TearDown() {
  support::Clock::release();
  std::filesystem::remove_all(folder_);
}

void Folder::write(const std::string& name, const std::string& text, unsigned int mode) const {
  std::ofstream(at(name), std::ios::binary) << text;
  ASSERT_EQ(chmod(at(name).c_str(), mode), 0) << name;
}

std::string Folder::read(const std::string& name) const {
  std::ostringstream text;
  text << std::ifstream(at(name), std::ios::binary).rdbuf();
  return text.str();
}

std::vector<std::string> Folder::names() const {
  std::vector<std::string> found;
  for (const auto& entry : std::filesystem::directory_iterator(folder_)) {
    found.push_back(entry.path().filename());
  }
  std::sort(found.begin(), found.end());
  return found;
}

std::string Folder::program(const std::string& script) const {
  write("program", "#!/bin/sh\n" + script, 0700);
  return at("program");
}

PasswordCheck TestDirectory::checkPassword(const std::string& user,
                                           const std::string& password) const {
  ++checks;
  meanwhile();
  if (isBroken) return {Verdict::kCannotSay, "", "broken"};
  const auto person = people.find(user);
  if (person == people.end() || person->second.password != password) {
    return {Verdict::kNo, "", "wrong name or password"};
  }
  return {Verdict::kYes, user, ""};
}

std::optional<std::string> TestDirectory::stampOf(const std::string& user) const {
  if (isBroken) throw DirectoryTrouble("broken");
  const auto person = people.find(user);
  if (person == people.end()) return std::nullopt;
  return person->second.stamp;
}

}  // namespace scene
