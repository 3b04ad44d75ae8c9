#include "examples/cgi/admin_pages.h"

#include "examples/cgi/admin_view.h"
#include "examples/cgi/html.h"

namespace service {

namespace {

/// `refuses` new rows when it is full; the others drop the oldest.
std::string tableItem(const char* what, const grants::TableRoom& room, bool refuses) {
  const std::string limit = std::to_string(room.most);
  const std::string count = std::to_string(room.rows);
  const std::string dead = room.dead == 0 ? ""
                                          : fill(
                                                "<p class=\"hint\">{} can be cleared "
                                                "away</p>\n",
                                                {std::to_string(room.dead)});
  return fill(
             "<li class=\"card\"><h2>{}</h2>\n"
             "<p class=\"figure\"><strong>{}</strong> of {} rows</p>\n"
             "<meter min=\"0\" max=\"{}\" high=\"{}\" value=\"{}\" aria-label=\"{}\">{}</meter>\n",
             {what, count, limit, limit, std::to_string(refuses ? room.most / 10 * 9 : room.most),
              count, what, count}) +
         dead + "</li>\n";
}

}  // namespace

Answer storagePage(const grants::Grants& store, const std::string& admin) {
  const grants::RoomCount room = store.room.count();
  return view(kStorage, admin,
              "<ul class=\"cards small\">\n" + tableItem("Applications", room.applications, true) +
                  tableItem("Codes", room.codes, true) + tableItem("Tokens", room.tokens, true) +
                  tableItem("Audit log", room.log, false) +
                  "</ul>\n<p class=\"hint\">A full table makes room of what is no good any more; "
                  "when there is none, it takes no new rows, and nobody is logged out. The audit "
                  "log drops its oldest entries instead.</p>\n");
}

}  // namespace service
