# Installs the build into a temporary prefix, moves the prefix (nothing
# installed may lean on the build tree, the source tree or where it was first
# installed), then builds two clients against the installed tree alone, one
# through find_package(kivimaging CONFIG) and one through pkg-config, and runs
# each: the example Solarize plug-in, built from the installed SDK header, over
# a buffer through the C API, pixels checked; and a live render manager drawing
# an effect into the host's preview window, shown frame and screenshot checked.

# run(<what> [ENV var=value...] COMMAND ...): the output lands in run_output.
function(run what)
  cmake_parse_arguments(arg "" "" "ENV;COMMAND" ${ARGN})
  execute_process(COMMAND ${CMAKE_COMMAND} -E env ${arg_ENV} ${arg_COMMAND}
    RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE out)
  if(NOT rc EQUAL 0)
    message(FATAL_ERROR "${what} failed (${rc}):\n${arg_COMMAND}\n${out}")
  endif()
  set(run_output "${out}" PARENT_SCOPE)
endfunction()

# A plug-in goes where the library looks for downloadable filters.
function(install_plugin library sysroot)
  file(MAKE_DIRECTORY ${sysroot}/data/DownFilters/Lib)
  file(COPY_FILE ${library} ${sysroot}/data/DownFilters/Lib/com.example.solarize.libsolarize.so)
endfunction()
set(effect "com.example.solarize,libsolarize.so")

file(REMOVE_RECURSE ${WORK_DIR})
set(stage ${WORK_DIR}/stage)
set(prefix ${WORK_DIR}/prefix)
run("install" COMMAND ${CMAKE_COMMAND} --install ${BUILD_DIR} --prefix ${stage})
file(RENAME ${stage} ${prefix})

# The library, headers and program are used below. A second copy of the image
# core as an archive would give a client two option registries.
file(GLOB archives ${prefix}/${LIBDIR}/*.a)
if(archives OR NOT EXISTS ${prefix}/${DOCDIR}/README.md)
  message(FATAL_ERROR "archives installed (${archives}) or the README not")
endif()

run("readelf" COMMAND readelf -d ${prefix}/${LIBDIR}/libkivimaging.so)
if(NOT run_output MATCHES "Library soname: \\[libkivimaging\\.so\\.${SOVERSION}\\]")
  message(FATAL_ERROR "libkivimaging.so does not carry the soname libkivimaging.so.${SOVERSION}:\n${run_output}")
endif()
file(GLOB_RECURSE texts ${prefix}/${LIBDIR}/cmake/* ${prefix}/${LIBDIR}/pkgconfig/*)
foreach(file ${texts} ${prefix}/${LIBDIR}/libkivimaging.so ${prefix}/${BINDIR}/kivimaging)
  if(file MATCHES "\\.(cmake|pc)$")
    file(READ ${file} text)
  else()
    run("readelf" COMMAND readelf -d ${file})
    string(REGEX MATCHALL "R(UN)?PATH[^\n]*" text "${run_output}")
  endif()
  foreach(tree ${BUILD_DIR} ${SOURCE_DIR} ${stage})
    string(FIND "${text}" "${tree}" at)
    if(at GREATER -1)
      message(FATAL_ERROR "${file} refers to ${tree}")
    endif()
  endforeach()
endforeach()

# The installed program finds its libraries and the effects.
run("kivimaging effects" COMMAND ${prefix}/${BINDIR}/kivimaging effects)
if(NOT run_output MATCHES "NoEffect")
  message(FATAL_ERROR "kivimaging effects lists no NoEffect:\n${run_output}")
endif()

set(compilers -DCMAKE_C_COMPILER=${C_COMPILER} -DCMAKE_CXX_COMPILER=${CXX_COMPILER})
set(flags ${SANITIZE})

# find_package client.
set(src ${WORK_DIR}/cmake-client)
set(bin ${WORK_DIR}/cmake-client-build)
file(COPY ${CLIENT_DIR}/consumer.c ${CLIENT_DIR}/live_client.cpp ${PLUGIN} DESTINATION ${src})
file(COPY_FILE ${CLIENT_DIR}/project.cmake ${src}/CMakeLists.txt)
run("configure the find_package client" COMMAND ${CMAKE_COMMAND} -G Ninja -S ${src} -B ${bin}
  ${compilers} -DCMAKE_BUILD_TYPE=Release -DCMAKE_PREFIX_PATH=${prefix} -DKIV_EXPECTED_PREFIX=${prefix}
  "-DCMAKE_C_FLAGS=${flags}" "-DCMAKE_CXX_FLAGS=${flags}")
run("build the find_package client" COMMAND ${CMAKE_COMMAND} --build ${bin} -j 2)
install_plugin(${bin}/libsolarize.so ${bin}/sysroot)
run("run the find_package client" ENV KIV_SYSROOT=${bin}/sysroot COMMAND ${bin}/client ${effect})
message(STATUS "find_package: ${run_output}")
run("run the find_package live client" COMMAND ${bin}/live_client)
message(STATUS "find_package: ${run_output}")

# pkg-config client, pointed at the installed tree only.
set(bin ${WORK_DIR}/pkgconfig-client)
file(MAKE_DIRECTORY ${bin})
set(pc_env PKG_CONFIG_PATH= PKG_CONFIG_LIBDIR=${prefix}/${LIBDIR}/pkgconfig)
run("pkg-config --cflags" ENV ${pc_env} COMMAND pkg-config --cflags kivimaging)
separate_arguments(cflags UNIX_COMMAND "${run_output}")
run("pkg-config --cflags --libs" ENV ${pc_env} COMMAND pkg-config --cflags --libs kivimaging)
separate_arguments(cflags_libs UNIX_COMMAND "${run_output}")
# Every public header in one C++ unit: the Cflags reach all of them.
file(GLOB_RECURSE headers RELATIVE ${prefix}/include ${prefix}/include/kivimaging/*.h)
set(unit "")
foreach(header ${headers})
  string(APPEND unit "#include <${header}>\n")
endforeach()
file(WRITE ${bin}/all_headers.cpp "${unit}")
# With clang too (scripts/setup-deps installs it): it refuses what g++ lets
# pass, such as a class named as a struct.
find_program(clangxx clang++ REQUIRED)
foreach(compiler ${CXX_COMPILER} ${clangxx})
  run("compile every header with pkg-config's flags" COMMAND ${compiler} -fsyntax-only -Wall -Werror
    ${bin}/all_headers.cpp ${cflags})
endforeach()
run("build the pkg-config plug-in" COMMAND ${CXX_COMPILER} ${flags} -shared -fPIC -fvisibility=hidden
  ${PLUGIN} ${cflags} -o ${bin}/libsolarize.so)
run("build the pkg-config client" COMMAND ${C_COMPILER} ${flags} -Wall -Wextra -Werror
  ${CLIENT_DIR}/consumer.c ${cflags_libs} -o ${bin}/client)
run("build the pkg-config live client" COMMAND ${CXX_COMPILER} ${flags} -Wall -Wextra -Werror
  ${CLIENT_DIR}/live_client.cpp ${cflags_libs} -o ${bin}/live_client)
install_plugin(${bin}/libsolarize.so ${bin}/sysroot)
run("run the pkg-config client" ENV KIV_SYSROOT=${bin}/sysroot LD_LIBRARY_PATH=${prefix}/${LIBDIR}
  COMMAND ${bin}/client ${effect})
message(STATUS "pkg-config: ${run_output}")
run("run the pkg-config live client" ENV LD_LIBRARY_PATH=${prefix}/${LIBDIR} COMMAND ${bin}/live_client)
message(STATUS "pkg-config: ${run_output}")
