# Installs `headers`, relative to `sources`, below `destination`. There they include each other by the names that
# their users take, <bakjob/...>; the copies that say so are made in `copies`.
cmake_minimum_required(VERSION 3.25)

foreach(header IN LISTS headers)
  file(READ ${sources}/${header} text)
  string(REGEX MATCHALL "#include \"[^\"]+" includes "${text}")
  list(TRANSFORM includes REPLACE "#include \"" "")
  foreach(include IN LISTS includes)
    if(NOT include IN_LIST headers)
      message(FATAL_ERROR "${header} is a public header and includes ${include}, which is none (src/CMakeLists.txt)")
    endif()
  endforeach()
  string(REGEX REPLACE "#include \"([^\"]+)\"" "#include <bakjob/\\1>" text "${text}")
  # One that stays the same keeps its time, so that nobody compiles anew for it.
  file(CONFIGURE OUTPUT ${copies}/${header} CONTENT "${text}" @ONLY)
  cmake_path(GET header PARENT_PATH folder)
  file(INSTALL ${copies}/${header} DESTINATION "${CMAKE_INSTALL_PREFIX}/${destination}/${folder}")
endforeach()
