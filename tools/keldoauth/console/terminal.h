// What comes in besides the command line: secrets, from a file or standard
// input, and the answer to a question.

#ifndef KELDOAUTH_TOOLS_TERMINAL_H
#define KELDOAUTH_TOOLS_TERMINAL_H

#include <string>

#include "tools/keldoauth/console/options.h"

namespace tool {

/// The one line in the file `path`, without its line end; "-" is standard
/// input, where a terminal is asked for `what` and does not show the answer.
/// Throws Failure for a file that cannot be read or does not hold one line.
std::string readSecret(const std::string& path, const std::string& what);

/// Returns when the user agrees to `question` or said --yes; throws Failure
/// otherwise, also when there is no terminal to ask on.
void confirm(const Arguments& arguments, const std::string& question);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_TERMINAL_H
