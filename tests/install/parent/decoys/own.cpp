int ofItsOwn() {
  return 0;
}
