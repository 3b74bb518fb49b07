# Toolchain of the preset s390x: a machine that stores the high byte of a number first.
set(CMAKE_SYSTEM_PROCESSOR s390x)
include(${CMAKE_CURRENT_LIST_DIR}/cross.cmake)
