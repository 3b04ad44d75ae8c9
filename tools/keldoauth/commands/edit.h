// keldoauth code edit and token edit: for rows that another program stored, in
// the clear. What this service issued says for whom and what it was agreed to;
// who wants it otherwise ends it and issues another.

#ifndef KELDOAUTH_TOOLS_EDIT_H
#define KELDOAUTH_TOOLS_EDIT_H

#include "tools/keldoauth/commands/command.h"

namespace tool {

Answer editCode(const Arguments& arguments);
Answer editToken(const Arguments& arguments);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_EDIT_H
