# The presets turn these into errors; a packager's newer compiler should not.
add_compile_options(-Wall -Wextra -Wpedantic -Wshadow -Wconversion)
