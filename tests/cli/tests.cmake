# Tests of the `viraduve` command and of the installed tree; included from tests/CMakeLists.txt.
find_package(Python3 COMPONENTS Interpreter)
if(TARGET viraduve_cli AND Python3_Interpreter_FOUND)
  add_test(NAME cli COMMAND ${Python3_EXECUTABLE} -m unittest discover -v
           -s ${PROJECT_SOURCE_DIR}/tests/cli -p "test_*.py")
  set_tests_properties(cli PROPERTIES TIMEOUT 600
    ENVIRONMENT "VIRADUVE_CLI=$<TARGET_FILE:viraduve_cli>")
endif()

# Installs the build into a scratch prefix and builds a small C host against it, once with
# find_package and once with pkg-config.
if(TARGET viraduve_cli)
  add_test(NAME install_consumer COMMAND ${CMAKE_COMMAND}
    -DBUILD_DIR=${CMAKE_BINARY_DIR}
    -DCONSUMER_DIR=${PROJECT_SOURCE_DIR}/tests/cli/consumer
    -DWORK_DIR=${CMAKE_BINARY_DIR}/install-consumer
    -DC_COMPILER=${CMAKE_C_COMPILER}
    -DGENERATOR=${CMAKE_GENERATOR}
    -P ${PROJECT_SOURCE_DIR}/tests/cli/install_consumer.cmake)
  set_tests_properties(install_consumer PROPERTIES TIMEOUT 600)
endif()

# The demo, both forms, end to end.
if(TARGET viraduve_cli)
  foreach(form synthetic real)
    add_test(NAME demo_${form} COMMAND ${CMAKE_COMMAND}
      -DCLI=$<TARGET_FILE:viraduve_cli>
      -DFORM=${form}
      -DWORK_DIR=${CMAKE_BINARY_DIR}/demo-${form}
      -P ${PROJECT_SOURCE_DIR}/tests/cli/demo_check.cmake)
    set_tests_properties(demo_${form} PROPERTIES TIMEOUT 300)
  endforeach()
endif()
