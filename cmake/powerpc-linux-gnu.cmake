# Cross-compiles for 32-bit big-endian PowerPC Linux and runs the built programs under emulation.
# The target's libraries are those of scripts/lib/powerpc-libraries.sh.

set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR ppc)
set(CMAKE_CXX_COMPILER powerpc-linux-gnu-g++)
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-ppc -L /usr/powerpc-linux-gnu)

set(POWERPC_LIBRARIES ${CMAKE_CURRENT_LIST_DIR}/../build/powerpc-libraries
  CACHE PATH "Where the target's libraries are")
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES POWERPC_LIBRARIES)

# CMake must not find libraries of this machine.
get_filename_component(CMAKE_FIND_ROOT_PATH ${POWERPC_LIBRARIES} ABSOLUTE)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)
set(ENV{PKG_CONFIG_LIBDIR} ${CMAKE_FIND_ROOT_PATH}/lib/pkgconfig)
