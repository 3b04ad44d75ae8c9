#include "tools/keldoauth/console/output.h"

#include <json/writer.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <limits>
#include <numeric>
#include <ostream>
#include <vector>

#include "tools/keldoauth/console/text.h"

namespace tool {
namespace {

using Line = std::vector<std::string>;
using Widths = std::vector<std::size_t>;

constexpr std::size_t kGap = 2;

// Of columns that give way.
constexpr std::size_t kNarrowest = 6;
constexpr std::size_t kNarrowestWrapped = 16;

/// COLUMNS has the last word, as with other tools; a pipe takes any width.
std::size_t terminalWidth() {
  const char* const columns = std::getenv("COLUMNS");
  const long asked = columns != nullptr ? std::strtol(columns, nullptr, 10) : 0;
  if (asked > 0) return static_cast<std::size_t>(asked);

  winsize size{};
  if (isatty(STDOUT_FILENO) != 0 && ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 &&
      size.ws_col > 0) {
    return size.ws_col;
  }
  return std::numeric_limits<std::size_t>::max();
}

std::string textOf(const Json::Value& row, const Column& column) {
  return cellText(column.render != nullptr ? Json::Value(column.render(row)) : row[column.member]);
}

std::size_t narrowest(const Column& column) {
  return column.width == Width::kWraps ? kNarrowestWrapped : kNarrowest;
}

std::vector<Line> linesOf(const Json::Value& rows, const Columns& columns) {
  std::vector<Line> lines(1);
  for (const Column& column : columns) lines.front().emplace_back(column.title);
  for (const Json::Value& row : rows) {
    Line& line = lines.emplace_back();
    // cppcheck-suppress invalidContainerReference ; `lines` grows after it
    for (const Column& column : columns) line.push_back(textOf(row, column));
  }
  return lines;
}

Widths naturalWidths(const std::vector<Line>& lines) {
  Widths widths(lines.front().size(), 0);
  for (const Line& line : lines) {
    for (std::size_t i = 0; i < line.size(); ++i) {
      widths[i] = std::max(widths[i], displayWidth(line[i]));
    }
  }
  return widths;
}

/// Takes one column after the other from the widest that may shrink. False when
/// that is not enough.
bool shrinkTo(std::size_t available, const Columns& columns, Widths& widths) {
  std::size_t total = std::accumulate(widths.begin(), widths.end(), kGap * (widths.size() - 1));
  for (; total > available; --total) {
    std::size_t* widest = nullptr;
    for (std::size_t i = 0; i < widths.size(); ++i) {
      const Column& column = columns.begin()[i];
      if (column.width == Width::kFixed || widths[i] <= narrowest(column)) continue;
      if (widest == nullptr || widths[i] > *widest) widest = &widths[i];
    }
    if (widest == nullptr) return false;
    --*widest;
  }
  return true;
}

void printLine(std::ostream& out, const Line& line, const Widths& widths) {
  std::string text;
  std::size_t reached = 0;
  for (std::size_t i = 0; i < line.size(); ++i) {
    const std::string cell = fitted(line[i], widths[i]);
    if (!cell.empty()) {
      text.append(reached, ' ').append(cell);
      reached = 0;
    }
    reached += widths[i] - (cell.empty() ? 0 : displayWidth(cell)) + kGap;
  }
  out << text << '\n';
}

/// With further lines for what its last cell still has to say.
void printWrapped(std::ostream& out, const Line& first, const Widths& widths) {
  Line line = first;
  for (const std::string& part : wrapped(first.back(), widths.back())) {
    line.back() = part;
    printLine(out, line, widths);
    line.assign(line.size(), "");
  }
}

/// Where a line of all columns has no room: a line for each value, its title in
/// front, and an empty line between two rows.
void printRecords(std::ostream& out, const std::vector<Line>& lines, std::size_t available) {
  const Line& titles = lines.front();
  std::size_t widest = 0;
  for (const std::string& title : titles) widest = std::max(widest, displayWidth(title));
  const std::size_t room = std::max(available, widest + kGap + kNarrowest) - widest - kGap;
  for (std::size_t row = 1; row < lines.size(); ++row) {
    if (row > 1) out << '\n';
    for (std::size_t i = 0; i < titles.size(); ++i) {
      printWrapped(out, {titles[i], lines[row][i]}, {widest, room});
    }
  }
}

/// The one control character that JSON's writers let through. It stands in
/// texts only, where it may be escaped as any other.
std::string withoutDelete(const std::string& json) {
  std::string escaped;
  for (const char c : json) {
    if (c == '\x7f') {
      escaped += "\\u007f";
    } else {
      escaped += c;
    }
  }
  return escaped;
}

}  // namespace

std::string cellText(const Json::Value& value) {
  if (value.isBool()) return value.asBool() ? "yes" : "no";
  const std::string text = value.asString();  // of null: empty
  return text.empty() ? "-" : printable(text);
}

void printTable(std::ostream& out, const Json::Value& rows, const Columns& columns) {
  const std::vector<Line> lines = linesOf(rows, columns);
  Widths widths = naturalWidths(lines);
  const std::size_t available = terminalWidth();
  if (!shrinkTo(available, columns, widths)) return printRecords(out, lines, available);
  const bool wraps = std::prev(columns.end())->width == Width::kWraps;
  for (const Line& line : lines) (wraps ? printWrapped : printLine)(out, line, widths);
}

void printList(std::ostream& out, const Json::Value& document, const char* plural,
               const Columns& columns) {
  const Json::Value& rows = document[plural];
  if (rows.empty()) {
    out << "No " << plural << ".\n";
  } else {
    printTable(out, rows, columns);
  }
}

void printDetails(std::ostream& out, const Json::Value& row, const Columns& columns) {
  std::vector<Line> lines;
  for (const Column& column : columns) lines.push_back({column.title, textOf(row, column)});
  const Widths widths = naturalWidths(lines);
  for (const Line& line : lines) printLine(out, line, widths);
}

void printJson(std::ostream& out, const Json::Value& document) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  out << withoutDelete(Json::writeString(builder, document)) << '\n';
}

std::string counted(std::size_t count, const std::string& noun) {
  return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

}  // namespace tool
