#error "the library took this for a header of its own"
