# Installs BUILD_DIR into WORK_DIR/prefix, then builds and runs the C host of CONSUMER_DIR
# against it: once through find_package(viraduve), once through pkg-config.
foreach(var BUILD_DIR CONSUMER_DIR WORK_DIR C_COMPILER)
  if(NOT ${var})
    message(FATAL_ERROR "${var} is not set")
  endif()
endforeach()

function(run)
  execute_process(COMMAND ${ARGN} RESULT_VARIABLE status OUTPUT_VARIABLE out ERROR_VARIABLE err)
  if(NOT status EQUAL 0)
    message(FATAL_ERROR "failed (${status}): ${ARGN}\n${out}\n${err}")
  endif()
  set(run_output "${out}" PARENT_SCOPE)
endfunction()

set(prefix ${WORK_DIR}/prefix)
file(REMOVE_RECURSE ${WORK_DIR})
run(${CMAKE_COMMAND} --install ${BUILD_DIR} --prefix ${prefix})

foreach(installed include/viraduve/viraduve.h bin/viraduve)
  if(NOT EXISTS ${prefix}/${installed})
    message(FATAL_ERROR "not installed: ${installed}")
  endif()
endforeach()
# The installed command finds the installed library.
run(${prefix}/bin/viraduve --help)

# find_package
set(generator_args)
if(GENERATOR)
  set(generator_args -G ${GENERATOR})
endif()
run(${CMAKE_COMMAND} -S ${CONSUMER_DIR} -B ${WORK_DIR}/cmake-build ${generator_args}
    -DCMAKE_PREFIX_PATH=${prefix} -DCMAKE_C_COMPILER=${C_COMPILER})
run(${CMAKE_COMMAND} --build ${WORK_DIR}/cmake-build)
run(${WORK_DIR}/cmake-build/consumer)
if(NOT run_output MATCHES "consumer ok")
  message(FATAL_ERROR "find_package consumer: ${run_output}")
endif()

# pkg-config
find_program(PKG_CONFIG pkg-config REQUIRED)
file(GLOB_RECURSE pc_files ${prefix}/*/viraduve.pc)
list(GET pc_files 0 pc_file)
get_filename_component(pc_dir ${pc_file} DIRECTORY)
set(ENV{PKG_CONFIG_PATH} ${pc_dir})
run(${PKG_CONFIG} --cflags --libs viraduve)
string(STRIP "${run_output}" flags)
separate_arguments(flags UNIX_COMMAND "${flags}")
run(${C_COMPILER} ${CONSUMER_DIR}/consumer.c ${flags} -o ${WORK_DIR}/consumer-pc)
execute_process(COMMAND ${PKG_CONFIG} --variable=libdir viraduve OUTPUT_VARIABLE libdir
                OUTPUT_STRIP_TRAILING_WHITESPACE)
set(ENV{LD_LIBRARY_PATH} ${libdir})
run(${WORK_DIR}/consumer-pc)
if(NOT run_output MATCHES "consumer ok")
  message(FATAL_ERROR "pkg-config consumer: ${run_output}")
endif()
message(STATUS "installed tree works with find_package and pkg-config")
