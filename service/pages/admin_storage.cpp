#include "service/pages/admin_pages.h"

#include "service/pages/admin_view.h"
#include "service/pages/html.h"

namespace keldoauth::service {

namespace {

struct Table {
  const char* what;
  grants::TableRoom room;
  long long givingWay;  // rows that go when a new one needs their place
  bool refuses;         // new rows, when it is full; else the oldest go
};

std::string tableItem(const Table& table) {
  const std::string limit = std::to_string(table.room.most);
  const std::string high = table.refuses ? std::to_string(table.room.most / 10 * 9) : limit;
  const std::string count = std::to_string(table.room.rows);
  const std::string item = fill(
      "<li class=\"card\"><h2>{}</h2>\n"
      "<p class=\"figure\"><strong>{}</strong> of {} rows</p>\n"
      "<meter min=\"0\" max=\"{}\" high=\"{}\" value=\"{}\" aria-label=\"{}\">{}</meter>\n",
      {table.what, count, limit, limit, high, count, table.what, count});
  if (table.givingWay == 0) return item + "</li>\n";
  return item + fill("<p class=\"hint\">{} would give way to new rows</p></li>\n",
                     {std::to_string(table.givingWay)});
}

}  // namespace

Answer storagePage(Context& context, const Request& request) {
  const grants::RoomCount room = context.store.open().room.count();
  std::string items;
  for (const Table& table : {Table{"Applications", room.applications, 0, true},
                             Table{"Codes", room.codes, room.codes.dead + room.spentCodes, true},
                             Table{"Tokens", room.tokens, room.tokens.dead, true},
                             Table{"Audit log", room.log, 0, false}}) {
    items += tableItem(table);
  }
  return view(kStorage, context, request,
              "<ul class=\"cards small\">\n" + items +
                  "</ul>\n<p class=\"hint\">A full table takes new rows in place of those that are "
                  "no good any more; when there are none, it takes no more, and nobody is logged "
                  "out. The audit log drops its oldest entries instead.</p>\n");
}

}  // namespace keldoauth::service
