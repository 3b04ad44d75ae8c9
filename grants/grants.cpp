#include "grants/grants.h"

#include "grants/rows/store.h"

namespace KELDOAUTHSERVER::grants {

Grants::Grants(const Policy& policy)
    : store_(std::make_unique<Store>(policy)),
      applications(*store_),
      codes(*store_),
      pushed(*store_),
      tokens(*store_),
      access(*store_),
      room(*store_),
      audit(*store_) {}

Grants::~Grants() = default;

}  // namespace KELDOAUTHSERVER::grants
