// One process of the service, over grants/:
//   process_grants prepare         registers the application, logs a user in, and
//                                  prints a code, an access and a refresh token
//   process_grants issue           a code for another user
//   process_grants redeem CODE
//   process_grants refresh TOKEN
//   process_grants verify TOKEN
//   process_grants purge

#include <cstdio>
#include <map>
#include <optional>
#include <string>

#include "grants/grants.h"

using namespace KELDOAUTHSERVER::grants;

namespace {

// What RFC 7636 shows in its appendix B.
const Verifier kVerifier("dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk");
const Challenge kChallenge("E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM");
const RedirectAddress kAddress("https://photos.example.org/callback");
const Scope kScope("photos.read");
const ApplicationId kFrame(std::string(64, '1'));

std::optional<Code> issue(Grants& grants, const char* user) {
  CodeRequest request{User(user), kFrame, kScope, kAddress};
  request.pkce = Pkce{kChallenge};
  const auto issued = grants.codes.issue(request);
  return issued ? std::optional<Code>(issued->code) : std::nullopt;
}

bool prepare(Grants& grants, const std::string& /*unused*/) {
  NewApplication frame{ApplicationName("Photo Frame"), {kAddress}, kScope};
  frame.identifier = kFrame;
  if (!grants.applications.add(frame, Actor("admin"))) return false;
  const auto pair = grants.tokens.issue({User("alice"), kFrame, kScope});
  const auto code = issue(grants, "alice");
  if (!pair || !code) return false;
  std::printf("%s %s %s\n", code->text().c_str(), pair->access.text().c_str(),
              pair->refresh->text().c_str());
  return true;
}

bool issueOne(Grants& grants, const std::string& /*unused*/) {
  return issue(grants, "bob").has_value();
}

bool redeem(Grants& grants, const std::string& code) {
  return static_cast<bool>(grants.codes.redeem({kFrame, Code(code), kAddress, kVerifier}));
}

bool refresh(Grants& grants, const std::string& token) {
  return static_cast<bool>(grants.tokens.refresh({kFrame, RefreshToken(token)}));
}

bool verify(Grants& grants, const std::string& token) {
  return static_cast<bool>(grants.tokens.verify(AccessToken(token)));
}

bool purge(Grants& grants, const std::string& /*unused*/) {
  return grants.room.purge().tokens > 0;
}

}  // namespace

int main(int argc, char** argv) try {
  static const std::map<std::string, bool (*)(Grants&, const std::string&)> verbs{
      {"prepare", prepare}, {"issue", issueOne}, {"redeem", redeem},
      {"refresh", refresh}, {"verify", verify},  {"purge", purge}};
  const auto verb = argc > 1 ? verbs.find(argv[1]) : verbs.end();
  if (verb == verbs.end()) return 2;
  Grants grants;
  return verb->second(grants, argc > 2 ? argv[2] : "") ? 0 : 1;
} catch (const Trouble& trouble) {
  std::fprintf(stderr, "%s\n", trouble.what());
  return 1;
}
