# Toolchain of the preset linux32: 32-bit programs from this machine's own g++. Where the kernel
# can't start them, as in many virtual machines, qemu-i386 does.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR i686)
set(CMAKE_CXX_COMPILER g++)
set(CMAKE_CXX_FLAGS_INIT -m32)

get_property(inTryCompile GLOBAL PROPERTY IN_TRY_COMPILE)
if(NOT inTryCompile AND NOT DEFINED CACHE{CMAKE_CROSSCOMPILING_EMULATOR})
  set(probe ${CMAKE_BINARY_DIR}/probe32)
  file(WRITE ${probe}.cpp "int main() {}\n")
  execute_process(
    COMMAND ${CMAKE_CXX_COMPILER} -m32 ${probe}.cpp -o ${probe}
    COMMAND_ERROR_IS_FATAL ANY)
  execute_process(COMMAND ${probe} RESULT_VARIABLE started OUTPUT_QUIET ERROR_QUIET)
  if(started EQUAL 0)
    set(launcher "")
  else()
    find_program(QEMU_I386 qemu-i386 REQUIRED)
    set(launcher ${QEMU_I386})
  endif()
  set(CMAKE_CROSSCOMPILING_EMULATOR "${launcher}" CACHE STRING "What starts a 32-bit program")
endif()
