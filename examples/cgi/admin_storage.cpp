#include "examples/cgi/admin_pages.h"

#include "examples/cgi/admin_rows.h"
#include "examples/cgi/admin_view.h"
#include "examples/cgi/html.h"

namespace service {

Answer storagePage(const std::string& user) {
  std::string rows;
  for (const Fill& table : tableFill()) {
    const std::string limit = std::to_string(table.limit);
    const std::string count = std::to_string(table.rows);
    rows += fill(
        "<li class=\"card\"><h2>{}</h2>\n"
        "<p class=\"figure\"><strong>{}</strong> of {} rows</p>\n"
        "<meter min=\"0\" max=\"{}\" high=\"" +
            std::to_string(table.refuses ? table.limit / 10 * 9 : table.limit) +
            "\" value=\"{}\" aria-label=\"{}\">{}</meter></li>\n",
        {table.what, count, limit, limit, count, table.what, count});
  }
  return view(kStorage, user,
              "<ul class=\"cards small\">\n" + rows +
                  "</ul>\n<p class=\"hint\">A full table refuses new rows with an invitation to "
                  "try again; the audit log drops its oldest entries instead.</p>\n");
}

}  // namespace service
