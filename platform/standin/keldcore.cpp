#include "platform/keldcore.h"

int KCORECryptSzEncrypt(const char* /*clear*/, char* /*out*/, size_t /*outSize*/) { return 0; }

int KCORECryptSzDecrypt(const char* /*cipher*/, char* /*out*/, size_t /*outSize*/) { return 0; }
