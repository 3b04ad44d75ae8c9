# The presets turn these into errors; a packager's newer compiler should not.
# A project around this one has warnings made for its own sources, and may take
# them as errors: they are not asked about ours. The headers stand up to them.
if(KELDOAUTH_IS_TOP_LEVEL)
  add_compile_options(-Wall -Wextra -Wpedantic -Wshadow -Wconversion)
else()
  add_compile_options(-w)
endif()
