# Fails when the transport library at LIBRARY needs any symbol of the component.
execute_process(COMMAND ${NM} -D --undefined-only --demangle ${LIBRARY}
                OUTPUT_VARIABLE undefined RESULT_VARIABLE result)
if(NOT result EQUAL 0)
  message(FATAL_ERROR "${NM} failed on ${LIBRARY}")
endif()
string(REGEX MATCHALL "[^\n]*varnel[^\n]*" needed "${undefined}")
if(needed)
  message(FATAL_ERROR "${LIBRARY} needs the component:\n${needed}")
endif()
