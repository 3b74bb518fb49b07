"""The recipe of Conan 2, of the sources around it: conan create packaging/conan

Not run by Conan itself; checked by Python's ast. The test install.consumers runs the static
configuration and installation that it asks for."""
import pathlib
import re

from conan import ConanFile
from conan.tools.cmake import CMake, CMakeToolchain, cmake_layout
from conan.tools.files import copy, load


class VokMemPool(ConanFile):
    name = "vokmempool"
    description = "Named pools of small records for the programs and libraries of one process"
    license = "MIT"
    package_type = "library"
    settings = "os", "arch", "compiler", "build_type"
    options = {"shared": [True, False]}
    default_options = {"shared": True}

    def _sources(self):
        return pathlib.Path(self.recipe_folder).parent.parent

    def set_version(self):
        project = load(self, self._sources() / "CMakeLists.txt")
        self.version = re.search(r"VERSION (\d+\.\d+\.\d+)", project).group(1)

    def export_sources(self):
        for pattern in ("CMakeLists.txt", "LICENSE", "cmake/*", "docs/man/*", "include/*", "s/*",
                        "tarnkit/*"):
            copy(self, pattern, self._sources(), self.export_sources_folder)

    def layout(self):
        cmake_layout(self)

    def generate(self):
        CMakeToolchain(self).generate()

    def build(self):
        cmake = CMake(self)
        cmake.configure()
        cmake.build()

    def package(self):
        CMake(self).install()
        copy(self, "LICENSE", self.source_folder, pathlib.Path(self.package_folder) / "licenses")

    def package_info(self):
        self.cpp_info.libs = ["VokMemPool"]
        self.cpp_info.includedirs = ["include/VokMemPool"]
        self.cpp_info.set_property("cmake_file_name", "VokMemPool")
        self.cpp_info.set_property("cmake_target_name", "VokMemPool::VokMemPool")
        self.cpp_info.set_property("pkg_config_name", "vokmempool")
        if not self.options.shared:
            self.cpp_info.defines = ["VOK_MEMPOOL_STATIC"]
            if self.settings.os == "Linux":
                self.cpp_info.system_libs = ["dl"]
