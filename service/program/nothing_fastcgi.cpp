// The same for FastCGI: answers, again and again, and does nothing else.

#include <fcgiapp.h>

int main() {
  FCGX_Request request{};
  if (FCGX_Init() != 0 || FCGX_InitRequest(&request, 0, 0) != 0) return 1;
  while (FCGX_Accept_r(&request) == 0) {
    FCGX_PutS("Status: 200 OK\r\nContent-Type: text/plain\r\n\r\nnothing\n", request.out);
  }
  return 0;
}
