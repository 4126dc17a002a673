# Precompiles headers that most sources need and that take long to compile, but only in the builds
# that nobody works with from day to day: release, sanitizer and pure fuzzing builds. The other
# builds go without, so that they show when a source lacks an include.
#
# tavrel_precompiled_headers(NAME HEADERS <header>... [LINK target...] [OPTIONS target])
#
# Makes a target that owns the headers, compiled with the options of the target OPTIONS (default:
# tavrel_options). Libraries and tests below the calling folder use them.
function(tavrel_precompiled_headers name)
  cmake_parse_arguments(ARG "" "OPTIONS" "HEADERS;LINK" ${ARGN})
  if(NOT CMAKE_BUILD_TYPE STREQUAL Release AND NOT TAVREL_SANITIZE
      AND NOT (TAVREL_FUZZ AND NOT TAVREL_TESTS))
    return()
  endif()
  set(source ${CMAKE_CURRENT_BINARY_DIR}/${name}.cc)
  file(CONFIGURE OUTPUT ${source} CONTENT "// Owns precompiled headers.\n")
  if(NOT ARG_OPTIONS)
    set(ARG_OPTIONS tavrel_options)
  endif()
  add_library(${name} STATIC ${source})
  target_link_libraries(${name} PRIVATE ${ARG_LINK} ${ARG_OPTIONS})
  target_precompile_headers(${name} PRIVATE ${ARG_HEADERS})
  set(TAVREL_PRECOMPILED_FROM ${name} PARENT_SCOPE)
endfunction()
