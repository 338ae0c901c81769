# The shared-library test opens the built transport library by path.
add_dependencies(${target} vantrix32)

# The transport library stands alone: it needs no symbol of the component.
if(NOT WIN32)
add_test(NAME SimulatorStandsAlone.NeedsNoSymbolOfTheComponent
         COMMAND ${CMAKE_COMMAND} -DNM=${CMAKE_NM} -DLIBRARY=$<TARGET_FILE:vantrix32>
                 -P ${dir}/no_component_symbols.cmake)
endif()
