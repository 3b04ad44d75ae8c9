// Any text where the floor above the stores reads its own: packed states,
// refresh tokens, the registry's words, quotes, and names in the audit log.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "grants/audit.h"
#include "grants/rows/digest.h"
#include "grants/rows/quotes.h"
#include "grants/rows/refresh_text.h"
#include "grants/rows/registry_words.h"
#include "grants/rows/state.h"
#include "tests/fuzz/expect.h"

namespace {

using namespace KELDOAUTHSERVER::grants;
using fuzz::expect;

/// A text that is read at all is the one way of writing what it says.
void tryAsState(const std::string& text) {
  const auto code = rows::unpackCode(text);
  if (code) expect(rows::pack(*code) == text, "a code's state in another form", text);
  const auto token = rows::unpackToken(text);
  if (token) expect(rows::pack(*token) == text, "a token's state in another form", text);
  const auto pushed = rows::unpackPushed(text);
  if (pushed) expect(rows::pack(*pushed) == text, "a request's state in another form", text);
  expect((code ? 1 : 0) + (token ? 1 : 0) + (pushed ? 1 : 0) <= 1, "a state of two kinds", text);
}

/// Whatever is packed comes back.
void tryInState(const std::string& text) {
  const std::string first = text.substr(0, text.size() / 2);
  const std::string second = text.substr(first.size());
  rows::CodeState code{first, true, "S", second, 7, text};
  for (const bool isSpent : {false, true}) {
    if (isSpent) code.spent = rows::Spent{-1, 9, second};
    const auto back = rows::unpackCode(rows::pack(code));
    expect(back && back->redirect == first && back->challenge == second && back->text == text &&
               back->spent.has_value() == isSpent,
           "a code's state that changed", text);
  }
  const auto back =
      rows::unpackToken(rows::pack(rows::TokenState{1, 2, 3, first, second, text, text, first}));
  expect(back && back->family == first && back->refreshBefore == second &&
             back->accessBefore == text && back->loginScope == text && back->text == first,
         "a token's state that changed", text);
}

void tryAsRefreshToken(const std::string& text) {
  if (const auto token = rows::read(text)) {
    expect(rows::write(*token) == text, "a refresh token in another form", text);
  }
  const std::string body = text.substr(0, 97);
  if (const auto token = rows::read(body + rows::hexDigest(body).substr(0, 8))) {
    expect(rows::write(*token).substr(0, 97) == body, "another refresh token", text);
  }
}

void tryAsWords(const std::string& text) {
  const std::string once = rows::pack(rows::unpackWords(text));
  expect(rows::pack(rows::unpackWords(once)) == once, "words that do not stay", text);
}

void tryAsStoredText(const std::string& text) {
  expect(rows::undoubled(rows::doubled(text)) == text, "quotes that changed", text);
  for (const std::string& stored : rows::spellings(text)) {
    expect(rows::undoubled(stored) == text, "a spelling of another text", text);
  }
}

void tryInTheLog(const std::string& text) {
  const std::string shown = harmless(text);
  const bool isPlain = std::none_of(shown.begin(), shown.end(), [](char c) {
    return static_cast<unsigned char>(c) < 0x20 || c == 0x7f || c == '[' || c == ']';
  });
  expect(isPlain, "an entry that could be forged", text);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  tryAsState(text);
  tryInState(text);
  tryAsRefreshToken(text);
  tryAsWords(text);
  tryAsStoredText(text);
  tryInTheLog(text);
  return 0;
}
