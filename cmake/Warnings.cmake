# VokMemPoolWarnings: the warnings that our own targets are built with, all of them errors. A user's
# build has none: what a compiler of tomorrow finds must not keep it from ending.
add_library(VokMemPoolWarnings INTERFACE)
if(NOT VOK_MEMPOOL_DEVELOPER)
  return()
endif()

if(CMAKE_CXX_COMPILER_ID MATCHES "Clang")
  target_compile_options(VokMemPoolWarnings INTERFACE
    -Werror
    -Weverything
    # This is C++20; what C++98 and C++17 lacked is no news.
    -Wno-c++98-compat
    -Wno-c++98-compat-pedantic
    -Wno-c++20-compat
    -Wno-pre-c++20-compat-pedantic
    # A switch without a default must name all values, -Wswitch says so; one with a default need not.
    -Wno-switch-enum
    # A layout's gaps are fixed by static_asserts where they matter.
    -Wno-padded
    # The registry and the settings start with the library and end with it, by design.
    -Wno-global-constructors
    -Wno-exit-time-destructors
    # GoogleTest's macros use what they mark as unused.
    -Wno-used-but-marked-unused
    # The table of a test does two short things in one lambda.
    -Wno-comma
    # An adaptor that is a header alone has no other place for its virtual table.
    -Wno-weak-vtables)
elseif(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  target_compile_options(VokMemPoolWarnings INTERFACE
    -Werror
    -Wall
    -Wextra
    -Wpedantic
    -Wshadow
    -Wconversion
    -Wsign-conversion
    -Wundef
    -Wold-style-cast
    -Wcast-qual
    -Wcast-align
    -Wnon-virtual-dtor
    -Woverloaded-virtual
    -Wduplicated-cond
    -Wduplicated-branches
    -Wlogical-op
    -Wnull-dereference
    -Wformat=2
    -Wredundant-decls)
  if(CMAKE_CXX_FLAGS MATCHES "-fsanitize")
    # Under sanitizers g++ 12 finds uninitialised members in the standard library's own regex.
    target_compile_options(VokMemPoolWarnings INTERFACE -Wno-maybe-uninitialized)
  endif()
endif()
