#include "service/pages/html.h"

#include <cstddef>

#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr char kReplacement[] = "\xEF\xBF\xBD";

std::string_view escapeOf(char c) {
  switch (c) {
    case '&':
      return "&amp;";
    case '<':
      return "&lt;";
    case '>':
      return "&gt;";
    case '"':
      return "&quot;";
    case '\'':
      return "&#39;";
    case '\t':
    case '\n':
    case '\r':
      return {};
    default:
      return static_cast<unsigned char>(c) < ' ' || c == '\x7f' ? kReplacement : std::string_view();
  }
}

constexpr char kPolicy[] =
    "default-src 'none'; style-src 'self'; img-src 'self'; base-uri 'none'; "
    "frame-ancestors 'none'";

constexpr char kHead[] = R"(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width, initial-scale=1">
<meta name="color-scheme" content="light dark">
<title>{}</title>
<link rel="icon" href="{}/style/icon.svg" type="image/svg+xml">
<link rel="stylesheet" href="{}/style/service.css">
</head>
<body>
)";

Answer pageUnder(const Settings& settings, const std::string& policy, int status,
                 const std::string& title, const std::string& main) {
  return Answer{
      status,
      {{"Content-Type", "text/html; charset=utf-8"},
       {"Content-Security-Policy", policy},
       {"X-Frame-Options", "DENY"}},
      fill(kHead, {title, settings.basePath, settings.basePath}) + main + "</body>\n</html>\n"};
}

}  // namespace

std::string escape(std::string_view text) {
  std::string escaped;
  while (!text.empty()) {
    const std::size_t length = characterLength(text);
    const std::string_view special = length == 0   ? kReplacement
                                     : length == 1 ? escapeOf(text[0])
                                                   : std::string_view();
    escaped += special.empty() ? text.substr(0, length) : special;
    text.remove_prefix(length == 0 ? 1 : length);
  }
  return escaped;
}

std::string fill(std::string_view pattern, std::initializer_list<std::string_view> texts) {
  std::string filled;
  for (const std::string_view text : texts) {
    const std::size_t gap = pattern.find("{}");
    if (gap == std::string_view::npos) break;
    filled.append(pattern.substr(0, gap)).append(escape(text));
    pattern.remove_prefix(gap + 2);
  }
  return filled.append(pattern);
}

Answer page(const Settings& settings, int status, const std::string& title,
            const std::string& main) {
  return pageUnder(settings, std::string(kPolicy) + "; form-action 'self'", status, title, main);
}

Answer pageLeadingAway(const Settings& settings, const std::string& title, const std::string& main,
                       int status) {
  return pageUnder(settings, kPolicy, status, title, main);
}

Answer messagePage(const Settings& settings, int status, const std::string& title,
                   const std::string& text, const std::string& back) {
  const std::string link = back.empty() ? ""
                                        : fill("<p><a class=\"button\" href=\"{}\">Back</a></p>\n",
                                               {settings.link(back)});
  return page(settings, status, title,
              fill("<main class=\"card message\">\n<h1>{}</h1>\n<p>{}</p>\n", {title, text}) +
                  link + "</main>\n");
}

Answer failurePage(const Settings& settings, const Failure& failure) {
  return messagePage(settings, failure.status, failure.title, failure.text);
}

}  // namespace keldoauth::service
