#include "examples/cgi/code_state.h"

#include <vector>

#include "examples/cgi/encoding.h"

namespace service {
namespace {

constexpr char kGiven[] = "given";
constexpr char kImplied[] = "implied";

}  // namespace

std::string pack(const CodeState& state) {
  return base64Url(state.redirect) + "." + (state.redirectWasGiven ? kGiven : kImplied) + "." +
         state.challenge;
}

std::optional<CodeState> unpackCodeState(const std::string& text) {
  const std::vector<std::string> fields = split(text, '.');
  if (fields.size() != 3) return std::nullopt;
  std::optional<std::string> redirect = base64UrlDecode(fields[0]);
  if (!redirect) return std::nullopt;
  return CodeState{*redirect, fields[1] != kImplied, fields[2]};
}

std::string pack(const TokenState& state) {
  return base64Url(state.grantScope) + "." + state.codeDigest + "." + std::to_string(state.issued);
}

std::optional<TokenState> unpackTokenState(const std::string& text) {
  const std::vector<std::string> fields = split(text, '.');
  if (fields.size() != 3) return std::nullopt;
  std::optional<std::string> scope = base64UrlDecode(fields[0]);
  if (!scope) return std::nullopt;
  return TokenState{*scope, fields[1], number(fields[2])};
}

}  // namespace service
