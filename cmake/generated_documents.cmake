# Completions and manual pages that the built tools generate from their own commands:
#
#   BUILD/completions/bash/PROGRAM, zsh/_PROGRAM, fish/PROGRAM.fish of tavrelctl and tavrel-fleet
#   BUILD/man/PROGRAM.1 of both
#
# A cross build needs CMAKE_CROSSCOMPILING_EMULATOR to run the tools; without it, it makes none.
if(CMAKE_CROSSCOMPILING AND NOT CMAKE_CROSSCOMPILING_EMULATOR)
  message(WARNING "No completions and pages of tools: set CMAKE_CROSSCOMPILING_EMULATOR")
  return()
endif()

set(tavrel_generated_documents)

# Writes what `PROGRAM completion ARGUMENTS` prints to a file in the build folder.
function(tavrel_generated_document file program)
  cmake_parse_arguments(ARG "" "" "ARGUMENTS;DEPENDS" ${ARGN})
  set(path ${PROJECT_BINARY_DIR}/${file})
  get_filename_component(folder ${path} DIRECTORY)
  file(MAKE_DIRECTORY ${folder})
  add_custom_command(
    OUTPUT ${path}
    COMMAND ${program} completion ${ARG_ARGUMENTS} > ${path}.new
    COMMAND ${CMAKE_COMMAND} -E rename ${path}.new ${path}
    DEPENDS ${program} ${ARG_DEPENDS}
    COMMENT "Generating ${file}"
    VERBATIM)
  set(tavrel_generated_documents ${tavrel_generated_documents} ${path} PARENT_SCOPE)
endfunction()

set(completed_programs tavrelctl)
if(TAVREL_FLEET)
  list(APPEND completed_programs tavrel-fleet)
endif()
foreach(program IN LISTS completed_programs)
  tavrel_generated_document(completions/bash/${program} ${program} ARGUMENTS bash)
  tavrel_generated_document(completions/zsh/_${program} ${program} ARGUMENTS zsh)
  tavrel_generated_document(completions/fish/${program}.fish ${program} ARGUMENTS fish)
  set(template ${PROJECT_SOURCE_DIR}/packaging/man/${program}.1.in)
  tavrel_generated_document(man/${program}.1 ${program} ARGUMENTS man ${template}
    DEPENDS ${template})
endforeach()

add_custom_target(tavrel_documents ALL DEPENDS ${tavrel_generated_documents})
