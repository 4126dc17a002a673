# Options that hold for every target.
add_library(tavrel_options INTERFACE)

# Contraction is off so that every CPU gives the same bits for the same sum.
target_compile_options(tavrel_options INTERFACE
  -Wall -Wextra -Wpedantic -Werror
  -Wconversion -Wsign-conversion -Wshadow -Wnon-virtual-dtor -Woverloaded-virtual
  -Wcast-align -Wold-style-cast -Wdouble-promotion -Wformat=2 -Wimplicit-fallthrough
  -ffp-contract=off -fno-math-errno)

if(TAVREL_SANITIZE)
  target_compile_options(tavrel_options INTERFACE
    -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
  target_link_options(tavrel_options INTERFACE -fsanitize=address,undefined)
endif()
if(TAVREL_FUZZ)
  target_compile_options(tavrel_options INTERFACE
    -fsanitize=fuzzer-no-link,address,undefined -fno-sanitize-recover=all)
  target_link_options(tavrel_options INTERFACE -fsanitize=address,undefined)
endif()
