#include "service/pages/admin_pages.h"

#include "service/pages/frame.h"
#include "service/pages/html.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr int kRows = 200;

std::string logTurn(const Settings& settings, const std::string& filter, int page,
                    const char* word) {
  return fill("<a class=\"button\" href=\"{}?view=log&amp;filter={}&amp;page={}\">{}</a>\n",
              {settings.link("/admin"), percentEncode(filter), std::to_string(page), word});
}

std::string logTurns(const Settings& settings, const std::string& filter, int page, bool more) {
  if (page == 1 && !more) return {};
  return "<nav class=\"actions\" aria-label=\"Pages of the log\">\n" +
         (page > 1 ? logTurn(settings, filter, page - 1, "Newer") : "") +
         (more ? logTurn(settings, filter, page + 1, "Older") : "") + "</nav>\n";
}

}  // namespace

Answer logPage(Context& context, const Request& request, const Parameters& query) {
  const std::string filter = query.value("filter");
  const int page = pageNumber(query.value("page"));
  grants::AuditFilter wanted;
  wanted.contains = filter;
  wanted.most = kRows + 1;  // one more, when another page follows
  wanted.skipped = (page - 1) * kRows;
  std::vector<grants::AuditEntry> entries = context.store.open().audit.list(wanted);
  const bool more = entries.size() > kRows;
  if (more) entries.pop_back();
  std::string rows;
  for (const grants::AuditEntry& entry : entries) {
    rows += "<tr><td>" + timeText(entry.time) + fill("</td><td>{}</td></tr>\n", {entry.text});
  }
  return view(kLog, context, request,
              fill("<form method=\"get\" action=\"{}\" class=\"search\" role=\"search\">\n"
                   "<input type=\"hidden\" name=\"view\" value=\"log\">\n"
                   "<label for=\"filter\">Contains</label>\n"
                   "<input id=\"filter\" name=\"filter\" value=\"{}\" autocomplete=\"off\" "
                   "aria-describedby=\"filter-hint\">\n"
                   "<button>Filter</button>\n</form>\n"
                   "<p class=\"hint\" id=\"filter-hint\">% stands for any text, _ for any "
                   "character.</p>\n",
                   {context.settings.link("/admin"), filter}) +
                  (rows.empty() ? "<p class=\"empty\">No entry.</p>\n"
                                : "<div class=\"card\"><table class=\"log\">\n<thead><tr><th "
                                  "scope=\"col\">Time</th><th scope=\"col\">Entry</th></tr></thead>"
                                  "\n<tbody>\n" +
                                      rows + "</tbody></table></div>\n") +
                  logTurns(context.settings, filter, page, more));
}

}  // namespace keldoauth::service
