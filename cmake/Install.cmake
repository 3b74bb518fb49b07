# What is installed, in two components: runtime for a program that uses the library, development for
# one that is compiled with it. No installed file names the prefix, so that the tree can be moved.
include(CMakePackageConfigHelpers)
set(VOK_MEMPOOL_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/VokMemPool)

install(TARGETS VokMemPool EXPORT VokMemPoolTargets
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT runtime
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime NAMELINK_COMPONENT development
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT development)
install(FILES include/MemPool include/MemPoolAllocator
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/VokMemPool COMPONENT development)

write_basic_package_version_file(VokMemPoolConfigVersion.cmake COMPATIBILITY SameMajorVersion)
# The package needs nothing found first, so its configuration is the list of targets itself.
install(EXPORT VokMemPoolTargets
  FILE VokMemPoolConfig.cmake
  NAMESPACE VokMemPool::
  DESTINATION ${VOK_MEMPOOL_CMAKE_DIR} COMPONENT development)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/VokMemPoolConfigVersion.cmake
  DESTINATION ${VOK_MEMPOOL_CMAKE_DIR} COMPONENT development)

# pkg-config finds the prefix from where the file lies.
file(RELATIVE_PATH VOK_MEMPOOL_UP /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
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
