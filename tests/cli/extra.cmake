# The command is tested as a user runs it: the built binary, started as a process.
add_dependencies(${target} varnel_cli)
# Its CSV and file-writing units are also tested directly.
target_sources(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli/csv.cpp ${PROJECT_SOURCE_DIR}/cli/output.cpp)
target_include_directories(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli)
target_compile_definitions(${target} PRIVATE
  VARNEL_CLI_PATH="$<TARGET_FILE:varnel_cli>"
  VARNEL_LIBRARY_PATH="$<TARGET_FILE:varnel>")
