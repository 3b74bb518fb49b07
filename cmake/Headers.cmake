# Each header stands alone: one generated source a header, with nothing but its include.
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

# A public header under each standard that it promises, by each compiler at hand. A template is only
# looked at when it is instantiated: `instance` is one.
function(vok_public_header name instance)
  set(source ${CMAKE_CURRENT_BINARY_DIR}/alone/${name}.cpp)
  file(CONFIGURE OUTPUT ${source} CONTENT
    "#include <${name}>\n#include <${name}>\ntemplate class ${instance};\n")
  separate_arguments(flags NATIVE_COMMAND "${CMAKE_CXX_FLAGS}")
  foreach(compiler g++ clang++)
    find_program(VOK_MEMPOOL_${compiler} ${compiler})
    foreach(standard IN LISTS ARGN)
      if(VOK_MEMPOOL_${compiler})
        add_test(NAME header.${name}.${compiler}.c++${standard}
          COMMAND ${VOK_MEMPOOL_${compiler}} ${flags} -std=c++${standard} -fsyntax-only
            -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wundef -Werror
            -I${PROJECT_SOURCE_DIR}/include ${source})
      endif()
    endforeach()
  endforeach()
endfunction()

vok_public_header(MemPool "VOK::vector<int>" 11 14 17 20)
vok_public_header(MemPoolAllocator "VOK::MemPool::Allocator<int>" 17 20)
