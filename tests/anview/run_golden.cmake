# Runs anview once and compares what it wrote with a golden file.
#   -DANVIEW=path  -DARGS=a;b;c  -DGOLDEN=file  -DOUTPUT=stdout|stderr|html
#   -DHTML=file (OUTPUT html: where --html writes)  -DEXIT=expected exit status
#   -DWORK_DIR=where to leave the actual output of a failed comparison
# With the environment variable ANVIEW_UPDATE_GOLDEN set, the golden file is written
# instead (review the difference before committing it).
cmake_minimum_required(VERSION 3.25)

execute_process(COMMAND ${ANVIEW} ${ARGS}
                RESULT_VARIABLE status OUTPUT_VARIABLE out ERROR_VARIABLE err)
if(NOT status STREQUAL "${EXIT}")
  message(FATAL_ERROR "anview ${ARGS} exited with ${status}, expected ${EXIT}\n"
                      "stdout:\n${out}\nstderr:\n${err}")
endif()

if(OUTPUT STREQUAL "stderr")
  set(actual "${err}")
  set(quiet "${out}")
  set(quiet_name "standard output")
else()
  set(quiet "${err}")
  set(quiet_name "standard error")
  if(OUTPUT STREQUAL "html")
    file(READ ${HTML} actual)
    # Nothing but the page goes to the file; standard output stays empty.
    string(APPEND quiet "${out}")
    set(quiet_name "standard output and error")
  else()
    set(actual "${out}")
  endif()
endif()
if(NOT quiet STREQUAL "")
  message(FATAL_ERROR "anview ${ARGS} wrote to ${quiet_name}:\n${quiet}")
endif()

if(DEFINED ENV{ANVIEW_UPDATE_GOLDEN})
  file(WRITE ${GOLDEN} "${actual}")
  message(STATUS "wrote ${GOLDEN}")
  return()
endif()
if(NOT EXISTS ${GOLDEN})
  message(FATAL_ERROR "no golden file ${GOLDEN}; actual output:\n${actual}")
endif()
file(READ ${GOLDEN} expected)
if(NOT actual STREQUAL expected)
  get_filename_component(name ${GOLDEN} NAME)
  set(saved ${WORK_DIR}/${name}.actual)
  file(WRITE ${saved} "${actual}")
  message(FATAL_ERROR "output differs from ${GOLDEN} (actual output in ${saved}):\n${actual}")
endif()
