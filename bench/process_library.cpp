// One process of the service, over the library:
//   process_library verify TOKEN    construct, verify, exit
//   process_library issue COUNT     issue that many token pairs
//   process_library purge 0         remove what has expired

#include <json/value.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "stores/oauth_token.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

int main(int argc, char** argv) {
  if (argc != 3) return 2;
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value out;
  if (std::strcmp(argv[1], "verify") == 0) return tokens.Verify(argv[2], out) ? 0 : 1;
  if (std::strcmp(argv[1], "purge") == 0) return tokens.Purge() ? 0 : 1;

  const std::string client(64, '1');
  for (int count = std::atoi(argv[2]); count > 0; --count) {
    if (tokens.Add("alice", client, "photos.read", "authorization_code", "af0ifjsldkj", "192.0.2.7",
                   out) == 0) {
      return 1;
    }
  }
  return 0;
}
