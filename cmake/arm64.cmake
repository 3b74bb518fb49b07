# Toolchain of the preset arm64: a machine that orders memory accesses more freely.
set(CMAKE_SYSTEM_PROCESSOR aarch64)
include(${CMAKE_CURRENT_LIST_DIR}/cross.cmake)
