# `cmake --install`: the headers but the private ones, the libraries, the CMake package (find_package(kel)
# gives kel::kel and kel::kel_static) and kel.pc, where GNUInstallDirs says. The build folder is a CMake
# package too: -Dkel_DIR names it.
#
# The version file refuses a program of the other word size, so that both libraries may be
# installed side by side and each program finds its own.
include(CMakePackageConfigHelpers)

set(KEL_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/kel)

set(libraries kel)
if(KEL_BUILD_STATIC)
  list(APPEND libraries kel_static)
endif()
install(TARGETS ${libraries} EXPORT kel
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR})
install(DIRECTORY kel DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
    FILES_MATCHING PATTERN *.h PATTERN *.inc PATTERN internal EXCLUDE)
install(FILES ${PROJECT_BINARY_DIR}/include/kel/version.h DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kel)
install(FILES LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR})

install(EXPORT kel NAMESPACE kel:: FILE kel-config.cmake DESTINATION ${KEL_PACKAGE_DIR})
export(EXPORT kel NAMESPACE kel:: FILE ${PROJECT_BINARY_DIR}/kel-config.cmake)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/kel-config-version.cmake
    COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/kel-config-version.cmake DESTINATION ${KEL_PACKAGE_DIR})

# kel.pc finds the tree from its own place, so the tree may be moved and --prefix may name another.
cmake_path(RELATIVE_PATH CMAKE_INSTALL_PREFIX BASE_DIRECTORY ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig
    OUTPUT_VARIABLE KEL_PC_PREFIX)
cmake_path(APPEND KEL_PC_LIBDIR "\${prefix}" ${CMAKE_INSTALL_LIBDIR})
cmake_path(APPEND KEL_PC_INCLUDEDIR "\${prefix}" ${CMAKE_INSTALL_INCLUDEDIR})
configure_file(packaging/kel.pc.in ${PROJECT_BINARY_DIR}/kel.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/kel.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
