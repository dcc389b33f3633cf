# Helpers shared by the folder CMakeLists.

# Warnings are errors in our own code; platform headers come in as system headers.
function(kiv_warnings target)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Werror)
  # GCC's flow analysis gives false maybe-uninitialized reports inside the
  # standard library once sanitizers instrument the code; the plain builds
  # still check for it.
  if(KIV_SANITIZE AND CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    target_compile_options(${target} PRIVATE -Wno-maybe-uninitialized)
  endif()
endfunction()

# One static library per layer, made of every source in the given folders
# (globbed so that a new file needs no CMake edit).
function(kiv_layer_library name)
  cmake_parse_arguments(ARG "" "" "DIRS;LIBS;INCLUDES" ${ARGN})
  set(srcs)
  foreach(dir ${ARG_DIRS})
    file(GLOB found CONFIGURE_DEPENDS ${dir}/*.c ${dir}/*.cpp)
    list(APPEND srcs ${found})
  endforeach()
  if(NOT srcs)
    add_library(${name} INTERFACE)
    target_include_directories(${name} INTERFACE ${ARG_INCLUDES})
    target_link_libraries(${name} INTERFACE ${ARG_LIBS})
    return()
  endif()
  add_library(${name} STATIC ${srcs})
  target_include_directories(${name} PUBLIC ${ARG_INCLUDES})
  target_link_libraries(${name} PUBLIC ${ARG_LIBS})
  kiv_warnings(${name})
endfunction()
