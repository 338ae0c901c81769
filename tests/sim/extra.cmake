# The shared-library test opens the built transport library by path.
add_dependencies(${target} vantrix32)

# The transport library stands alone: a C program linking only the loader uses
# it, and it needs no symbol of the component (checked with dlopen and nm, on Linux).
if(NOT WIN32)
add_executable(sim_standalone_load ${dir}/standalone_load.c)
target_include_directories(sim_standalone_load PRIVATE ${PROJECT_SOURCE_DIR}/include)
target_link_libraries(sim_standalone_load PRIVATE ${CMAKE_DL_LIBS})
add_dependencies(sim_standalone_load vantrix32)
add_test(NAME SimulatorStandsAlone.UsedByAProgramWithoutTheComponent
         COMMAND sim_standalone_load $<TARGET_FILE:vantrix32>)
add_test(NAME SimulatorStandsAlone.NeedsNoSymbolOfTheComponent
         COMMAND ${CMAKE_COMMAND} -DNM=${CMAKE_NM} -DLIBRARY=$<TARGET_FILE:vantrix32>
                 -P ${dir}/no_component_symbols.cmake)
endif()
