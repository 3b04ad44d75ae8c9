// The library's own row callbacks: what the executor has to know of them. Their
// contract stands with the members of OAUTHDBBasic, defined here, too.

#ifndef KELDOAUTH_CORE_ROW_CALLBACKS_H
#define KELDOAUTH_CORE_ROW_CALLBACKS_H

#include <json/value.h>

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

/// A public callback, and what stands behind it: that one throws, since within
/// a statement an exception has to end it.
struct OwnCallback {
  OAUTHDBBasic::RowCallback callback;
  OAUTHDBBasic::RowCallback body;
  Json::ValueType fills;  // the document that it adds to, when that is not null
  int threwLine;
};

/// Null for a callback of the caller's own.
const OwnCallback* findOwn(OAUTHDBBasic::RowCallback callback);

/// Whether `arg` is a document that the callback can add to.
bool canFill(const OwnCallback& own, const void* arg);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_ROW_CALLBACKS_H
