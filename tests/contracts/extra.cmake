# Transport libraries the loading tests open by path: a complete one, one
# lacking a required function and one without the optional hooks.
foreach(variant IN ITEMS full no_chk4meter no_hooks)
  set(recording_lib recording_transport_${variant})
  string(TOUPPER ${variant} recording_variant)
  add_library(${recording_lib} SHARED ${dir}/recording_transport.c)
  varnel_target_defaults(${recording_lib})
  target_include_directories(${recording_lib} PRIVATE ${PROJECT_SOURCE_DIR}/include)
  target_compile_definitions(${recording_lib} PRIVATE VANTRIX32_BUILDING RECORDING_TRANSPORT_${recording_variant}_VARIANT)
  if(WIN32)
    target_link_options(${recording_lib} PRIVATE -Wl,--kill-at)  # undecorated, as vantrix32.dll
  endif()
  target_compile_definitions(${target} PRIVATE RECORDING_TRANSPORT_${recording_variant}="$<TARGET_FILE:${recording_lib}>")
  add_dependencies(${target} ${recording_lib})
endforeach()
