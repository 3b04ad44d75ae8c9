#include "service/protocol/cors.h"

#include <utility>

namespace keldoauth::service {

Answer preflightAnswer(const std::string& methods) {
  return readableEverywhere(Answer{204,
                                   {{"Allow", methods + ", OPTIONS"},
                                    {"Access-Control-Allow-Methods", methods},
                                    {"Access-Control-Allow-Headers", "Authorization, Content-Type"},
                                    {"Access-Control-Max-Age", "3600"}},
                                   ""});
}

Answer readableEverywhere(Answer answer) {
  return std::move(answer)
      .with("Access-Control-Allow-Origin", "*")
      .with("Access-Control-Expose-Headers", "Retry-After, WWW-Authenticate");
}

}  // namespace keldoauth::service
