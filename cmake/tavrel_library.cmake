# tavrel_library(NAME FOLDER [DEPENDS target...] [PRIVATE target...] [EXCLUDE file...])
#
# A library target of all sources in one folder. Headers are included by their path from the
# top ("base/plist.h"), but each target offers only its own: they are linked into a separate
# folder in the build tree, so that including a header of a folder that the target does not
# depend on fails to build.
function(tavrel_library name folder)
  cmake_parse_arguments(ARG "" "" "DEPENDS;PRIVATE;EXCLUDE" ${ARGN})

  set(include_root ${PROJECT_BINARY_DIR}/include/${name})
  file(MAKE_DIRECTORY ${include_root}/${folder})
  file(GLOB headers CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/${folder}/*.h)
  foreach(header IN LISTS headers)
    get_filename_component(file ${header} NAME)
    file(CREATE_LINK ${header} ${include_root}/${folder}/${file} SYMBOLIC)
  endforeach()

  file(GLOB sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/${folder}/*.cc)
  foreach(file IN LISTS ARG_EXCLUDE)
    list(REMOVE_ITEM sources ${PROJECT_SOURCE_DIR}/${folder}/${file})
  endforeach()

  if(sources)
    add_library(${name} STATIC ${sources})
    target_include_directories(${name} PUBLIC ${include_root})
    target_link_libraries(${name} PUBLIC ${ARG_DEPENDS} PRIVATE ${ARG_PRIVATE} tavrel_options)
    if(TAVREL_PRECOMPILED_FROM)
      target_precompile_headers(${name} REUSE_FROM ${TAVREL_PRECOMPILED_FROM})
    endif()
  else()
    add_library(${name} INTERFACE)
    target_include_directories(${name} INTERFACE ${include_root})
    target_link_libraries(${name} INTERFACE ${ARG_DEPENDS} ${ARG_PRIVATE})
  endif()
endfunction()

# tavrel_test(NAME FOLDER DEPENDS target...)
#
# A test program of all sources in tests/FOLDER.
function(tavrel_test name folder)
  cmake_parse_arguments(ARG "" "" "DEPENDS" ${ARGN})
  file(GLOB sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/${folder}/*.cc)
  if(NOT sources)
    return()
  endif()
  add_executable(${name} ${sources})
  target_link_libraries(${name} PRIVATE ${ARG_DEPENDS} GTest::gtest_main tavrel_test_options)
  if(TAVREL_PRECOMPILED_FROM)
    target_precompile_headers(${name} REUSE_FROM ${TAVREL_PRECOMPILED_FROM})
  endif()
  gtest_discover_tests(${name} DISCOVERY_TIMEOUT 60)
endfunction()
