#include "tools/keldoauth/commands/audit.h"

#include <iostream>

#include "grants/grants.h"
#include "tools/keldoauth/console/invoker.h"
#include "tools/keldoauth/storage/trouble.h"

namespace grants = KELDOAUTHSERVER::grants;

namespace tool {

grants::Actor actor() {
  return grants::Actor(invoker());
}

bool isRecorded(const std::string& command, const std::string& what) try {
  grants::Grants().audit.record(what, actor());
  return true;
} catch (const grants::Trouble& trouble) {
  std::cerr << "keldoauth: " + command +
                   ": the audit log has no entry of it: " + failureOf(trouble).text() + "\n";
  return false;
}

}  // namespace tool
