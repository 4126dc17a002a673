# Options that hold for every target.
add_library(tavrel_options INTERFACE)

# Contraction is off so that every CPU gives the same bits for the same sum.
target_compile_options(tavrel_options INTERFACE
  -Wall -Wextra -Wpedantic -Werror
  -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor;-Woverloaded-virtual;-Wold-style-cast>
  -Wcast-align -Wdouble-promotion -Wformat=2 -Wimplicit-fallthrough
  -ffp-contract=off -fno-math-errno)

# With optimisation, GCC 12 wrongly warns of overlapping copies inside std::string, and of numbers
# used as pointers where a value is destroyed. The other builds have both warnings.
target_compile_options(tavrel_options INTERFACE
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<CONFIG:Release>>:-Wno-restrict;-Wno-array-bounds>)

if(TAVREL_SANITIZE)
  # With the sanitizers' own code, GCC wrongly warns of uninitialised reads.
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
