# Options that hold for every target.
add_library(tavrel_options INTERFACE)

# Contraction is off so that every CPU gives the same bits for the same sum.
target_compile_options(tavrel_options INTERFACE
  -Wall -Wextra -Wpedantic -Werror
  -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor;-Woverloaded-virtual;-Wold-style-cast>
  -Wcast-align -Wdouble-promotion -Wformat=2 -Wimplicit-fallthrough
  -ffp-contract=off -fno-math-errno)

# When it optimises, GCC 12 sees overlapping copies inside std::string, and numbers taken for
# pointers where a value is destroyed, that are none. The other builds look for both.
target_compile_options(tavrel_options INTERFACE
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<CONFIG:Release>>:-Wno-restrict;-Wno-array-bounds>)

if(TAVREL_SANITIZE)
  # The sanitizers' own code makes GCC see uninitialised reads that are none.
  target_compile_options(tavrel_options INTERFACE
    -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer
    $<$<CXX_COMPILER_ID:GNU>:-Wno-maybe-uninitialized>)
  target_link_options(tavrel_options INTERFACE -fsanitize=address,undefined)
endif()
if(TAVREL_FUZZ)
  target_compile_options(tavrel_options INTERFACE
    -fsanitize=fuzzer-no-link,address,undefined -fno-sanitize-recover=all)
  target_link_options(tavrel_options INTERFACE -fsanitize=address,undefined)
endif()
