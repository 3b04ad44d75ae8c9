#include "service/program/terminal.h"

#include <termios.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <iostream>
#include <stdexcept>

namespace keldoauth::service {
namespace {

constexpr std::size_t kMostBytes = 4096;

/// Keeps a terminal from showing what is typed.
class Silence {
 public:
  Silence() : isTerminal_(tcgetattr(STDIN_FILENO, &before_) == 0) {
    termios silent = before_;
    silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
    if (isTerminal_) tcsetattr(STDIN_FILENO, TCSAFLUSH, &silent);
  }
  ~Silence() {
    if (isTerminal_) tcsetattr(STDIN_FILENO, TCSAFLUSH, &before_);
  }
  Silence(const Silence&) = delete;
  Silence& operator=(const Silence&) = delete;

 private:
  termios before_{};
  bool isTerminal_;
};

/// To the end of the input, or of the line on a terminal; without that end.
std::string readLine(bool isTerminal) {
  std::string text;
  std::array<char, 512> buffer{};
  for (;;) {
    const ssize_t got = read(STDIN_FILENO, buffer.data(), buffer.size());
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) throw std::runtime_error("the password cannot be read");
    text.append(buffer.data(), static_cast<std::size_t>(got));
    if (text.size() > kMostBytes) throw std::runtime_error("the password is too long");
    if (got == 0 || (isTerminal && text.back() == '\n')) break;
  }
  if (!text.empty() && text.back() == '\n') text.pop_back();
  return text;
}

std::string ask(const std::string& question) {
  const Silence silence;
  std::cerr << question << ": " << std::flush;
  std::string answer = readLine(true);
  std::cerr << '\n';
  return answer;
}

}  // namespace

std::string readNewPassword(const std::string& user) {
  if (isatty(STDIN_FILENO) == 0) return readLine(false);
  std::string password = ask("New password of " + user);
  if (ask("The same once more") != password) throw std::runtime_error("the two are not the same");
  return password;
}

}  // namespace keldoauth::service
