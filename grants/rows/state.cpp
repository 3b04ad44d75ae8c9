#include "grants/rows/state.h"

#include <charconv>
#include <limits>
#include <system_error>
#include <vector>

#include "grants/texts.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr char kCodeStart[] = "c1";
constexpr std::size_t kStart = 2;
constexpr std::size_t kCodeFields = 6;
constexpr std::size_t kSpentFields = 9;
constexpr std::size_t kPushedFields = 3;
constexpr std::size_t kTokenFields = 8;

using Fields = std::vector<std::string>;

std::string joined(const char* start, const Fields& fields) {
  std::string text = start;
  for (const std::string& field : fields) {
    text += std::to_string(field.size()) + ":" + field;
  }
  return text;
}

// What holds of a code.

constexpr int kNamed = 1;
constexpr int kEvictsNothing = 2;

int flagsOf(const CodeState& state) {
  return (state.isNamed ? kNamed : 0) + (state.evictsNothing ? kEvictsNothing : 0);
}

/// Reads decimal digits, and only those that to_string writes.
template <typename Number>
std::optional<Number> numberOf(std::string_view text) {
  Number number = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end || std::to_string(number) != text) return {};
  return number;
}

/// Exactly so many fields and nothing behind them.
std::optional<Fields> split(std::string_view text, std::size_t count) {
  Fields fields;
  while (!text.empty() && fields.size() < count) {
    const std::size_t colon = text.find(':');
    if (colon == std::string_view::npos) return {};
    const std::optional<std::size_t> size = numberOf<std::size_t>(text.substr(0, colon));
    text.remove_prefix(colon + 1);
    if (!size || *size > text.size()) return {};
    fields.emplace_back(text.substr(0, *size));
    text.remove_prefix(*size);
  }
  if (!text.empty() || fields.size() != count) return {};
  return fields;
}

bool readSpent(const Fields& fields, CodeState& state) {
  const std::optional<long long> time = numberOf<long long>(fields[kCodeFields]);
  const std::optional<long long> row = numberOf<long long>(fields[kCodeFields + 1]);
  if (!time || !row) return false;
  state.spent = Spent{*time, *row, fields[kCodeFields + 2]};
  return true;
}

bool isInColumn(const std::string& text) {
  return text.size() <= static_cast<std::size_t>(bounds::kState.max);
}

// Expressions of SQL about fields, one after the other.

std::string fieldsOfState() {
  return "substr(" + std::string(names::kState) + "," + std::to_string(kStart + 1) + ")";
}

std::string numberIn(const std::string& fields) {
  return "CAST(substr(" + fields + ",instr(" + fields + ",':')+1,CAST(" + fields +
         " AS INTEGER)) AS INTEGER)";
}

std::string behindFirst(const std::string& fields) {
  return "substr(" + fields + ",instr(" + fields + ",':')+1+CAST(" + fields + " AS INTEGER))";
}

/// A number with as many digits as there can be.
constexpr long long kLongest = std::numeric_limits<long long>::min();

/// A mark of the length of them all.
std::string anyMark() {
  std::string zeros(kIdentifierLength, '0');
  return zeros;
}

}  // namespace

std::string issuedTime() {
  return numberIn(fieldsOfState());
}

std::string loginTime() {
  return numberIn(behindFirst(fieldsOfState()));
}

std::string pack(const CodeState& state) {
  Fields fields{std::to_string(state.issued),
                state.redirect,
                std::to_string(flagsOf(state)),
                state.method,
                state.challenge,
                state.text};
  if (!state.spent) return joined(kCodeStart, fields);
  fields.push_back(std::to_string(state.spent->time));
  fields.push_back(std::to_string(state.spent->tokenRow));
  fields.push_back(state.spent->family);
  return joined(kSpentStart, fields);
}

std::string pack(const PushedState& state) {
  return joined(kPushedStart, {std::to_string(state.issued), state.isOpen ? "1" : "0", state.text});
}

std::string pack(const TokenState& state) {
  return joined(kTokenStart, {std::to_string(state.issued), std::to_string(state.login),
                              std::to_string(state.redeemed), state.family, state.refreshBefore,
                              state.accessBefore, state.loginScope, state.text});
}

std::optional<CodeState> unpackCode(std::string_view text) {
  const std::string_view start = text.substr(0, kStart);
  const bool isSpent = start == kSpentStart;
  if (!isSpent && start != kCodeStart) return {};
  const std::optional<Fields> fields =
      split(text.substr(kStart), isSpent ? kSpentFields : kCodeFields);
  if (!fields) return {};
  const std::optional<long long> issued = numberOf<long long>((*fields)[0]);
  const std::optional<int> flags = numberOf<int>((*fields)[2]);
  if (!issued || !flags || *flags < 0 || *flags > kNamed + kEvictsNothing) return {};
  CodeState state{(*fields)[1], *flags % kEvictsNothing == kNamed,
                  (*fields)[3], (*fields)[4],
                  *issued,      (*fields)[5]};
  state.evictsNothing = *flags >= kEvictsNothing;
  if (isSpent && !readSpent(*fields, state)) return {};
  return state;
}

std::optional<PushedState> unpackPushed(std::string_view text) {
  if (text.substr(0, kStart) != kPushedStart) return {};
  const std::optional<Fields> fields = split(text.substr(kStart), kPushedFields);
  if (!fields || ((*fields)[1] != "1" && (*fields)[1] != "0")) return {};
  const std::optional<long long> issued = numberOf<long long>((*fields)[0]);
  if (!issued) return {};
  return PushedState{*issued, (*fields)[1] == "1", (*fields)[2]};
}

std::optional<TokenState> unpackToken(std::string_view text) {
  if (text.substr(0, kStart) != kTokenStart) return {};
  const std::optional<Fields> fields = split(text.substr(kStart), kTokenFields);
  if (!fields) return {};
  const std::optional<long long> issued = numberOf<long long>((*fields)[0]);
  const std::optional<long long> login = numberOf<long long>((*fields)[1]);
  const std::optional<long long> redeemed = numberOf<long long>((*fields)[2]);
  if (!login || !redeemed || !issued) return {};
  return TokenState{*login,       *redeemed,    *issued,      (*fields)[3],
                    (*fields)[4], (*fields)[5], (*fields)[6], (*fields)[7]};
}

static_assert(kStart + sizeof("20:") + 20 + sizeof("1:1") + sizeof("2000:") +
                  kRequestTextBounds.max <=
              static_cast<std::size_t>(bounds::kState.max));

bool fitsEver(const CodeState& state, const std::string& scope) {
  CodeState spent = state;
  spent.spent = Spent{kLongest, kLongest, anyMark()};
  return isInColumn(pack(spent)) &&
         fitsEver(TokenState{kLongest, kLongest, kLongest, "", "", "", "", state.text}, scope);
}

bool fitsEver(const TokenState& state, const std::string& scope) {
  return isInColumn(pack(TokenState{kLongest, kLongest, kLongest, anyMark(), anyMark(), anyMark(),
                                    scope, state.text}));
}

}  // namespace KELDOAUTHSERVER::grants::rows
