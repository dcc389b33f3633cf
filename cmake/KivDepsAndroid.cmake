# Dependencies of a device build (an Android NDK toolchain file sets ANDROID).
# They keep the names the host build gives them, so that the layer libraries
# link the same way on both sides.
#   - The NDK brings EGL, GLESv2, liblog, libjnigraphics, libnativewindow and jni.h.
#   - The platform libraries the library is written against (libutils,
#     libcutils, libui, libgui) are not part of the NDK: KIV_ANDROID_PLATFORM_DIR
#     names a folder with their headers (include/) and the device's libraries
#     (lib/), taken from an AOSP build of the target device.
#   - libjpeg-turbo, libpng and libexif built for the ABI are found through
#     CMAKE_FIND_ROOT_PATH or CMAKE_PREFIX_PATH.
set(KIV_ANDROID_PLATFORM_DIR "" CACHE PATH
  "AOSP headers (include/) and device libraries (lib/) of libutils, libcutils, libui and libgui")
find_package(Threads REQUIRED)

# PkgConfig::KIV_<name>: the header that proves the package is there, then its
# libraries; each looked up in KIV_ANDROID_PLATFORM_DIR first (outside the
# sysroot, so not re-rooted), then as the toolchain file says.
function(kiv_device_dependency name header)
  set(dir ${KIV_ANDROID_PLATFORM_DIR})
  find_path(KIV_${name}_INCLUDE ${header} PATHS ${dir}/include NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)
  find_path(KIV_${name}_INCLUDE ${header} REQUIRED)
  set(libs)
  foreach(lib ${ARGN})
    find_library(KIV_${name}_${lib} ${lib} PATHS ${dir}/lib NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)
    find_library(KIV_${name}_${lib} ${lib} REQUIRED)
    list(APPEND libs ${KIV_${name}_${lib}})
  endforeach()
  add_library(PkgConfig::KIV_${name} INTERFACE IMPORTED GLOBAL)
  target_include_directories(PkgConfig::KIV_${name} SYSTEM INTERFACE ${KIV_${name}_INCLUDE})
  target_link_libraries(PkgConfig::KIV_${name} INTERFACE ${libs})
endfunction()

kiv_device_dependency(PLATFORM utils/RefBase.h utils cutils ui gui log nativewindow jnigraphics)
# A client of the public headers needs libutils and system/window.h too
# (KivInstall).
set(KIV_UTILS_INCLUDE ${KIV_PLATFORM_INCLUDE})
set(KIV_UTILS_LIBRARY ${KIV_PLATFORM_utils})
kiv_device_dependency(EGL EGL/egl.h EGL)
kiv_device_dependency(GLES GLES2/gl2.h GLESv2)
kiv_device_dependency(TURBOJPEG turbojpeg.h turbojpeg)
kiv_device_dependency(JPEG jpeglib.h jpeg)
kiv_device_dependency(PNG png.h png)
kiv_device_dependency(EXIF libexif/exif-data.h exif)

add_library(kiv_android INTERFACE)
target_link_libraries(kiv_android INTERFACE PkgConfig::KIV_PLATFORM Threads::Threads ${CMAKE_DL_LIBS})
