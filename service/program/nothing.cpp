// Answers and does nothing else: what a CGI program costs before it does
// anything, for comparison.

#include <cstdio>

int main() {
  return std::puts("Status: 200 OK\r\nContent-Type: text/plain\r\n\r\nnothing") == EOF ? 1 : 0;
}
