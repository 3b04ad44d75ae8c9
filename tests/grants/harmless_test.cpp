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

TEST(HarmlessTest, BytesThatAreNotUtf8AreWrittenOut) {
  const Shown table[] = {
      {"\xff", "\\xff"},
      {"\xc0\xaf", "\\xc0\\xaf"},
      {"\xed\xa0\x80", "\\xed\\xa0\\x80"},
      {"\xe2\x80", "\\xe2\\x80"},
      {"\xf4\x90\x80\x80", "\\xf4\\x90\\x80\\x80"},
      {"\x80"
       "a",
       "\\x80a"},
  };
  for (const Shown& row : table) EXPECT_EQ(harmless(row.text), row.shown);
}

}  // namespace
