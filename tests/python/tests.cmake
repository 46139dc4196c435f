# Tests of the Python binding, run by Python's unittest; included from tests/CMakeLists.txt.
# The synthetic captures come from `viraduve synth`.
find_package(Python3 COMPONENTS Interpreter)
if(TARGET viraduve_cli AND Python3_Interpreter_FOUND)
  add_test(NAME python_binding COMMAND ${Python3_EXECUTABLE} -m unittest discover -v
           -s ${PROJECT_SOURCE_DIR}/tests/python -p "test_*.py")
  set_tests_properties(python_binding PROPERTIES TIMEOUT 600
    ENVIRONMENT "VIRADUVE_CLI=$<TARGET_FILE:viraduve_cli>;VIRADUVE_LIBRARY=$<TARGET_FILE:viraduve>;PYTHONPATH=${PROJECT_SOURCE_DIR}/python")
endif()
