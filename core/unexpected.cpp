#include "core/unexpected.h"

#include <syslog.h>

#include <exception>

#include "core/log_lines.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {

void logUnexpected(const char* source, int number, const char* what) {
  syslog(LOG_ERR, "%s:%d Unexpected failure[%s]", source, number, what);
}

int failWithoutObject(int number) noexcept {
  try {
    throw;
  } catch (const std::exception& thrown) {
    logUnexpected(line::kSource, number, thrown.what());
  } catch (...) {
    logUnexpected(line::kSource, number, "unknown");
  }
  return 0;
}

}  // namespace KELDOAUTHSERVER
