# Makes a 32-bit time_t one of 64 bits if the C library offers that, so that times past January 2038
# are possible.

include(CheckCXXSourceCompiles)

set(sixty_four_bits "#include <ctime>\nstatic_assert(sizeof(time_t) == 8);\nint main() {}")
check_cxx_source_compiles("${sixty_four_bits}" TIME_T_HAS_64_BITS)
if(TIME_T_HAS_64_BITS)
  message(STATUS "time_t has 64 bits")
  return()
endif()

set(CMAKE_REQUIRED_DEFINITIONS -D_FILE_OFFSET_BITS=64 -D_TIME_BITS=64)
check_cxx_source_compiles("${sixty_four_bits}" TIME_BITS_GIVES_64_BITS)
unset(CMAKE_REQUIRED_DEFINITIONS)
if(TIME_BITS_GIVES_64_BITS)
  message(STATUS "time_t has 64 bits, by _TIME_BITS=64")
  target_compile_definitions(zevooauth_flags INTERFACE _TIME_BITS=64)
else()
  message(WARNING "time_t has 32 bits: times past January 2038 are not possible")
endif()
