# Reads endpoints.txt. Sets AUTHSERVER_PROGRAMS, and makes http/endpoints.cpp and lighttpd.conf in
# the build folder.

set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS endpoints.txt)
file(STRINGS endpoints.txt lines REGEX "^[^#]")

set(AUTHSERVER_PROGRAMS)
set(table_rows)
set(programs_like_path)  # lighttpd finds them by the path alone
set(other_paths)
foreach(line IN LISTS lines)
  if(NOT line MATCHES "^([a-z_]+) +(/[^ ]+) +([A-Z,]+) +([a-z_]+|-) +(yes|no)$")
    message(FATAL_ERROR "endpoints.txt: this line does not describe an endpoint: ${line}")
  endif()
  set(program ${CMAKE_MATCH_1})
  set(path ${CMAKE_MATCH_2})
  string(REPLACE "," "\", \"" methods "${CMAKE_MATCH_3}")
  set(metadata_name ${CMAKE_MATCH_4})
  string(REPLACE yes true client_authenticates ${CMAKE_MATCH_5})
  string(REPLACE no false client_authenticates ${client_authenticates})
  if(metadata_name STREQUAL "-")
    set(metadata_name "")
  endif()

  list(APPEND AUTHSERVER_PROGRAMS ${program})
  string(APPEND table_rows
    "      {\"${program}\", \"${path}\", {\"${methods}\"}, \"${metadata_name}\","
    " ${client_authenticates}},\n")
  if(path STREQUAL /${program})
    list(APPEND programs_like_path ${program})
  else()
    string(APPEND other_paths
      "else $HTTP[\"url\"] == \"${path}\" {\n"
      "  alias.url = ( \"${path}\" => env.AUTHSERVER_PROGRAMS + \"/${program}\" )\n"
      "  cgi.assign = ( \"\" => \"\" )\n"
      "}\n")
  endif()
endforeach()
list(JOIN programs_like_path | programs_like_path)

configure_file(http/endpoints.cpp.in http/endpoints.cpp @ONLY)
configure_file(lighttpd.conf.in lighttpd.conf @ONLY)
