# Toolchain of the preset linux32: 32-bit programs, beside this machine's own 32-bit libraries: with
# the C library of the cross compiler the child of a fork never returns from it under qemu-i386.
set(CMAKE_SYSTEM_PROCESSOR i686)
include(${CMAKE_CURRENT_LIST_DIR}/cross.cmake)
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-i386)
