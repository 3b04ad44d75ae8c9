// Who runs the program, for the audit log.

#ifndef KELDOAUTH_TOOLS_INVOKER_H
#define KELDOAUTH_TOOLS_INVOKER_H

#include <string>

namespace tool {

/// The name of the user who asked: the one behind sudo, else the one who logged
/// in on the terminal, else the one that the process runs as. It is what these
/// say of themselves: whoever is root can make them say anything.
std::string invoker();

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_INVOKER_H
