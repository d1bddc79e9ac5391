# A built program finds its libraries in the build's folders. An installed one has no run path. A
# run path that CMake changes on installing would end with an empty entry. The loader reads that as
# the current folder, where anybody may have put a library.

function(set_run_path target)  # FOLDER...
  set(folders ${ARGN})
  if(CMAKE_CROSSCOMPILING)  # the target's libraries lie in a folder of their own
    list(APPEND folders ${JsonCpp_LIBRARY_DIRS})
  endif()
  set_target_properties(${target} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON INSTALL_RPATH "${folders}")
endfunction()

# Call this after install(TARGETS), with the same folder and component.
function(install_without_run_path target folder)  # COMPONENT...
  set(installed "\$ENV{DESTDIR}\${CMAKE_INSTALL_PREFIX}/${folder}/$<TARGET_FILE_NAME:${target}>")
  install(CODE "file(RPATH_REMOVE FILE \"${installed}\")" COMPONENT ${ARGN})
endfunction()
