// Answers on standard output: tables and lists of values for people, one JSON
// document for programs.

#ifndef KELDOAUTH_TOOLS_OUTPUT_H
#define KELDOAUTH_TOOLS_OUTPUT_H

#include <json/value.h>

#include <cstddef>
#include <initializer_list>
#include <iosfwd>
#include <string>

namespace tool {

/// What happens to a column where the terminal is too narrow: nothing; its texts
/// are cut; they go on in the next line.
enum class Width { kFixed, kShrinks, kWraps };

/// A column of a table or a line of a list: `member` of each row under `title`.
struct Column {
  const char* title;
  const char* member;
  Width width = Width::kFixed;
  /// Makes the text from the whole row; without it the member is shown.
  std::string (*render)(const Json::Value& row) = nullptr;
};

using Columns = std::initializer_list<Column>;

/// The text of a value: numbers in decimal, "yes" or "no", "-" for null and for
/// an empty text; printable in any case.
std::string cellText(const Json::Value& value);

/// One line per row below a line of titles. On a terminal (or with COLUMNS set)
/// columns give way until a line fits; where that is not enough, each row takes
/// a line per column.
void printTable(std::ostream& out, const Json::Value& rows, const Columns& columns);

/// The rows in the member `plural` as a table, or "No <plural>.".
void printList(std::ostream& out, const Json::Value& document, const char* plural,
               const Columns& columns);

/// One line per column of a single row, nothing cut.
void printDetails(std::ostream& out, const Json::Value& row, const Columns& columns);

/// The document on one line of ASCII without control characters.
void printJson(std::ostream& out, const Json::Value& document);

/// "1 client", "3 clients".
std::string counted(std::size_t count, const std::string& noun);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_OUTPUT_H
