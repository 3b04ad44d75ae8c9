#include "service/people/htpasswd.h"

#include <fcntl.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <set>

#include "service/people/names.h"
#include "service/people/password_hash.h"
#include "service/text/encoding.h"
#include "utils/file.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

using KELDOAUTHSERVER::File;

std::string problemWith(const HtpasswdLine& line, bool hasColon, bool isSecond) {
  if (!hasColon) return "has no colon";
  if (!isUserName(line.name)) return "has a name that cannot be used";
  if (isSecond) return "repeats a name; the first counts";
  const std::string problem = problemWithHash(line.hash);
  return problem.empty() ? "" : "the hash " + problem;
}

const HtpasswdLine* find(const std::vector<HtpasswdLine>& lines, const std::string& user) {
  const auto line = std::find_if(lines.begin(), lines.end(), [&](const HtpasswdLine& each) {
    return each.name == user && each.problem.empty();
  });
  return line == lines.end() ? nullptr : &*line;
}

/// Any number below `limit`, the same for the same digest.
std::size_t pick(const std::string& digest, std::size_t limit) {
  std::size_t number = 0;
  for (const char byte : digest.substr(0, sizeof number)) {
    number = number << 8U | static_cast<unsigned char>(byte);
  }
  return number % limit;
}

}  // namespace

std::vector<HtpasswdLine> readHtpasswd(std::string_view text) {
  std::vector<HtpasswdLine> lines;
  std::set<std::string> names;
  std::size_t number = 0;
  while (!text.empty()) {
    const std::string_view row = text.substr(0, text.find('\n'));
    text.remove_prefix(std::min(text.size(), row.size() + 1));
    ++number;
    if (row.find_first_not_of(" \t\r") == std::string_view::npos || row[0] == '#') continue;

    const std::size_t colon = std::min(row.find(':'), row.size());
    HtpasswdLine line{number, std::string(row.substr(0, colon)),
                      std::string(row.substr(std::min(colon + 1, row.size()))), ""};
    const bool isSecond = !names.insert(line.name).second;
    line.problem = problemWith(line, colon < row.size(), isSecond);
    lines.push_back(std::move(line));
  }
  return lines;
}

std::string htpasswdText(const std::string& path) {
  const File file(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY);
  if (!file.isOpen()) throw DirectoryTrouble("cannot read " + path + ": " + std::strerror(errno));
  if (!file.isRegular()) throw DirectoryTrouble(path + " is not a regular file");
  std::string text;
  std::array<char, 4096> buffer{};
  for (;;) {
    const ssize_t got = file.readSome(buffer.data(), buffer.size());
    if (got < 0) throw DirectoryTrouble("cannot read " + path + ": " + std::strerror(errno));
    if (got == 0) return text;
    text.append(buffer.data(), static_cast<std::size_t>(got));
    if (text.size() > kMaxHtpasswdBytes) throw DirectoryTrouble(path + " is longer than 1 MiB");
  }
}

std::string HtpasswdUsers::nobodysHash(const std::vector<HtpasswdLine>& lines,
                                       const std::string& user) const {
  std::vector<const HtpasswdLine*> usable;
  for (const HtpasswdLine& line : lines) {
    if (line.problem.empty()) usable.push_back(&line);
  }
  if (usable.empty()) return kNobodysHash;
  return usable[pick(hmacSha256(key_, "nobody\n" + user), usable.size())]->hash;
}

PasswordCheck HtpasswdUsers::checkPassword(const std::string& user,
                                           const std::string& password) const try {
  if (!isUserName(user) || !isPassword(password)) {
    return {Verdict::kNo, "", "no name or no password"};
  }
  const std::vector<HtpasswdLine> lines = readHtpasswd(htpasswdText(path_));
  const HtpasswdLine* line = find(lines, user);
  const std::string expected = line != nullptr ? line->hash : nobodysHash(lines, user);
  const std::optional<std::string> hash = hashLike(password, expected);
  const bool isEqual = hash && equalSecrets(*hash, expected);
  // Before it shows who is there.
  if (!hash) return {Verdict::kCannotSay, "", "a hash in the file cannot be computed"};
  if (line == nullptr) return {Verdict::kNo, "", "no such user"};
  if (!isEqual) return {Verdict::kNo, "", "wrong password"};
  return {Verdict::kYes, line->name, ""};
} catch (const DirectoryTrouble& trouble) {
  return {Verdict::kCannotSay, "", trouble.what()};
}

std::optional<std::string> HtpasswdUsers::stampOf(const std::string& user) const {
  const std::vector<HtpasswdLine> lines = readHtpasswd(htpasswdText(path_));
  const HtpasswdLine* line = find(lines, user);
  if (line == nullptr) return std::nullopt;
  return line->hash;
}

std::string HtpasswdUsers::problem() const try {
  for (const HtpasswdLine& line : readHtpasswd(htpasswdText(path_))) {
    if (!line.problem.empty()) {
      return path_ + ", line " + std::to_string(line.number) + ": " + line.problem;
    }
  }
  return {};
} catch (const DirectoryTrouble& trouble) {
  return trouble.what();
}

}  // namespace keldoauth::service
