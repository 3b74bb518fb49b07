# The target doc: the public headers and the documents as pages to browse, in build/<preset>/doc/html.
# A reference that leads nowhere and a parameter that isn't documented fail it.
find_package(Doxygen QUIET)
if(NOT DOXYGEN_FOUND)
  message(STATUS "No target doc: Doxygen is not installed")
  return()
endif()
set(DOXYGEN_OUTPUT_DIRECTORY doc)
set(DOXYGEN_PROJECT_BRIEF ${PROJECT_DESCRIPTION})
set(DOXYGEN_USE_MDFILE_AS_MAINPAGE README.md)
set(DOXYGEN_EXTENSION_MAPPING no_extension=C++)
set(DOXYGEN_EXCLUDE_SYMBOLS VOK::MemPool::Detail)
set(DOXYGEN_MACRO_EXPANSION YES)
set(DOXYGEN_EXPAND_ONLY_PREDEF YES)
set(DOXYGEN_PREDEFINED VOK_MEMPOOL_API=)
set(DOXYGEN_FILTER_PATTERNS "*.md=sed -z -E -f ${PROJECT_SOURCE_DIR}/docs/doxygen.sed")
set(DOXYGEN_IMAGE_PATH docs)
set(DOXYGEN_EXTRACT_ALL YES)
set(DOXYGEN_JAVADOC_AUTOBRIEF YES)
set(DOXYGEN_WARN_AS_ERROR FAIL_ON_WARNINGS)
file(GLOB documents CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/docs/*.md)
doxygen_add_docs(doc
  include/MemPool include/MemPoolAllocator include/MemPoolThreads README.md ${documents}
  WORKING_DIRECTORY ${PROJECT_SOURCE_DIR}
  COMMENT "Writing the pages of the public headers")
