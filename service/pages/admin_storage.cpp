#include <algorithm>

#include "service/pages/admin_pages.h"
#include "service/pages/frame.h"
#include "service/pages/html.h"

namespace keldoauth::service {
namespace {

struct Table {
  const char* what;
  grants::TableRoom room;
  long long givingWay;  // rows that go when a new one needs their place
  const char* whenFull;
};

constexpr char kApplicationsFull[] =
    "When it is full, no more can be registered: remove those that nobody uses.";
constexpr char kCodesFull[] =
    "These last for minutes. When it is full, people can sign in again as soon as some of them are "
    "over; whoever is signed in stays so.";
constexpr char kTokensFull[] =
    "When it is full, nobody new can sign in to an application, and whoever is signed in stays so: "
    "revoke under Access what is not used any more.";
constexpr char kLogFull[] = "It drops its oldest entries by itself: nothing to do.";

std::string roomText(const Table& table) {
  const long long left = std::max(0LL, table.room.most - table.room.rows) + table.givingWay;
  if (left == 0) return "<p><strong class=\"full\">Full</strong></p>\n";
  return fill("<p>Room for <strong>{}</strong> more</p>\n", {std::to_string(left)});
}

std::string tableItem(const Table& table) {
  const std::string limit = std::to_string(table.room.most);
  const std::string high = std::to_string(table.room.most / 10 * 9);
  const std::string used = std::to_string(std::max(0LL, table.room.rows - table.givingWay));
  return fill("<li class=\"card\"><h2>{}</h2>\n", {table.what}) + roomText(table) +
         fill(
             "<meter min=\"0\" max=\"{}\" high=\"{}\" value=\"{}\" aria-label=\"{}\">{}</meter>\n"
             "<p class=\"hint\">{} of {}{}</p>\n<p class=\"hint\">{}</p>\n</li>\n",
             {limit, high, used, table.what, used, std::to_string(table.room.rows), limit,
              table.givingWay == 0
                  ? ""
                  : "; " + std::to_string(table.givingWay) + " give way when others need the room",
              table.whenFull});
}

}  // namespace

Answer storagePage(Context& context, const Request& request) {
  const grants::RoomCount room = context.store.open().room.count();
  grants::TableRoom log = room.log;
  // A full log is as it should be.
  const long long old = log.rows >= log.most ? log.rows : 0;
  std::string items;
  for (const Table& table :
       {Table{"Applications", room.applications, 0, kApplicationsFull},
        Table{"Sign-ins under way", room.codes, room.codes.dead + room.spentCodes, kCodesFull},
        Table{"Access", room.tokens, room.tokens.dead, kTokensFull},
        Table{"Audit log", log, old, kLogFull}}) {
    items += tableItem(table);
  }
  return view(kStorage, context, request,
              "<p>What is no good any more makes room by itself, and nobody is signed out for it. "
              "The limits stand in the library’s settings.</p>\n<ul class=\"cards small\">\n" +
                  items + "</ul>\n");
}

}  // namespace keldoauth::service
