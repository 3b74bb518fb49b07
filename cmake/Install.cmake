# What is installed, in two components: runtime for a program that uses the library, development for
# one that is compiled with it. No installed file names the prefix, so that the tree can be moved.
include(CMakePackageConfigHelpers)
set(VOK_MEMPOOL_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/VokMemPool)

install(TARGETS VokMemPool EXPORT VokMemPoolTargets
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT runtime
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime NAMELINK_COMPONENT development
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT development)
install(FILES include/MemPool include/MemPoolAllocator include/MemPoolThreads
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/VokMemPool COMPONENT development)

write_basic_package_version_file(VokMemPoolConfigVersion.cmake COMPATIBILITY SameMajorVersion)
# The package needs nothing found first, so its configuration is the list of targets itself.
install(EXPORT VokMemPoolTargets
  FILE VokMemPoolConfig.cmake
  NAMESPACE VokMemPool::
  DESTINATION ${VOK_MEMPOOL_CMAKE_DIR} COMPONENT development)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/VokMemPoolConfigVersion.cmake
  DESTINATION ${VOK_MEMPOOL_CMAKE_DIR} COMPONENT development)

# The pages of section 3, and the function by which each setting is looked up as a link to one.
install(FILES
  docs/man/MemPoolAllocator.3
  docs/man/MemPoolThreads.3
  docs/man/VOK_MemPool.3
  docs/man/VOK_MemPool_Mgr.3
  DESTINATION ${CMAKE_INSTALL_MANDIR}/man3 COMPONENT development)
foreach(setting ON OFF BUCKET_SIZE MAX_RECORD_SIZE MIN_RECORD_SIZE DATA_ALIGNMENT
    KEEP_EMPTY_BUCKETS TRACE)
  set(VOK_MEMPOOL_LINK ${CMAKE_CURRENT_BINARY_DIR}/man/ZOR_VOK_MEMPOOL_${setting}.3)
  file(WRITE ${VOK_MEMPOOL_LINK} ".so man3/VOK_MemPool.3\n")
  install(FILES ${VOK_MEMPOOL_LINK}
    DESTINATION ${CMAKE_INSTALL_MANDIR}/man3 COMPONENT development)
endforeach()
install(FILES docs/man/libVokMemPool.7
  DESTINATION ${CMAKE_INSTALL_MANDIR}/man7 COMPONENT development)

# gdb loads it with the shared library, by the library's whole name: from its own folder, or from
# beside the library.
get_target_property(VOK_MEMPOOL_TYPE VokMemPool TYPE)
if(VOK_MEMPOOL_TYPE STREQUAL "SHARED_LIBRARY" AND CMAKE_SYSTEM_NAME STREQUAL "Linux")
  set(VOK_MEMPOOL_GDB_FOLDER ${CMAKE_INSTALL_LIBDIR})
  if(CMAKE_INSTALL_PREFIX STREQUAL "/usr")
    set(VOK_MEMPOOL_GDB_FOLDER ${CMAKE_INSTALL_DATADIR}/gdb/auto-load${CMAKE_INSTALL_FULL_LIBDIR})
  endif()
  install(FILES tools/gdb/libVokMemPool-gdb.py DESTINATION ${VOK_MEMPOOL_GDB_FOLDER}
    RENAME libVokMemPool.so.${PROJECT_VERSION}-gdb.py COMPONENT development)
endif()

# pkg-config finds the prefix from where the file lies, so both folders must lie below it.
if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}" OR IS_ABSOLUTE "${CMAKE_INSTALL_INCLUDEDIR}")
  message(FATAL_ERROR "CMAKE_INSTALL_LIBDIR and CMAKE_INSTALL_INCLUDEDIR are folders below the prefix")
endif()
file(RELATIVE_PATH VOK_MEMPOOL_UP /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
list(TRANSFORM CMAKE_DL_LIBS PREPEND -l OUTPUT_VARIABLE VOK_MEMPOOL_PRIVATE_LIBS)
configure_file(cmake/vokmempool.pc.in vokmempool.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/vokmempool.pc
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT development)

if(PROJECT_IS_TOP_LEVEL)
  add_custom_target(uninstall
    COMMAND ${CMAKE_COMMAND} -D MANIFEST=${CMAKE_CURRENT_BINARY_DIR}/install_manifest.txt
      -P ${CMAKE_CURRENT_SOURCE_DIR}/cmake/Uninstall.cmake
    COMMENT "Removing what the last installation put there"
    VERBATIM)
endif()
