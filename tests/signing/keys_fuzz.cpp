// Any bytes as a key file, and as a token beside the keys that there are: nothing
// but what we wrote, or a key as good, comes through, and all that comes through
// signs and can be read back.

#include <string>

#include "service/signing/base64url.h"
#include "service/signing/jws.h"
#include "service/signing/key_fault.h"
#include "service/signing/key_set.h"
#include "service/text/encoding.h"
#include "tests/fuzz/expect.h"

namespace {

using namespace keldoauth::service::signing;
using fuzz::expect;
using keldoauth::service::base64Url;

void expectUsable(KeySet& set, const std::string& text) {
  expect(KeySet::read(set.text()).text() == set.text(), "reads what it writes", text);
  for (const DatedKey& dated : set.keys()) {
    // Composite factors make a key that signs nothing; others must be right.
    try {
      const std::string signature = dated.key.sign("text");
      expect(dated.key.hasSigned("text", signature), "its own signature", text);
    } catch (const KeyFault& fault) {
      expect(dated.key.algorithm() == Algorithm::kRs256, "only RSA", fault.what());
    }
  }
}

void expectBase64Url(const std::string& text) {
  const std::optional<std::string> bytes = fromBase64Url(text);
  expect(!bytes || base64Url(*bytes) == text, "one spelling", text);
  expect(fromBase64Url(base64Url(text)) == text, "round trip", text);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string text(data, data + size);
  static const KeySet kOurs = KeySet::make(0);
  expectBase64Url(text);
  expect(!claimsOf(text, kOurs), "nobody else can sign", text);
  try {
    KeySet set = KeySet::read(text);
    expectUsable(set, text);
  } catch (const KeyFault& fault) {
    expect(*fault.what() != '\0', "says why");
  }
  return 0;
}
