# What `cmake --install` puts into a prefix: libkivimaging.so, the headers a
# client compiles against, the kivimaging program, a CMake package
# (find_package(kivimaging CONFIG) -> kivimaging::kivimaging), a pkg-config
# file and the README. On a host, also the host's stand-ins that a live
# pipeline needs (a preview window, a virtual camera, the platform's window
# header), which a device has from its platform. Nothing installed refers back to the build or source
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
  include/kivimaging/OpenGLManager.h     # live render manager a camera client drives
  include/kivimaging/OnFrameListener.h   # what a client implements to receive pictures
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

# OpenGLManager.h stands on libutils (RefBase, sp, Mutex): a client compiles
# against its headers and links it (Debian's on a host, the device's own in a
# device build; KivDeps says which). The package's config file adds them to
# the imported target, the pkg-config file to its flags.
get_filename_component(kiv_utils_dir ${KIV_UTILS_LIBRARY} DIRECTORY)
set(KIV_PC_PLATFORM_CFLAGS " -isystem ${KIV_UTILS_INCLUDE}")
set(KIV_PC_PLATFORM_LIBS " -L${kiv_utils_dir} -lutils")
# Debian keeps libutils out of the loader's path; a device has it in /system.
if(NOT ANDROID)
  string(APPEND KIV_PC_PLATFORM_LIBS " -Wl,-rpath,${kiv_utils_dir}")
endif()

# On a host the library itself implements the platform's window, so it brings
# that header (system/window.h, searched before libutils' folder) and the
# host's stand-ins for a display and a camera. Installed nowhere else.
if(NOT ANDROID)
  set(kiv_platform_dir ${CMAKE_INSTALL_INCLUDEDIR}/kivimaging/platform)
  target_include_directories(kivimaging BEFORE INTERFACE $<INSTALL_INTERFACE:${kiv_platform_dir}>)
  string(PREPEND KIV_PC_PLATFORM_CFLAGS " -I\${includedir}/kivimaging/platform")
  install(FILES ${PROJECT_SOURCE_DIR}/host/include/system/window.h DESTINATION ${kiv_platform_dir}/system)
  install(FILES ${PROJECT_SOURCE_DIR}/host/include/nativebase/nativebase.h
          DESTINATION ${kiv_platform_dir}/nativebase)
  install(FILES ${PROJECT_SOURCE_DIR}/host/include/kivhost/PreviewWindow.h
                ${PROJECT_SOURCE_DIR}/host/include/kivhost/VirtualCamera.h
          DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kivimaging/kivhost)
endif()

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
