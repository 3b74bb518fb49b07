# A Windows program looks for DLLs in its own folder first, so programs, the library and what it
# needs of the compiler's run-time stand in one.
set(CMAKE_RUNTIME_OUTPUT_DIRECTORY ${PROJECT_BINARY_DIR}/bin)
foreach(dll libstdc++-6 libgcc_s_seh-1 libgcc_s_dw2-1 libwinpthread-1)
  execute_process(
    COMMAND ${CMAKE_CXX_COMPILER} -print-file-name=${dll}.dll
    OUTPUT_VARIABLE path OUTPUT_STRIP_TRAILING_WHITESPACE)
  # An unknown name comes back as it is: of the two libgcc a compiler has one.
  if(EXISTS ${path})
    file(COPY ${path} DESTINATION ${CMAKE_RUNTIME_OUTPUT_DIRECTORY})
  endif()
endforeach()
