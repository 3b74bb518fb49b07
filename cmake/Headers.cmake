# Each header stands alone: one generated source a header, with nothing but its include. Once for
# each of this machine's compilers is enough.
if(CMAKE_BUILD_TYPE STREQUAL "Release" AND NOT CMAKE_CROSSCOMPILING)
  file(GLOB headers CONFIGURE_DEPENDS RELATIVE ${PROJECT_SOURCE_DIR}
    ${PROJECT_SOURCE_DIR}/s/*/*.h ${PROJECT_SOURCE_DIR}/tarnkit/*.h)
  set(sources)
  foreach(header IN LISTS headers)
    set(source ${CMAKE_CURRENT_BINARY_DIR}/alone/${header}.cpp)
    file(CONFIGURE OUTPUT ${source} CONTENT "#include \"${header}\"\n")
    list(APPEND sources ${source})
  endforeach()
  add_library(HeadersAlone OBJECT ${sources})
  target_compile_features(HeadersAlone PRIVATE cxx_std_20)
  target_include_directories(HeadersAlone PRIVATE
    ${PROJECT_SOURCE_DIR} ${PROJECT_SOURCE_DIR}/s ${PROJECT_SOURCE_DIR}/include)
  target_link_libraries(HeadersAlone PRIVATE VokMemPoolWarnings)
endif()

# A public header under each standard that it promises, by the preset's compiler, and by clang++
# where it compiles for this machine. A template is only looked at when it is instantiated:
# `instance` is one.
find_program(VOK_MEMPOOL_CLANG clang++)
function(vok_public_header name instance)
  set(source ${CMAKE_CURRENT_BINARY_DIR}/alone/${name}.cpp)
  file(CONFIGURE OUTPUT ${source} CONTENT
    "#include <${name}>\n#include <${name}>\ntemplate class ${instance};\n")
  set(compilers ${CMAKE_CXX_COMPILER})
  if(VOK_MEMPOOL_CLANG AND CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND NOT CMAKE_CROSSCOMPILING)
    list(APPEND compilers ${VOK_MEMPOOL_CLANG})
  endif()
  foreach(compiler IN LISTS compilers)
    cmake_path(GET compiler FILENAME label)
    foreach(standard IN LISTS ARGN)
      add_test(NAME header.${name}.${label}.c++${standard}
        COMMAND ${compiler} -std=c++${standard} -fsyntax-only
          -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wundef -Werror
          -I${PROJECT_SOURCE_DIR}/include ${source})
    endforeach()
  endforeach()
endfunction()

vok_public_header(MemPool "VOK::vector<int>" 11 14 17 20)
vok_public_header(MemPoolAllocator "VOK::MemPool::Allocator<int>" 17 20)
vok_public_header(MemPoolThreads "VOK::MemPool::ThreadAllocator<int>" 17 20)
