# Makes the installed programs start fast. Most runs of the daemon find the day already done, and
# then the dynamic linker costs more than the run itself.
#
# The C++ runtime is linked statically: it accounts for half of all symbols that the dynamic linker
# would have to look up at each start. SQLite, Expat, libmd and libc, which parse outside data and
# receive security updates, stay shared.
include(CheckLinkerFlag)

add_library(tavrel_program_start INTERFACE)

# Packed relocations need C library 2.36 or later, both at build time and where the program runs.
check_linker_flag(CXX -Wl,-z,pack-relative-relocs TAVREL_HAS_PACKED_RELOCATIONS)

if(CMAKE_CXX_COMPILER_ID STREQUAL GNU AND NOT TAVREL_SANITIZE)
  target_link_options(tavrel_program_start INTERFACE
    -static-libstdc++ -static-libgcc -Wl,-O1 -Wl,--gc-sections -Wl,--as-needed
    $<$<BOOL:${TAVREL_HAS_PACKED_RELOCATIONS}>:-Wl,-z,pack-relative-relocs>)
endif()
