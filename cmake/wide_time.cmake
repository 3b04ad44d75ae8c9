# Times and file sizes of 64 bits in every target, on 32-bit systems, too, and
# whatever toolchain file a build uses. Where they have them anyway, or no such
# choice, the definitions change nothing. utils/wide_time.h checks the outcome.
add_compile_definitions(_FILE_OFFSET_BITS=64 _TIME_BITS=64)
