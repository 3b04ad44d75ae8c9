#include "tools/keldoauth/console/failure.h"

#include "tools/keldoauth/console/text.h"

namespace tool {

Failure::Failure(ExitCode exitCode, const std::string& message, const std::string& advice,
                 std::optional<int> libraryCode)
    : std::runtime_error(printable(message)),
      exit(exitCode),
      code(libraryCode),
      hint(printable(advice)) {}

std::string Failure::text() const {
  return what() + (code ? " (" + std::to_string(*code) + ")" : "");
}

std::string Failure::hintAnd(const std::string& more) const {
  return hint + (hint.empty() ? "" : "; ") + more;
}

Failure notFound(const std::string& what) {
  return {kNotFound, "no such " + what};
}

}  // namespace tool
