# Hardens every release build. Other builds are for finding mistakes. Sanitizers check more than
# hardening does, and do not know the functions by which _FORTIFY_SOURCE replaces the C library's.

include(CheckCXXCompilerFlag)

if(CMAKE_CXX_FLAGS MATCHES "-fsanitize=")
  return()
endif()

set(hardening -fstack-protector-strong -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2)
foreach(protection stack-clash cf)  # only if the target has it: PowerPC has no -fcf-protection
  string(MAKE_C_IDENTIFIER HAS_${protection}_protection has)
  set(flag -f${protection}-protection)
  check_cxx_compiler_flag(${flag} ${has})
  if(${has})
    list(APPEND hardening ${flag})
  endif()
endforeach()

set(release $<CONFIG:RelWithDebInfo,Release,MinSizeRel>)
set(program $<STREQUAL:$<TARGET_PROPERTY:TYPE>,EXECUTABLE>)
set(library $<STREQUAL:$<TARGET_PROPERTY:TYPE>,SHARED_LIBRARY>)
target_compile_options(zevooauth_flags INTERFACE
  "$<${release}:${hardening}>" "$<$<AND:${release},$<NOT:${library}>>:-fPIE>")
target_link_options(zevooauth_flags INTERFACE
  "$<${release}:LINKER:-z,relro,-z,now,-z,noexecstack>" "$<$<AND:${release},${program}>:-pie>")
