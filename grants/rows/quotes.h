// Quotes, in the one place above the stores that knows of them: the stores keep
// every single quote doubled, and a reader gets them so.

#ifndef KELDOAUTH_GRANTS_ROWS_QUOTES_H
#define KELDOAUTH_GRANTS_ROWS_QUOTES_H

#include <string>
#include <string_view>
#include <vector>

namespace KELDOAUTHSERVER::grants::rows {

/// A text as the stores keep it.
std::string doubled(std::string_view text);

/// A text of a row as it was given. One that an edit stored with its quotes as
/// given comes out right, too, unless it has two of them in a row.
std::string undoubled(std::string_view stored);

/// Every way in which a row may hold `text`: doubled, and as given, unless that
/// would be another text's doubled form.
std::vector<std::string> spellings(const std::string& text);

/// A literal of SQL. The text has no NUL byte.
std::string literal(std::string_view stored);

/// The column's text begins so, as it is stored.
std::string beginsWith(const char* column, std::string_view start);

/// "(column IN ('O''''Brien','O''Brien'))"
std::string isOneOf(const char* column, const std::vector<std::string>& stored);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_QUOTES_H
