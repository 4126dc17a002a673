# What makes the installed programs start fast. Most runs of the daemon find the day done, and the
# dynamic linker then costs more than the run.
#
# The C++ runtime is linked in: half of all symbols that the linker would have to look up at each
# start are its own. SQLite, Expat, libmd and libc, which parse what comes from outside and get
# security updates, stay shared.
include(CheckLinkerFlag)

add_library(tavrel_program_start INTERFACE)

# Packed relocations need a C library of 2.36 or later, at build time and where the program runs.
check_linker_flag(CXX -Wl,-z,pack-relative-relocs TAVREL_HAS_PACKED_RELOCATIONS)

if(CMAKE_CXX_COMPILER_ID STREQUAL GNU AND NOT TAVREL_SANITIZE)
  target_link_options(tavrel_program_start INTERFACE
    -static-libstdc++ -static-libgcc -Wl,-O1 -Wl,--gc-sections -Wl,--as-needed
    $<$<BOOL:${TAVREL_HAS_PACKED_RELOCATIONS}>:-Wl,-z,pack-relative-relocs>)
endif()
