# A client project of the installed library, found through its CMake package.
# Copied in as CMakeLists.txt by consume.cmake.
cmake_minimum_required(VERSION 3.20)
project(kivimaging_client C CXX)

find_package(kivimaging 0.1 CONFIG REQUIRED)
cmake_path(IS_PREFIX KIV_EXPECTED_PREFIX "${kivimaging_DIR}" NORMALIZE found_here)
if(NOT found_here)
  message(FATAL_ERROR "kivimaging came from ${kivimaging_DIR}, not from ${KIV_EXPECTED_PREFIX}")
endif()

# The C client compiled as C++ here; the pkg-config client compiles it as C.
add_executable(client consumer.c)
set_source_files_properties(consumer.c PROPERTIES LANGUAGE CXX)
target_link_libraries(client PRIVATE kivimaging::kivimaging)

# The live render manager, with the host's preview window and camera: the
# package must carry libutils' headers and library for it.
add_executable(live_client live_client.cpp)
target_link_libraries(live_client PRIVATE kivimaging::kivimaging)
target_compile_options(live_client PRIVATE -Wall -Wextra -Werror)

# A plug-in needs the SDK header, not the library.
add_library(solarize SHARED solarize.cpp)
set_target_properties(solarize PROPERTIES CXX_VISIBILITY_PRESET hidden)
target_include_directories(solarize PRIVATE
  $<TARGET_PROPERTY:kivimaging::kivimaging,INTERFACE_INCLUDE_DIRECTORIES>)

# Every installed header alone in a translation unit, with the package's flags
# only: as C++, and as C too when it is meant for C (it says so with
# __cplusplus guards, or declares nothing C++).
get_target_property(dirs kivimaging::kivimaging INTERFACE_INCLUDE_DIRECTORIES)
foreach(dir ${dirs})
  if(EXISTS ${dir}/kivimaging/KivImaging.h)
    set(include_dir ${dir})
  endif()
endforeach()
file(GLOB_RECURSE headers RELATIVE ${include_dir} ${include_dir}/kivimaging/*.h)
set(units)
foreach(header ${headers})
  file(READ ${include_dir}/${header} text)
  set(languages cpp)
  if(text MATCHES "__cplusplus" OR NOT text MATCHES "class |extern \"C\"")
    list(APPEND languages c)
  endif()
  string(MAKE_C_IDENTIFIER ${header} name)
  foreach(language ${languages})
    file(CONFIGURE OUTPUT alone/${name}.${language} CONTENT "#include <${header}>\n")
    list(APPEND units ${CMAKE_BINARY_DIR}/alone/${name}.${language})
  endforeach()
endforeach()
list(LENGTH headers count)
message(STATUS "Public headers compiled alone: ${count}")
add_library(headers_alone OBJECT ${units})
target_link_libraries(headers_alone PRIVATE kivimaging::kivimaging)
target_compile_options(headers_alone PRIVATE -Wall -Wextra -Werror -pedantic)
