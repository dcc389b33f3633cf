# Platform and third-party dependencies, all from Debian packages (scripts/setup-deps).
# A device build finds its own (Android's platform libraries, not Debian's).
if(ANDROID)
  include(KivDepsAndroid)
  return()
endif()

find_package(PkgConfig REQUIRED)
find_package(Threads REQUIRED)

# Debian's packaged AOSP libutils/liblog: headers under /usr/include/android,
# libraries under /usr/lib/<triplet>/android.
find_path(KIV_ANDROID_INCLUDE utils/RefBase.h PATHS /usr/include/android NO_DEFAULT_PATH REQUIRED)
find_library(KIV_ANDROID_UTILS utils PATHS /usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/android NO_DEFAULT_PATH REQUIRED)
find_library(KIV_ANDROID_LOG log PATHS /usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/android NO_DEFAULT_PATH REQUIRED)
get_filename_component(KIV_ANDROID_LIBDIR ${KIV_ANDROID_UTILS} DIRECTORY)

add_library(kiv_android INTERFACE)
target_include_directories(kiv_android SYSTEM INTERFACE ${KIV_ANDROID_INCLUDE})
target_link_libraries(kiv_android INTERFACE ${KIV_ANDROID_UTILS} ${KIV_ANDROID_LOG} Threads::Threads ${CMAKE_DL_LIBS})
target_link_options(kiv_android INTERFACE "LINKER:-rpath,${KIV_ANDROID_LIBDIR}")
# A client of the public headers needs libutils too (KivInstall).
set(KIV_UTILS_INCLUDE ${KIV_ANDROID_INCLUDE})
set(KIV_UTILS_LIBRARY ${KIV_ANDROID_UTILS})

pkg_check_modules(KIV_EGL REQUIRED IMPORTED_TARGET egl)
pkg_check_modules(KIV_GLES REQUIRED IMPORTED_TARGET glesv2)
pkg_check_modules(KIV_TURBOJPEG REQUIRED IMPORTED_TARGET libturbojpeg)
pkg_check_modules(KIV_JPEG REQUIRED IMPORTED_TARGET libjpeg)
pkg_check_modules(KIV_PNG REQUIRED IMPORTED_TARGET libpng)
pkg_check_modules(KIV_EXIF REQUIRED IMPORTED_TARGET libexif)
# The host's virtual camera reads video files (never linked into a device build).
pkg_check_modules(KIV_AV REQUIRED IMPORTED_TARGET libavformat libavcodec libavutil libswscale)

if(KIV_BUILD_TESTS)
  find_package(GTest REQUIRED)
endif()
if(KIV_BUILD_BENCH)
  find_package(benchmark REQUIRED)
  pkg_check_modules(KIV_YUV IMPORTED_TARGET libyuv)
endif()
find_package(JNI QUIET)
