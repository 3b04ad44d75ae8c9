#include "grants/rows/quotes.h"

#include <cstddef>

namespace KELDOAUTHSERVER::grants::rows {

std::string doubled(std::string_view text) {
  std::string stored;
  stored.reserve(text.size());
  for (const char c : text) {
    stored += c;
    if (c == '\'') stored += c;
  }
  return stored;
}

std::string undoubled(std::string_view stored) {
  std::string text;
  text.reserve(stored.size());
  for (std::size_t i = 0; i < stored.size(); ++i) {
    text += stored[i];
    if (stored[i] == '\'' && stored.substr(i + 1, 1) == "'") ++i;
  }
  return text;
}

std::vector<std::string> spellings(const std::string& text) {
  std::vector<std::string> stored{doubled(text)};
  if (stored.front() != text && undoubled(text) == text) stored.push_back(text);
  return stored;
}

std::string literal(std::string_view stored) {
  return "'" + doubled(stored) + "'";
}

std::string beginsWith(const char* column, std::string_view start) {
  const std::string text = literal(start);
  return "(substr(" + std::string(column) + ",1,length(" + text + "))=" + text + ")";
}

std::string isOneOf(const char* column, const std::vector<std::string>& stored) {
  std::string list;
  for (const std::string& text : stored) {
    list += (list.empty() ? "" : ",") + literal(text);
  }
  return "(" + std::string(column) + " IN (" + list + "))";
}

}  // namespace KELDOAUTHSERVER::grants::rows
