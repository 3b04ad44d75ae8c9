# Its rules are those of package.mk beside it.
