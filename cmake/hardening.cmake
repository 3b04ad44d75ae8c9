# Flags that cost next to nothing and close a door each. _FORTIFY_SOURCE is left
# to the packager.
add_compile_options(-fstack-protector-strong)
add_link_options(LINKER:-z,relro LINKER:-z,now LINKER:-z,noexecstack LINKER:--as-needed)

include(CheckPIESupported)
check_pie_supported(LANGUAGES CXX)
