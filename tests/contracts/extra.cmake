# Transport libraries the loading tests open by path: a complete one, one
# lacking a required function and one lacking the optional yield hook.
foreach(variant IN ITEMS full no_chk4meter no_yield_hook)
  add_library(recording_transport_${variant} SHARED ${dir}/recording_transport.c)
  target_include_directories(recording_transport_${variant} PRIVATE ${PROJECT_SOURCE_DIR}/include)
  target_compile_definitions(recording_transport_${variant} PRIVATE VANTRIX32_BUILDING)
  add_dependencies(${target} recording_transport_${variant})
endforeach()
target_compile_definitions(recording_transport_no_chk4meter PRIVATE RECORDING_TRANSPORT_WITHOUT_CHK4METER)
target_compile_definitions(recording_transport_no_yield_hook PRIVATE RECORDING_TRANSPORT_WITHOUT_YIELD_HOOK)
target_compile_definitions(${target} PRIVATE
  RECORDING_TRANSPORT_FULL="$<TARGET_FILE:recording_transport_full>"
  RECORDING_TRANSPORT_NO_CHK4METER="$<TARGET_FILE:recording_transport_no_chk4meter>"
  RECORDING_TRANSPORT_NO_YIELD_HOOK="$<TARGET_FILE:recording_transport_no_yield_hook>")
