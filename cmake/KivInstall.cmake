# What `cmake --install` puts into a prefix: libkivimaging.so, the headers a
# client compiles against, the kivimaging program, a CMake package
# (find_package(kivimaging CONFIG) -> kivimaging::kivimaging), a pkg-config
# file and the README. Nothing installed refers back to the build or source
# tree, and the package and pkg-config files find the prefix from where they
# are, so an installed tree can be moved.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

# The headers a client needs, one a line, installed flat under
# include/kivimaging/. Each must compile on its own from the installed tree
# (tests/install checks every one), so a header listed here includes only
# other public headers and system ones.
set(KIV_PUBLIC_HEADERS
  core/KivImaging.h                      # effect C API over one effect (KivImaging_*)
  core/VFilterBufferedProcessor.h        # offline processor (BufferedProcessor_*)
  include/kivimaging/KivFilterPlugin.h   # SDK of downloadable filter libraries
)
# The image core's C API keeps its vccore/ folder: its headers include each
# other by that name.
file(GLOB KIV_PUBLIC_VCCORE_HEADERS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/vccore/include/vccore/*.h)

set(KIV_CMAKE_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/kivimaging)

# libkivimaging.so.MAJOR is what programs record; the image core is inside it
# and is not installed as its own archive, so that a client holds one option
# registry and one log hook, never two.
set_target_properties(kivimaging PROPERTIES
  VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
target_include_directories(kivimaging INTERFACE
  $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>
  $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/kivimaging>)

# VFilterBufferedProcessor.h takes JNI types. A device's sysroot has jni.h; on
# a host the client is pointed at the JDK the library was built with.
get_target_property(kiv_jni_includes kiv_jni INTERFACE_INCLUDE_DIRECTORIES)
set(KIV_PC_JNI_CFLAGS "")
if(kiv_jni_includes)
  foreach(dir ${kiv_jni_includes})
    target_include_directories(kivimaging SYSTEM INTERFACE $<INSTALL_INTERFACE:${dir}>)
    string(APPEND KIV_PC_JNI_CFLAGS " -I${dir}")
  endforeach()
endif()

install(TARGETS kivimaging EXPORT kivimaging-targets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
install(FILES ${KIV_PUBLIC_HEADERS} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kivimaging)
install(FILES ${KIV_PUBLIC_VCCORE_HEADERS} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kivimaging/vccore)

# The host video library, opened at run time by the program and the library
# (from their own folder or the library folder) when video is read or written.
if(TARGET kivhostvideo)
  install(TARGETS kivhostvideo LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR})
endif()

# The command-line program (its target name yields "kivimaging" to the library).
if(TARGET kivimaging_cli)
  install(TARGETS kivimaging_cli RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
endif()

install(FILES ${PROJECT_SOURCE_DIR}/README.md DESTINATION ${CMAKE_INSTALL_DOCDIR})

install(EXPORT kivimaging-targets NAMESPACE kivimaging:: DESTINATION ${KIV_CMAKE_PACKAGE_DIR})
configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/kivimaging-config.cmake.in
  ${CMAKE_CURRENT_BINARY_DIR}/kivimaging-config.cmake INSTALL_DESTINATION ${KIV_CMAKE_PACKAGE_DIR})
# Interfaces may still change while the major version is 0.
write_basic_package_version_file(${CMAKE_CURRENT_BINARY_DIR}/kivimaging-config-version.cmake
  COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/kivimaging-config.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/kivimaging-config-version.cmake
        DESTINATION ${KIV_CMAKE_PACKAGE_DIR})

# pkg-config: the prefix is found from the .pc file's own folder.
file(RELATIVE_PATH KIV_PC_TO_PREFIX /prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig /prefix)
string(REGEX REPLACE "/$" "" KIV_PC_TO_PREFIX "${KIV_PC_TO_PREFIX}")
configure_file(${CMAKE_CURRENT_LIST_DIR}/kivimaging.pc.in ${CMAKE_CURRENT_BINARY_DIR}/kivimaging.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/kivimaging.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
