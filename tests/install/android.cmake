# A device configuration without an NDK: CMake's own Android platform over a
# stand-in standalone toolchain (the host compiler behind the NDK's tool names)
# and a sysroot of empty NDK, platform and third-party files. Only the
# configuration is made, then the generated graph is checked: host/, the tools
# and the tests are not built, nothing of the host (Debian's AOSP packages, the
# JDK, the host's library folders) reaches any compile or link line,
# libkivimaging links the device's platform libraries, and the package a client
# finds carries the device's libutils and none of the host's stand-ins.
set(toolchain ${WORK_DIR}/toolchain)
set(sysroot ${toolchain}/sysroot/usr)
set(platform ${WORK_DIR}/platform)
set(build ${WORK_DIR}/build)
file(REMOVE_RECURSE ${WORK_DIR})

foreach(tool gcc:${C_COMPILER} g++:${CXX_COMPILER})
  string(REPLACE ":" ";" tool ${tool})
  list(GET tool 0 name)
  list(GET tool 1 compiler)
  file(WRITE ${toolchain}/bin/aarch64-linux-android-${name}
    "#!/bin/sh\n"
    "[ \"$*\" = -dumpversion ] && { echo 12.0; exit 0; }\n"
    "for a; do shift; case \"$a\" in --sysroot=*|--gcc-toolchain=*|-march=*) ;; *) set -- \"$@\" \"$a\";; esac; done\n"
    "exec ${compiler} \"$@\"\n")
  file(CHMOD ${toolchain}/bin/aarch64-linux-android-${name} PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE)
endforeach()
file(WRITE ${sysroot}/include/android/api-level.h "#define __ANDROID_API__ 29\n")
foreach(file include/EGL/egl.h include/GLES2/gl2.h include/jni.h include/turbojpeg.h include/jpeglib.h
             include/png.h include/libexif/exif-data.h lib/liblog.so lib/libnativewindow.so
             lib/libjnigraphics.so lib/libEGL.so lib/libGLESv2.so lib/libturbojpeg.so lib/libjpeg.so
             lib/libpng.so lib/libexif.so)
  file(WRITE ${sysroot}/${file} "")
endforeach()
foreach(file include/utils/RefBase.h lib/libutils.so lib/libcutils.so lib/libui.so lib/libgui.so)
  file(WRITE ${platform}/${file} "")
endforeach()
file(WRITE ${WORK_DIR}/android.toolchain.cmake
  "set(CMAKE_SYSTEM_NAME Android)\n"
  "set(CMAKE_SYSTEM_VERSION 29)\n"
  "set(CMAKE_ANDROID_ARCH_ABI arm64-v8a)\n"
  "set(CMAKE_ANDROID_STANDALONE_TOOLCHAIN ${toolchain})\n")

execute_process(COMMAND ${CMAKE_COMMAND} -G Ninja -S ${SOURCE_DIR} -B ${build}
  -DCMAKE_TOOLCHAIN_FILE=${WORK_DIR}/android.toolchain.cmake -DKIV_ANDROID_PLATFORM_DIR=${platform}
  RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE out)
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "the device configuration failed:\n${out}")
endif()
if(NOT out MATCHES "Targeting API '29' with architecture 'arm64'")
  message(FATAL_ERROR "CMake did not configure for Android:\n${out}")
endif()

file(READ ${build}/build.ninja graph)
foreach(absent kivhost kivplatform kivimaging_cli test_ ${SOURCE_DIR}/host/)
  string(FIND "${graph}" "${absent}" at)
  if(at GREATER -1)
    message(FATAL_ERROR "the device build has ${absent}")
  endif()
endforeach()
# Every absolute path on a compile or link line lies in the sources, the build
# or the stand-in toolchain and platform.
string(REGEX MATCHALL "\n  (FLAGS|INCLUDES|LINK_FLAGS|LINK_LIBRARIES|LINK_PATH) = [^\n]*" lines "${graph}")
string(REGEX MATCHALL "( |-I|-L|,)/[^ \n;]+" paths "${lines}")
foreach(path ${paths})
  string(REGEX REPLACE "^( |-I|-L|,)" "" path "${path}")
  if(NOT path MATCHES "^(${SOURCE_DIR}|${WORK_DIR})/")
    message(FATAL_ERROR "a host path reaches the device build: ${path}")
  endif()
endforeach()
string(REGEX MATCH "\nbuild jni/libkivimaging\\.so[^\n]*\n([^\n]+\n)*" library "${graph}")
foreach(lib -lutils -lcutils -lui -lgui -llog -lnativewindow -ljnigraphics -lEGL -lGLESv2)
  if(NOT library MATCHES " ${lib} ")
    message(FATAL_ERROR "libkivimaging does not link ${lib}:\n${library}")
  endif()
endforeach()

file(READ ${build}/kivimaging-config.cmake config)
file(READ ${build}/kivimaging.pc pc)
file(READ ${build}/cmake_install.cmake installs)
foreach(check "config:\"${platform}/include\"" "config:\"${platform}/lib/libutils.so\""
              "pc:-isystem ${platform}/include" "pc:-L${platform}/lib -lutils\n"
              "!config:/usr/" "!pc:/usr/" "!pc:rpath" "!installs:${SOURCE_DIR}/host/")
  string(REGEX MATCH "^(!?)([a-z]+):(.*)$" check "${check}")
  string(FIND "${${CMAKE_MATCH_2}}" "${CMAKE_MATCH_3}" at)
  if(CMAKE_MATCH_1 AND at GREATER -1)
    message(FATAL_ERROR "the device package's ${CMAKE_MATCH_2} has ${CMAKE_MATCH_3}")
  elseif(NOT CMAKE_MATCH_1 AND at EQUAL -1)
    message(FATAL_ERROR "the device package's ${CMAKE_MATCH_2} lacks ${CMAKE_MATCH_3}")
  endif()
endforeach()
message(STATUS "device configuration: ${build}")
