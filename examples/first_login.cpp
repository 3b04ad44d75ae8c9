// A login from registration to revocation.

#include <cstdio>

#include "grants/grants.h"

using namespace KELDOAUTHSERVER::grants;

int main() try {
  Grants grants;
  const Actor admin("admin");
  const RedirectAddress address("https://photos.example.org/callback");
  const auto frame =
      grants.applications.add({ApplicationName("Photo Frame"), {address}, Scope("photos")}, admin);
  if (!frame) return 1;

  CodeRequest request{User("alice"), frame->identifier, Scope("photos"), address};
  request.pkce = Pkce{Challenge("E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM")};
  const auto code = grants.codes.issue(request);
  if (!code) return 1;

  const Verifier verifier("dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk");
  const auto pair = grants.codes.redeem({frame->identifier, code->code, address, verifier});
  if (!pair) return 1;

  const auto next = grants.tokens.refresh({frame->identifier, *pair->refresh});
  if (!next) return 1;

  const auto bearer = grants.tokens.verify(next->access);
  if (!bearer) return 1;
  std::printf("%s may %s\n", bearer->user->text().c_str(), bearer->scope.text().c_str());

  const auto revoked = grants.tokens.revoke(frame->identifier, AnyToken(next->refresh->text()));
  return revoked && !grants.tokens.verify(next->access) ? 0 : 1;
} catch (const Trouble& trouble) {
  std::fprintf(stderr, "%s\n", trouble.what());
  return 1;
}
