# The C interface loads the shipped simulated transport beside libvarnel.
add_dependencies(${target} vantrix32)

# The header is C11: a C program uses it linking libvarnel alone.
add_executable(capi_c_client ${dir}/c_client.c)
set_target_properties(capi_c_client PROPERTIES C_STANDARD 11 C_STANDARD_REQUIRED ON C_EXTENSIONS OFF)
target_compile_options(capi_c_client PRIVATE -Wall -Wextra -pedantic $<$<BOOL:${VARNEL_WERROR}>:-Werror>)
target_link_libraries(capi_c_client PRIVATE varnel)
add_test(NAME CInterface.UsedFromC COMMAND capi_c_client /nonexistent/varnel-test/libnotransport.so)

# The Python package over the built library, with Debian's python3 and pytest
# (a python3 earlier on PATH may lack pytest, so the first that has it is used).
# Not in sanitized builds: an uninstrumented interpreter cannot load an
# instrumented library; the C interface's own tests cover that boundary there.
if(NOT VARNEL_SANITIZE AND NOT WIN32)
set(VARNEL_PYTHON "" CACHE FILEPATH "Python 3 with pytest, for the Python package's tests")
if(NOT VARNEL_PYTHON)
  find_program(path_python3 python3)
  foreach(candidate IN ITEMS ${path_python3} /usr/bin/python3)
    execute_process(COMMAND ${candidate} -c "import pytest" RESULT_VARIABLE no_pytest OUTPUT_QUIET ERROR_QUIET)
    if(no_pytest EQUAL 0)
      set(VARNEL_PYTHON ${candidate} CACHE FILEPATH "Python 3 with pytest, for the Python package's tests" FORCE)
      break()
    endif()
  endforeach()
endif()
if(NOT VARNEL_PYTHON)
  message(WARNING "No python3 with pytest (scripts/deps.sh installs it): the Python package's test will fail")
  set(VARNEL_PYTHON python3)
endif()
add_test(NAME python_package
         COMMAND ${VARNEL_PYTHON} -m pytest -q -p no:cacheprovider ${PROJECT_SOURCE_DIR}/python/tests)
set_tests_properties(python_package PROPERTIES
  ENVIRONMENT "VARNEL_LIBRARY=$<TARGET_FILE:varnel>;PYTHONPATH=${PROJECT_SOURCE_DIR}/python;PYTHONDONTWRITEBYTECODE=1"
  TIMEOUT 120)
endif()
