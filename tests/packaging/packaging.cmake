# The installed package as a client uses it. Sanitized and fuzzing builds are
# left out: their libraries need the sanitizer runtime in every program.
if(NOT VARNEL_SANITIZE AND NOT VARNEL_BUILD_FUZZERS)
  foreach(part layout cpp c python)
    add_test(NAME package_${part}
      COMMAND sh ${CMAKE_CURRENT_LIST_DIR}/check_package.sh ${part}
              ${PROJECT_BINARY_DIR} ${PROJECT_SOURCE_DIR} ${PROJECT_VERSION})
    # One install at a time from the same build tree (it writes its manifest there).
    set_tests_properties(package_${part} PROPERTIES SKIP_RETURN_CODE 77 RESOURCE_LOCK varnel_install
      TIMEOUT 300 LABELS package)
  endforeach()
endif()
