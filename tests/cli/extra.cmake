# The command is tested as a user runs it: the built binary, started as a process.
add_dependencies(${target} varnel_cli)
# Its export, report and file-writing units are also tested directly.
target_sources(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli/export.cpp ${PROJECT_SOURCE_DIR}/cli/report.cpp
  ${PROJECT_SOURCE_DIR}/cli/output.cpp ${PROJECT_SOURCE_DIR}/cli/interrupt.cpp)
find_package(nlohmann_json 3 CONFIG REQUIRED)
target_link_libraries(${target} PRIVATE nlohmann_json::nlohmann_json)
target_include_directories(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli)
target_compile_definitions(${target} PRIVATE
  VARNEL_CLI_PATH="$<TARGET_FILE:varnel_cli>"
  VARNEL_LIBRARY_PATH="$<TARGET_FILE:varnel>")
