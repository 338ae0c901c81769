# The command is tested as a user runs it: the built binary, started as a process.
add_dependencies(${target} varnel_cli)
# Its export, report and file-writing units are also tested directly.
target_sources(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli/report.cpp ${PROJECT_SOURCE_DIR}/cli/report_figures.cpp
  ${PROJECT_SOURCE_DIR}/cli/output.cpp ${PROJECT_SOURCE_DIR}/cli/interrupt.cpp)
target_link_libraries(${target} PRIVATE nlohmann_json::nlohmann_json)
target_include_directories(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli)
target_compile_definitions(${target} PRIVATE
  VARNEL_CLI_PATH="$<TARGET_FILE:varnel_cli>"
  VARNEL_LIBRARY_PATH="$<TARGET_FILE:varnel>")
# The report laid out by a real browser, when headless Chromium is installed (skipped otherwise).
add_test(NAME report_in_browser
  COMMAND python3 ${dir}/report_in_browser.py $<TARGET_FILE:varnel_cli> ${PROJECT_SOURCE_DIR}/sim/profiles/type7.xml
          ${dir}/record_log.xml)
set_tests_properties(report_in_browser PROPERTIES SKIP_RETURN_CODE 77 TIMEOUT 600)
