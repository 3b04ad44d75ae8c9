// Links what the library links and does nothing: what process start costs.

int main() {
  return 0;
}
