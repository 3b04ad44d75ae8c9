// Texts that come from outside, as the audit log shows them.

#include <gtest/gtest.h>

#include "grants/audit.h"

namespace {

using KELDOAUTHSERVER::grants::harmless;

struct Shown {
  const char* text;
  const char* shown;
};

TEST(HarmlessTest, WhatPeopleCanReadStays) {
  for (const char* text : {"", "Photo Frame", "O'Brien", "Bücher", "写真", "صور", "👪"}) {
    EXPECT_EQ(harmless(text), text);
  }
}

TEST(HarmlessTest, WhatCouldForgeOrTurnAnEntryIsWrittenOut) {
  const Shown table[] = {
      {"a] by [root", "a) by (root"},
      {"a\nb", "a\\x0ab"},
      {"a\x1b[31m", "a\\x1b(31m"},
      {"a\\x0ab", "a\\x5cx0ab"},
      {"a\x7f", "a\\x7f"},
      {"\xe2\x80\xae"
       "evil",
       "\\u{202e}evil"},
      {"a\xe2\x81\xa6", "a\\u{2066}"},
      {"\xe2\x80\x8b", "\\u{200b}"},
      {"\xc2\xa0", "\\u{a0}"},
      {"\xc2\x85", "\\u{85}"},
      {"\xe3\x85\xa4", "\\u{3164}"},
      {"\xf3\xa0\x81\x81", "\\u{e0041}"},
      {"\xef\xbb\xbf", "\\u{feff}"},
  };
  for (const Shown& row : table) EXPECT_EQ(harmless(row.text), row.shown);
}

TEST(HarmlessTest, FirstAndLastCharactersOfEachLengthAreOnes) {
  const Shown table[] = {
      {"\xc2\x80", "\\u{80}"},
      {"\xdf\xbf", "\xdf\xbf"},
      {"\xe0\xa0\x80", "\xe0\xa0\x80"},
      {"\xed\x9f\xbf", "\xed\x9f\xbf"},
      {"\xee\x80\x80", "\\u{e000}"},
      {"\xef\xbf\xbf", "\\u{ffff}"},
      {"\xf0\x90\x80\x80", "\xf0\x90\x80\x80"},
      {"\xf4\x8f\xbf\xbf", "\\u{10ffff}"},
  };
  for (const Shown& row : table) EXPECT_EQ(harmless(row.text), row.shown);
}

TEST(HarmlessTest, BytesThatAreNotUtf8AreWrittenOut) {
  const Shown table[] = {
      {"\xff", "\\xff"},
      {"\xc0\xaf", "\\xc0\\xaf"},
      {"\xc1\xbf", "\\xc1\\xbf"},
      {"\xe0\x9f\xbf", "\\xe0\\x9f\\xbf"},
      {"\xf0\x8f\xbf\xbf", "\\xf0\\x8f\\xbf\\xbf"},
      {"\xed\xa0\x80", "\\xed\\xa0\\x80"},
      {"\xed\xbf\xbf", "\\xed\\xbf\\xbf"},
      {"\xe2\x80", "\\xe2\\x80"},
      {"\xf4\x90\x80\x80", "\\xf4\\x90\\x80\\x80"},
      {"\xf5\x80\x80\x80", "\\xf5\\x80\\x80\\x80"},
      {"\x80"
       "a",
       "\\x80a"},
  };
  for (const Shown& row : table) EXPECT_EQ(harmless(row.text), row.shown);
}

}  // namespace
