#include "tools/keldoauth/console/terminal.h"

#include <fcntl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <iostream>

#include "tools/keldoauth/console/failure.h"

namespace tool {
namespace {

/// Many times the longest secret: whoever names a wrong file learns it soon.
constexpr std::size_t kMostBytes = 4096;

/// Standard input or a file; only the file is closed.
class Input {
 public:
  explicit Input(const std::string& path)
      : isFile_(path != "-"),
        descriptor_(isFile_ ? open(path.c_str(), O_RDONLY | O_CLOEXEC) : STDIN_FILENO) {}
  ~Input() {
    if (isFile_ && descriptor_ >= 0) close(descriptor_);
  }
  Input(const Input&) = delete;
  Input& operator=(const Input&) = delete;

  [[nodiscard]] int descriptor() const { return descriptor_; }
  [[nodiscard]] bool isOpen() const { return descriptor_ >= 0; }
  [[nodiscard]] bool isTerminal() const { return isatty(descriptor_) != 0; }

  /// To the end, or to the end of the line on a terminal. False on an error.
  bool readInto(std::string& text) const {
    std::array<char, 512> buffer{};
    for (;;) {
      const ssize_t got = read(descriptor_, buffer.data(), buffer.size());
      if (got < 0 && errno == EINTR) continue;
      if (got <= 0) return got == 0;
      text.append(buffer.data(), static_cast<std::size_t>(got));
      if (text.size() > kMostBytes || (isTerminal() && text.back() == '\n')) return true;
    }
  }

 private:
  bool isFile_;
  int descriptor_;
};

/// Keeps a terminal from showing what is typed.
class EchoOff {
 public:
  explicit EchoOff(int descriptor)
      : descriptor_(descriptor), isSet_(tcgetattr(descriptor, &before_) == 0) {
    termios silent = before_;
    silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
    if (isSet_) tcsetattr(descriptor_, TCSAFLUSH, &silent);
  }
  ~EchoOff() {
    if (isSet_) tcsetattr(descriptor_, TCSAFLUSH, &before_);
  }
  EchoOff(const EchoOff&) = delete;
  EchoOff& operator=(const EchoOff&) = delete;

 private:
  int descriptor_;
  termios before_{};
  bool isSet_;
};

void stripLineEnd(std::string& text) {
  if (!text.empty() && text.back() == '\n') text.pop_back();
  if (!text.empty() && text.back() == '\r') text.pop_back();
}

[[noreturn]] void failUnreadable(const std::string& path) {
  throw Failure(kUsage, "cannot read " + path + ": " + std::strerror(errno));
}

bool readFrom(const Input& input, const std::string& what, std::string& text) {
  if (!input.isTerminal()) return input.readInto(text);

  const EchoOff silence(input.descriptor());  // before the prompt: it drops what was typed so far
  std::cerr << what << ": " << std::flush;
  const bool isRead = input.readInto(text);
  std::cerr << '\n';
  return isRead;
}

}  // namespace

std::string readSecret(const std::string& path, const std::string& what) {
  const Input input(path);
  std::string text;
  if (!input.isOpen() || !readFrom(input, what, text)) failUnreadable(path);

  stripLineEnd(text);
  const auto isControl = [](char c) { return static_cast<unsigned char>(c) < ' ' || c == '\x7f'; };
  if (text.size() > kMostBytes || std::any_of(text.begin(), text.end(), isControl)) {
    throw Failure(kUsage, what + ": " + (path == "-" ? "standard input" : path) +
                              " does not hold one line of text");
  }
  return text;
}

void confirm(const Arguments& arguments, const std::string& question) {
  if (arguments.yes) return;

  const Input input("-");
  if (!input.isTerminal()) {
    throw Failure(kNotConfirmed, "not confirmed, nothing was done",
                  "there is no terminal to ask on; --yes goes ahead without asking");
  }
  std::cerr << question << " [y/N] " << std::flush;
  std::string answer;
  input.readInto(answer);
  stripLineEnd(answer);
  if (answer != "y" && answer != "Y" && answer != "yes") {
    throw Failure(kNotConfirmed, "not confirmed, nothing was done");
  }
}

}  // namespace tool
