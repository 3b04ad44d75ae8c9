/* Does nothing: what a process costs. */

int main(void) {
  return 0;
}
