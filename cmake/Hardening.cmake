# VokMemPoolHardening: what a release is hardened by, against a fault in any of its callers. Linux
# alone: the other platforms' linkers have none of it.
add_library(VokMemPoolHardening INTERFACE)
if(CMAKE_SYSTEM_NAME STREQUAL "Linux")
  target_link_options(VokMemPoolHardening INTERFACE -Wl,-z,relro,-z,now)
  if(NOT CMAKE_CXX_FLAGS MATCHES "-fsanitize")
    # It asks for an optimised build, which None is, a distribution's own; that may have set a level.
    set(fortify "-U_FORTIFY_SOURCE;-D_FORTIFY_SOURCE=3")
    target_compile_options(VokMemPoolHardening INTERFACE
      "$<$<CONFIG:Release,RelWithDebInfo,MinSizeRel,None>:${fortify}>"
      -fstack-clash-protection)
    if(CMAKE_SYSTEM_PROCESSOR MATCHES "x86|amd64|AMD64|i.86")
      target_compile_options(VokMemPoolHardening INTERFACE -fcf-protection)
    endif()
  endif()
endif()
