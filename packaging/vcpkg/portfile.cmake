# The port of vcpkg, of the sources around it: vcpkg install vokmempool --overlay-ports=packaging/vcpkg
# Not run by vcpkg itself; checked by `cmake -P` with stubs of its functions. The test
# install.consumers runs the static configuration and installation that it asks for.
vcpkg_cmake_configure(SOURCE_PATH "${CURRENT_PORT_DIR}/../..")
vcpkg_cmake_install()
vcpkg_cmake_config_fixup(CONFIG_PATH lib/cmake/VokMemPool)
vcpkg_fixup_pkgconfig()
file(REMOVE_RECURSE "${CURRENT_PACKAGES_DIR}/debug/include" "${CURRENT_PACKAGES_DIR}/debug/share")
vcpkg_install_copyright(FILE_LIST "${CURRENT_PORT_DIR}/../../LICENSE")
