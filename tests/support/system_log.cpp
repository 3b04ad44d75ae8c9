#include "tests/support/system_log.h"

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <mutex>

#include "tests/support/allocations.h"

namespace support {
namespace {

std::mutex mutex;
std::vector<LogLine>& recorded() {
  static std::vector<LogLine> lines;
  return lines;
}

void record(int priority, const char* format, va_list arguments) {
  const int error = errno;
  const Uncounted uncounted;
  va_list again;
  va_copy(again, arguments);
  const int length = std::vsnprintf(nullptr, 0, format, again);
  va_end(again);

  std::string text(static_cast<std::size_t>(length) + 1, '\0');
  std::vsnprintf(text.data(), text.size(), format, arguments);
  text.pop_back();

  const std::lock_guard<std::mutex> lock(mutex);
  recorded().push_back({priority, format, text, error});
  errno = error;
}

}  // namespace

std::string LogLine::source() const {
  return text.substr(0, text.find(':'));
}

int LogLine::number() const {
  return std::atoi(text.c_str() + text.find(':') + 1);
}

std::string LogLine::message() const {
  return text.substr(text.find(' ') + 1);
}

void SystemLog::clear() {
  const std::lock_guard<std::mutex> lock(mutex);
  recorded().clear();
}

std::vector<LogLine> SystemLog::lines() {
  const std::lock_guard<std::mutex> lock(mutex);
  return recorded();
}

std::vector<std::string> SystemLog::texts() {
  std::vector<std::string> texts;
  for (const LogLine& line : lines()) texts.push_back(line.text);
  return texts;
}

std::vector<std::string> SystemLog::messages() {
  std::vector<std::string> messages;
  for (const LogLine& line : lines()) messages.push_back(line.message());
  return messages;
}

int SystemLog::count(const std::string& message) {
  const std::vector<std::string> all = messages();
  return static_cast<int>(std::count(all.begin(), all.end(), message));
}

}  // namespace support

extern "C" {

void syslog(int priority, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  support::record(priority, format, arguments);
  va_end(arguments);
}

/// What syslog becomes where a packager builds with _FORTIFY_SOURCE.
void __syslog_chk(int priority, int /*flag*/, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  support::record(priority, format, arguments);
  va_end(arguments);
}

}  // extern "C"
