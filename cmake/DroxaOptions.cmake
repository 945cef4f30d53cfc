# Compile options that every target shares: warnings are errors, and one sanitizer set per build.
add_compile_options(-Wall -Wextra -Wconversion -Wshadow -Werror -fno-omit-frame-pointer)
if(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  add_compile_options(-Wthread-safety -Wthread-safety-beta)
endif()

set(DROXA_SANITIZE "" CACHE STRING "Value of -fsanitize for the whole build, empty for none")
if(DROXA_SANITIZE)
  add_compile_options(-fsanitize=${DROXA_SANITIZE} -fno-sanitize-recover=all)
  add_link_options(-fsanitize=${DROXA_SANITIZE})
endif()

option(DROXA_FUZZ "Build the fuzz targets (clang only)" OFF)
if(DROXA_FUZZ)
  # The fuzzer is guided by what it reaches in the libraries, not in its own target alone.
  add_compile_options(-fsanitize=fuzzer-no-link)
endif()

find_program(CCACHE_PROGRAM ccache)
if(CCACHE_PROGRAM)
  set(CMAKE_CXX_COMPILER_LAUNCHER ${CCACHE_PROGRAM})
endif()
