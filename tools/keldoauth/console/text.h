// Text for people: what a value looks like on a terminal, whatever is in it.
// The locale's character type must be UTF-8 (main sets it).

#ifndef KELDOAUTH_TOOLS_TEXT_H
#define KELDOAUTH_TOOLS_TEXT_H

#include <cstddef>
#include <string>
#include <vector>

namespace tool {

/// `text` on one line and without effect on the terminal: control characters,
/// marks that turn the direction of text and bytes that are no UTF-8 come out
/// as "\n", "\x1b" or "\u{202e}".
std::string printable(const std::string& text);

/// Columns that a printable text takes.
std::size_t displayWidth(const std::string& text);

/// A printable text cut to `width` columns, the cut marked with an ellipsis.
std::string fitted(const std::string& text, std::size_t width);

/// A printable text in lines of at most `width` columns, broken at blanks where
/// there are some. At least one line.
std::vector<std::string> wrapped(const std::string& text, std::size_t width);

/// The first six characters and an ellipsis, so that two secrets can be told
/// apart; only the ellipsis when the text is short or not plain ASCII.
std::string masked(const std::string& secret);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_TEXT_H
