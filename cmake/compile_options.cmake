# Options for every target.
add_library(tavrel_options INTERFACE)

# Contraction is off so that every CPU gives the same bits for the same sum.
target_compile_options(tavrel_options INTERFACE
  -Wall -Wextra -Wpedantic $<$<BOOL:${TAVREL_WERROR}>:-Werror>
  -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor;-Woverloaded-virtual;-Wold-style-cast>
  -Wcast-align -Wdouble-promotion -Wformat=2 -Wimplicit-fallthrough
  -ffp-contract=off -fno-math-errno)

# With optimisation, GCC 12 wrongly warns of overlapping and overlong copies inside std::string, and
# of numbers used as pointers where a value is destroyed. Other builds keep these warnings.
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  foreach(warning restrict array-bounds stringop-overflow stringop-overread)
    target_compile_options(tavrel_options INTERFACE $<$<CONFIG:Release>:-Wno-${warning}>)
  endforeach()
endif()

if(TAVREL_SANITIZE)
  # With the sanitizers' own code, GCC wrongly warns of uninitialised reads.
  target_compile_options(tavrel_options INTERFACE
    -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer
    $<$<CXX_COMPILER_ID:GNU>:-Wno-maybe-uninitialized>)
  target_link_options(tavrel_options INTERFACE -fsanitize=address,undefined)
endif()

# Tests are long functions that run once: under the sanitizers, optimising them
# takes longer than it saves.
add_library(tavrel_test_options INTERFACE)
target_link_libraries(tavrel_test_options INTERFACE tavrel_options)
target_compile_options(tavrel_test_options INTERFACE $<$<BOOL:${TAVREL_SANITIZE}>:-O0>)

# Reporting each comparison to libFuzzer would take a quarter to a third of the time; with
# the dictionaries, inputs reach as much code without.
if(TAVREL_FUZZ)
  target_compile_options(tavrel_options INTERFACE
    -fsanitize=fuzzer-no-link,address,undefined -fno-sanitize-coverage=trace-cmp
    -fno-sanitize-recover=all)
  target_link_options(tavrel_options INTERFACE -fsanitize=address,undefined)
endif()

# The flags with which distributions harden programs. Sanitizer builds have their own checks
# instead. _FORTIFY_SOURCE works only in optimised builds; without a build type, a packager's flags
# set it. Nobody interposes our functions, so position-independent code may be inlined.
if(TAVREL_HARDENING AND NOT TAVREL_SANITIZE AND NOT TAVREL_FUZZ)
  set(CMAKE_POSITION_INDEPENDENT_CODE ON)
  include(CheckPIESupported)
  check_pie_supported(LANGUAGES CXX)
  include(CheckCXXCompilerFlag)
  foreach(flag -fstack-protector-strong -fstack-clash-protection -fcf-protection)
    string(MAKE_C_IDENTIFIER "TAVREL_HAS${flag}" has)
    check_cxx_compiler_flag(${flag} ${has})
    target_compile_options(tavrel_options INTERFACE $<$<BOOL:${${has}}>:${flag}>)
  endforeach()
  target_compile_options(tavrel_options INTERFACE
    -Werror=format-security -fno-semantic-interposition
    $<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-U_FORTIFY_SOURCE;-D_FORTIFY_SOURCE=2>)
  target_link_options(tavrel_options INTERFACE -Wl,-z,relro,-z,now)
endif()
