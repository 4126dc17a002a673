# Completions and manual pages that the built tool makes of its own commands:
#
#   BUILD/completions/bash/tavrelctl, zsh/_tavrelctl, fish/tavrelctl.fish
#   BUILD/man/tavrelctl.1
#
# A cross build needs CMAKE_CROSSCOMPILING_EMULATOR to run the tool, and has none of them without.
if(CMAKE_CROSSCOMPILING AND NOT CMAKE_CROSSCOMPILING_EMULATOR)
  message(WARNING "No completions and no tavrelctl(1): set CMAKE_CROSSCOMPILING_EMULATOR")
  return()
endif()

set(tavrel_generated_documents)

# What `tavrelctl completion ARGUMENTS` prints, in a file of the build folder.
function(tavrel_generated_document file)
  cmake_parse_arguments(ARG "" "" "ARGUMENTS;DEPENDS" ${ARGN})
  set(path ${PROJECT_BINARY_DIR}/${file})
  get_filename_component(folder ${path} DIRECTORY)
  file(MAKE_DIRECTORY ${folder})
  add_custom_command(
    OUTPUT ${path}
    COMMAND tavrelctl completion ${ARG_ARGUMENTS} > ${path}.new
    COMMAND ${CMAKE_COMMAND} -E rename ${path}.new ${path}
    DEPENDS tavrelctl ${ARG_DEPENDS}
    COMMENT "Generating ${file}"
    VERBATIM)
  set(tavrel_generated_documents ${tavrel_generated_documents} ${path} PARENT_SCOPE)
endfunction()

tavrel_generated_document(completions/bash/tavrelctl ARGUMENTS bash)
tavrel_generated_document(completions/zsh/_tavrelctl ARGUMENTS zsh)
tavrel_generated_document(completions/fish/tavrelctl.fish ARGUMENTS fish)
set(template ${PROJECT_SOURCE_DIR}/packaging/man/tavrelctl.1.in)
tavrel_generated_document(man/tavrelctl.1 ARGUMENTS man ${template} DEPENDS ${template})

add_custom_target(tavrel_documents ALL DEPENDS ${tavrel_generated_documents})
