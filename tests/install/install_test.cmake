# Installs the build tree BUILD_DIR into a fresh prefix under WORK_DIR, then builds and
# runs the consumer in CONSUMER_DIR against it twice: as a CMake project that uses
# find_package(anno CONFIG), and compiled directly with the flags pkg-config gives.
# Run with cmake -P; CXX, CXX_FLAGS, LINK_FLAGS and GENERATOR come from the build.
cmake_minimum_required(VERSION 3.25)

foreach(var BUILD_DIR WORK_DIR CONSUMER_DIR CXX GENERATOR)
  if(NOT DEFINED ${var})
    message(FATAL_ERROR "install_test.cmake needs -D${var}=...")
  endif()
endforeach()

function(run what)
  execute_process(COMMAND ${ARGN} RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE err)
  if(NOT rc EQUAL 0)
    message(FATAL_ERROR "${what} failed (${rc}):\n${out}\n${err}")
  endif()
  set(last_output "${out}" PARENT_SCOPE)
endfunction()

set(prefix ${WORK_DIR}/prefix)
file(REMOVE_RECURSE ${WORK_DIR})
file(MAKE_DIRECTORY ${WORK_DIR})

run("cmake --install" ${CMAKE_COMMAND} --install ${BUILD_DIR} --prefix ${prefix})
foreach(file include/anno/anno.h include/anno/toolkit.h include/anno/winapi_test.h)
  if(NOT EXISTS ${prefix}/${file})
    message(FATAL_ERROR "not installed: ${file}")
  endif()
endforeach()
file(GLOB_RECURSE config ${prefix}/*/annoConfig.cmake)
file(GLOB_RECURSE pc_files ${prefix}/*/anno.pc)
file(GLOB_RECURSE libraries ${prefix}/*/libanno.so ${prefix}/*/libanno_toolkit.so
     ${prefix}/*/libanno_winapi.so)
list(LENGTH libraries library_count)
if(NOT config OR NOT pc_files OR NOT library_count EQUAL 3)
  message(FATAL_ERROR "incomplete install: config '${config}', pkg-config '${pc_files}', "
                      "libraries '${libraries}'")
endif()
get_filename_component(libdir ${pc_files} DIRECTORY)
get_filename_component(libdir ${libdir} DIRECTORY)

# 1. find_package(anno CONFIG)
set(build ${WORK_DIR}/cmake-consumer)
run("configuring the consumer" ${CMAKE_COMMAND} -S ${CONSUMER_DIR} -B ${build} -G ${GENERATOR}
    -DCMAKE_PREFIX_PATH=${prefix} -DCMAKE_CXX_COMPILER=${CXX} "-DCMAKE_CXX_FLAGS=${CXX_FLAGS}"
    "-DCMAKE_EXE_LINKER_FLAGS=${LINK_FLAGS}")
run("building the consumer" ${CMAKE_COMMAND} --build ${build})
run("running the find_package consumer" ${build}/consumer)
message(STATUS "find_package: ${last_output}")

# 2. pkg-config
find_program(PKG_CONFIG pkg-config REQUIRED)
set(ENV{PKG_CONFIG_PATH} ${libdir}/pkgconfig)
run("pkg-config" ${PKG_CONFIG} --cflags --libs anno-toolkit anno-winapi)
string(STRIP "${last_output}" pc_flags)
separate_arguments(pc_flags UNIX_COMMAND "${pc_flags}")
separate_arguments(extra_flags UNIX_COMMAND "${CXX_FLAGS} ${LINK_FLAGS}")
foreach(flag -lanno -lanno_toolkit -lanno_winapi)
  if(NOT flag IN_LIST pc_flags)
    message(FATAL_ERROR "pkg-config gave no ${flag}: ${pc_flags}")
  endif()
endforeach()
set(program ${WORK_DIR}/pkg-config-consumer)
run("compiling the consumer with pkg-config flags" ${CXX} -std=c++20 ${extra_flags}
    ${CONSUMER_DIR}/consumer.cpp -o ${program} ${pc_flags})
set(ENV{LD_LIBRARY_PATH} ${libdir})
run("running the pkg-config consumer" ${program})
message(STATUS "pkg-config: ${last_output}")
